// Every call of a pass that the linker can redirect is redirected to the functions below, which let a chosen one fail
// or end the process there.
#include <fcntl.h>
#include <fts.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <csignal>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <iostream>

#include "boot/reconcile.hpp"
#include "sandbox.hpp"

namespace {

namespace filesystem = std::filesystem;
using namespace std::string_literals;
using sandbox::read_disk, sandbox::run_pass, sandbox::stage;

enum class fault { none, fail_once, fail_from_here_on, crash_before, crash_after };

struct injection {
  fault kind = fault::none;
  std::string call = {};  // empty: any
  int position = 0;
  int error = 0;
  int seen = 0;
  bool fired = false;
  std::string warning = {};  // that the first failure must lead to; empty when it is tolerated
};

injection injected;
bool marker_is_open = false;

[[noreturn]] void crash() {
  ::kill(::getpid(), SIGKILL);
  std::abort();
}

/// Makes the real call, or lets it fail or crash as `injected` says. `warning` is what a failure leads to, without the
/// text of errno; one of errno `tolerated` leads to none.
template <typename Call, typename Result = std::invoke_result_t<Call>>
Result inject(const char* name, const std::string& warning, int tolerated, Result failed, Call call) {
  if (injected.kind == fault::none || (!injected.call.empty() && injected.call != name)) {
    return call();
  }
  const int distance = injected.seen++ - injected.position;
  if (distance < 0 || (distance > 0 && injected.kind != fault::fail_from_here_on)) {
    return call();
  }
  if (injected.kind == fault::crash_before) {
    crash();
  }
  if (injected.kind == fault::crash_after) {
    call();
    crash();
  }
  if (!injected.fired && !warning.empty() && injected.error != tolerated) {
    injected.warning = warning + ": " + std::strerror(injected.error);
  }
  injected.fired = true;
  if (std::string_view(name).ends_with("close") || std::string_view(name) == "fts_read") {
    call();  // A close that fails closes all the same, and fts_close leaks a walk that has not begun.
  }
  errno = injected.error;
  return failed;
}

}  // namespace

// NOLINTBEGIN(bugprone-reserved-identifier,readability-inconsistent-declaration-parameter-name)
extern "C" {
int __real_unlink(const char*);
int __wrap_unlink(const char* path) {
  return inject("unlink", "remove: could not remove "s + path, ENOENT, -1, [&] { return __real_unlink(path); });
}

int __real_remove(const char*);
int __wrap_remove(const char* path) {
  return inject("remove", "", 0, -1, [&] { return __real_remove(path); });
}

int __real_access(const char*, int);
int __wrap_access(const char* path, int mode) {
  return inject("access", "", 0, -1, [&] { return __real_access(path, mode); });
}

ssize_t __real_readlink(const char*, char*, size_t);
ssize_t __wrap_readlink(const char* path, char* buffer, size_t size) {
  return inject("readlink", "read_symlink: "s + path, ENOENT, ssize_t{-1},
                [&] { return __real_readlink(path, buffer, size); });
}

int __real_symlink(const char*, const char*);
int __wrap_symlink(const char* target, const char* path) {
  return inject("symlink", "create_symlink: from "s + path + " to " + target, 0, -1,
                [&] { return __real_symlink(target, path); });
}

const char* const marker_warning = "Cannot touch file /var/db/timezone/needs_cleanup";

int __real_open(const char*, int, ...);
int __wrap_open(const char* path, int flags, ...) {
  va_list arguments;
  va_start(arguments, flags);
  const auto mode = (flags & O_CREAT) != 0 ? va_arg(arguments, mode_t) : mode_t{0};
  va_end(arguments);
  marker_is_open = (flags & O_CREAT) != 0;
  return inject("open", marker_is_open ? marker_warning : "", 0, -1, [&] { return __real_open(path, flags, mode); });
}

int __real_close(int);
int __wrap_close(int descriptor) {
  return inject("close", marker_is_open ? marker_warning : "", 0, -1, [&] { return __real_close(descriptor); });
}

int __real_fstat(int, struct stat*);
int __wrap_fstat(int descriptor, struct stat* status) {
  return inject("fstat", marker_warning, 0, -1, [&] { return __real_fstat(descriptor, status); });
}

FTS* __real_fts_open(char* const*, int, int (*)(const FTSENT**, const FTSENT**));
FTS* __wrap_fts_open(char* const* roots, int options, int (*order)(const FTSENT**, const FTSENT**)) {
  const auto warning = "tz_icu::initialize: fts_open of "s + *roots + " failed, " + std::strerror(injected.error);
  return inject("fts_open", warning, 0, static_cast<FTS*>(nullptr),
                [&] { return __real_fts_open(roots, options, order); });
}

// Whether its failure is told depends on what the walk has found before.
FTSENT* __real_fts_read(FTS*);
FTSENT* __wrap_fts_read(FTS* walk) {
  return inject("fts_read", "", 0, static_cast<FTSENT*>(nullptr), [&] { return __real_fts_read(walk); });
}

// What follows is called by the standard library's streams.
FILE* __real_fopen64(const char*, const char*);
FILE* __wrap_fopen64(const char* path, const char* mode) {
  return inject("fopen", "", 0, static_cast<FILE*>(nullptr), [&] { return __real_fopen64(path, mode); });
}

ssize_t __real_read(int, void*, size_t);
ssize_t __wrap_read(int descriptor, void* buffer, size_t size) {
  return inject("read", "", 0, ssize_t{-1}, [&] { return __real_read(descriptor, buffer, size); });
}

ssize_t __real_write(int, const void*, size_t);
ssize_t __wrap_write(int descriptor, const void* buffer, size_t size) {
  return inject("write", "", 0, ssize_t{-1}, [&] { return __real_write(descriptor, buffer, size); });
}

int __real_fclose(FILE*);
int __wrap_fclose(FILE* file) {
  return inject("fclose", "", 0, -1, [&] { return __real_fclose(file); });
}
}
// NOLINTEND(bugprone-reserved-identifier,readability-inconsistent-declaration-parameter-name)

namespace {

struct situation {
  const char* statements;
  int starts = 2;  // until all is settled
};

// Together they reach every branch of a pass.
const situation situations[] = {
    {"system 2021a 44l, live system, dataset 2021b.1.0 44l, latest 2021b.1.0"},
    {"system 2021a 44l, live 2021b.1.0, dataset 2021b.1.0 44l, dataset 2022a.1.0 44l, latest 2022a.1.0"},
    {"system 2022a 44l, live 2021b.1.0, dataset 2021b.1.0 44l"},
    {"system 2021a 44l, zoneinfo > nowhere, icutz > nowhere, dataset 2021b.1.0 44l, latest 2021b.1.0, localtime ="},
    {"system 2021a 44l, zoneinfo > @2021b.1.0/zoneinfo, /var/db/icutz > @2021b.1.0/icutz, dataset 2021b.1.0 44l, "
     "tz_latest > /elsewhere, marker, /var/db/icu ="},
    {"system 2021a 44l, live system, localtime > /usr/share/zoneinfo/Europe/Paris"},
    // The latest dataset is older than the system's, so that it is switched to at one start and rejected at the next.
    {"system 2022z 44l, live 2021b.1.0, dataset 2021b.1.0 44l, dataset 2022a.1.0 44l, latest 2022a.1.0", 3},
};

/// What no pass may change: all but the links, the notes and the two legacy paths.
sandbox::disk untouchable(sandbox::disk disk) {
  for (const auto* const path :
       {"/var/db/timezone/zoneinfo", "/var/db/timezone/icutz", "/var/db/timezone/localtime",
        "/var/db/timezone/needs_cleanup", "/var/db/timezone/TZVersionDiffRecord", "/var/db/icutz", "/var/db/icu"}) {
    disk.erase(path);
  }
  return disk;
}

bool contains(const std::vector<std::string>& warnings, const std::string& text) {
  return std::any_of(warnings.begin(), warnings.end(), [&](const auto& w) { return w.starts_with(text); });
}

/// Status 1 stands for a zoneinfo link that the fallback, or a local time link that its repair could not make.
int expected_status(const std::vector<std::string>& warnings) {
  const auto is_fallback = [](const auto& w) { return w.starts_with("Unable to locate data"); };
  const std::vector<std::string> fallback(std::find_if(warnings.begin(), warnings.end(), is_fallback), warnings.end());
  return contains(fallback, "create_symlink: from /var/db/timezone/zoneinfo to /usr/share/zoneinfo.default") ||
                 contains(
                     warnings,
                     "create_symlink: from /var/db/timezone/localtime to /var/db/timezone/zoneinfo/America/Los_Angeles")
             ? 1
             : 0;
}

/// A few passes after a fault all must be well, and one more must find nothing to change. Returns whether the ICU link
/// was left behind at the dataset that was live before the fault: no pass touches the links of a dataset that it keeps.
bool recovers_but_for_icu(const sandbox::disk& before, int starts) {
  for (int start = 0; start < starts; ++start) {
    run_pass();
  }
  const auto settled = read_disk();
  const auto at = [](const sandbox::disk& disk, const char* name) {
    const auto entry = disk.find("/var/db/timezone/"s + name);
    return entry == disk.end() ? "" : entry->second;
  };
  const auto zoneinfo = at(settled, "zoneinfo");
  const bool installed = zoneinfo.starts_with("> /var/db/timezone/tz/");
  EXPECT_TRUE(installed ? filesystem::exists("/var/db/timezone/zoneinfo/")
                        : zoneinfo == "> /usr/share/zoneinfo.default")
      << zoneinfo;
  const auto localtime = at(settled, "localtime");
  EXPECT_TRUE(localtime == "> /var/db/timezone/zoneinfo/Europe/Paris" ||
              localtime == "> /var/db/timezone/zoneinfo/America/Los_Angeles")
      << localtime;
  EXPECT_EQ(at(settled, "needs_cleanup"), "");
  EXPECT_EQ(untouchable(settled), untouchable(before));
  run_pass();
  EXPECT_EQ(read_disk(), settled);

  const auto icu = at(settled, "icutz");
  if (icu.empty() || (installed && icu == zoneinfo.substr(0, zoneinfo.rfind('/')) + "/icutz")) {
    return false;
  }
  EXPECT_EQ(icu, at(before, "icutz"));
  return true;
}

std::ptrdiff_t open_descriptors() {
  return std::distance(filesystem::directory_iterator("/proc/self/fd"), filesystem::directory_iterator());
}

/// Runs a pass with the fault. Returns whether it fired.
bool survives_failure(const situation& from, const injection& planned) {
  stage(from.statements);
  const auto before = read_disk();
  const auto descriptors = open_descriptors();
  int status = -1;
  injected = planned;
  const auto result = sandbox::observe([&] {
    status = boot::reconcile();
    injected.kind = fault::none;
  });
  if (!injected.fired) {
    return false;
  }
  EXPECT_EQ(result.thrown, "");
  EXPECT_EQ(status, expected_status(result.warnings)) << testing::PrintToString(result.warnings);
  EXPECT_TRUE(injected.warning.empty() || contains(result.warnings, injected.warning))
      << injected.warning << " is not in " << testing::PrintToString(result.warnings);
  const auto after = read_disk();
  for (const auto* const link : {"/var/db/timezone/zoneinfo", "/var/db/timezone/localtime"}) {
    EXPECT_TRUE(status == 1 || (after.contains(link) && after.at(link).starts_with("> "))) << link;
  }
  EXPECT_EQ(untouchable(after), untouchable(before));
  EXPECT_EQ(open_descriptors(), descriptors);
  if (recovers_but_for_icu(before, from.starts)) {
    EXPECT_EQ(planned.call, "unlink") << "only a link that cannot be removed is left behind";
  }
  return true;
}

class Faults : public testing::TestWithParam<const char*> {};

TEST_P(Faults, EveryFailure) {
  int runs = 0;
  for (const auto& from : situations) {
    for (const int error : {EIO, EACCES, EROFS, ENOSPC, EINVAL, ENOENT}) {
      for (const auto kind : {fault::fail_once, fault::fail_from_here_on}) {
        injection planned{.kind = kind, .call = GetParam(), .error = error};
        while (true) {
          SCOPED_TRACE(testing::Message()
                       << from.statements << ": " << std::strerror(error) << " at " << planned.position
                       << (kind == fault::fail_once ? ", once" : " and from there on"));
          if (!survives_failure(from, planned)) {
            break;
          }
          ++planned.position;
          ++runs;
        }
      }
    }
  }
  EXPECT_GT(runs, 0) << "no pass makes this call";
  std::cout << runs << " runs with a failure\n";
}

INSTANTIATE_TEST_SUITE_P(, Faults,
                         testing::Values("unlink", "remove", "access", "readlink", "symlink", "open", "close", "fstat",
                                         "fts_open", "fts_read", "fopen", "read", "write", "fclose"),
                         [](const auto& row) { return std::string(row.param); });

/// Runs a pass that crashes. Returns whether it did.
bool crashes(const injection& planned) {
  const auto child = ::fork();
  if (child == 0) {
    injected = planned;
    run_pass();
    std::_Exit(EXIT_SUCCESS);
  }
  int end = 0;
  EXPECT_EQ(::waitpid(child, &end, 0), child);
  const bool has_crashed = WIFSIGNALED(end) && WTERMSIG(end) == SIGKILL;
  EXPECT_TRUE(has_crashed || (WIFEXITED(end) && WEXITSTATUS(end) == EXIT_SUCCESS)) << end;
  return has_crashed;
}

TEST(Crashes, EveryPosition) {
  int runs = 0;
  int icu_left_behind = 0;
  for (const auto& from : situations) {
    for (const auto kind : {fault::crash_before, fault::crash_after}) {
      for (int position = 0;; ++position) {
        SCOPED_TRACE(testing::Message() << from.statements << ": " << (kind == fault::crash_before ? "before" : "after")
                                        << " call " << position);
        stage(from.statements);
        const auto before = read_disk();
        if (!crashes({.kind = kind, .position = position})) {
          EXPECT_GT(position, 20) << "a pass makes more calls than that";
          break;
        }
        ++runs;
        EXPECT_EQ(untouchable(read_disk()), untouchable(before));
        icu_left_behind += recovers_but_for_icu(before, from.starts) ? 1 : 0;
      }
    }
  }
  // Once after zoneinfo is made and once before icutz is removed, in the three situations that leave a live ICU link.
  EXPECT_EQ(icu_left_behind, 6);
  std::cout << runs << " crashes\n";
}

}  // namespace
