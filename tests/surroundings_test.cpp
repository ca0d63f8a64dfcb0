// What a start of the system may do to the program apart from the links: closed or broken standard streams, no room,
// no descriptors, absurd data. The shipped binary is what has to bear it.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/mount.h>
#include <sys/resource.h>
#include <sys/statvfs.h>
#include <unistd.h>

#include <cstdlib>
#include <filesystem>

#include "sandbox.hpp"

namespace {

using sandbox::changed, sandbox::expect_warnings, sandbox::read_disk, sandbox::run_release_binary, sandbox::stage;

const char* const switch_from_installed =
    "system 2021a 44l, dataset 2021b.1.0 44l, dataset 2022a.1.0 44l, live 2021b.1.0, latest 2022a.1.0, localtime =";
const char* const switched =
    "live 2022a.1.0, marker, record 2021b.1.0_2022a.1.0, localtime > /var/db/timezone/zoneinfo/America/Los_Angeles";

void expect_switch(const std::function<void()>& prepare, const std::string& surrounding) {
  stage(switch_from_installed);
  const auto expected = changed(read_disk(), switched);
  EXPECT_EQ(run_release_binary(prepare).status, 0) << surrounding;
  EXPECT_EQ(read_disk(), expected) << surrounding;
}

TEST(Surroundings, ClosedStandardStreamsLetNoWarningIntoAFile) {
  for (unsigned closed = 1; closed < 8; ++closed) {
    const auto close_streams = [=] {
      for (unsigned stream = 0; stream < 3; ++stream) {
        if ((closed >> stream & 1U) != 0) {
          ::close(static_cast<int>(stream));
        }
      }
    };
    expect_switch(close_streams, "closed: " + std::to_string(closed));
  }
}

TEST(Surroundings, ALogThatTakesNothingChangesNothing) {
  expect_switch([] { ::dup2(::open("/dev/full", O_WRONLY), STDERR_FILENO); }, "full device");
  expect_switch(
      [] {
        int ends[2];
        if (::pipe(ends) != 0) {
          std::abort();
        }
        ::dup2(ends[1], STDERR_FILENO);
        ::close(ends[0]);
      },
      "pipe without a reader");
}

TEST(Surroundings, ADeletedWorkingDirectoryChangesNothing) {
  const auto enter_and_delete = [] {
    std::filesystem::create_directory("/var/gone");
    if (::chdir("/var/gone") != 0 || ::rmdir("/var/gone") != 0) {
      std::abort();
    }
  };
  expect_switch(enter_and_delete, "deleted");
}

TEST(Surroundings, MarkerAndRecordHaveTheModeThatTheMaskLeaves) {
  expect_switch([] { ::umask(027); }, "mask");
  for (const auto* const path : {"/var/db/timezone/needs_cleanup", "/var/db/timezone/TZVersionDiffRecord"}) {
    EXPECT_EQ(std::filesystem::status(path).permissions(), std::filesystem::perms{0640}) << path;
  }
}

TEST(Surroundings, WithoutDescriptorsThePassComesToItsEnd) {
  stage(switch_from_installed);
  const auto result = run_release_binary([] {
    const rlimit none{3, 3};
    ::setrlimit(RLIMIT_NOFILE, &none);
  });
  // Without its files the system has no schema and no version, and no directory can be walked: all fits all.
  EXPECT_EQ(result.status, 0);
  EXPECT_EQ(read_disk().at("/var/db/timezone/zoneinfo"), "> /var/db/timezone/tz/2022a.1.0/zoneinfo");
  EXPECT_EQ(read_disk().at("/var/db/timezone/localtime"), "> /var/db/timezone/zoneinfo/America/Los_Angeles");
}

void remount_var(unsigned long flags, const std::string& options) {
  ASSERT_EQ(::mount("tmpfs", "/var", "tmpfs", MS_REMOUNT | flags, options.c_str()), 0);
}

TEST(Surroundings, AReadOnlyStateDirectoryIsToldAndKept) {
  stage(switch_from_installed);
  const auto before = read_disk();
  remount_var(MS_RDONLY, "");
  const auto result = run_release_binary();
  remount_var(0, "");
  const std::string read_only = ": Read-only file system";
  const std::vector<std::string> zoneinfo_fails = {"remove: could not remove /var/db/timezone/zoneinfo" + read_only,
                                                   "Unlink of zoneinfo softlink failed" + read_only};
  EXPECT_EQ(result.status, 1);
  EXPECT_EQ(read_disk(), before);
  expect_warnings(result.warnings,
                  {zoneinfo_fails[0], zoneinfo_fails[1],
                   "create_symlink: from /var/db/timezone/zoneinfo to /var/db/timezone/tz/2022a.1.0/zoneinfo",
                   "Unable to locate data; resetting to system partition", zoneinfo_fails[0], zoneinfo_fails[1],
                   "create_symlink: from /var/db/timezone/zoneinfo to /usr/share/zoneinfo.default",
                   "read_symlink: /var/db/timezone/localtime: Invalid argument",
                   "localtime link invalid; resetting to America/Los_Angeles: Invalid argument",
                   "create_symlink: from /var/db/timezone/localtime to /var/db/timezone/zoneinfo/America/Los_Angeles"});
}

TEST(Surroundings, AFullStateDirectoryIsToldAndTheSystemsDataStays) {
  stage("system 2021a 44l, dataset 2021b.1.0 44l, live system, latest 2021b.1.0, - localtime");
  const auto before = read_disk();
  struct statvfs room {};
  ASSERT_EQ(::statvfs("/var", &room), 0);
  remount_var(0, "nr_inodes=" + std::to_string(room.f_files - room.f_ffree));
  const auto result = run_release_binary();
  remount_var(0, "nr_inodes=0");
  EXPECT_EQ(result.status, 1);
  EXPECT_EQ(read_disk(), before);
  expect_warnings(
      result.warnings,
      {"create_symlink: from /var/db/timezone/icutz to /var/db/timezone/tz/2021b.1.0/icutz: No space left on device",
       "Unable to locate data; resetting to system partition",
       "localtime link invalid; resetting to America/Los_Angeles",
       "create_symlink: from /var/db/timezone/localtime to /var/db/timezone/zoneinfo/America/Los_Angeles: No space "
       "left on device"});
}

TEST(Surroundings, AVersionOfSixteenMegabytesDoesNotStopTheLocalTimeRepair) {
  constexpr std::size_t length = 16U << 20U;
  const std::pair<std::string, int> table[] = {
      {std::string(length, '7'), 0},
      {std::string(length, 'a'), 0},
      {std::string(length / 2, '7') + std::string(length / 2, 'a'), 1},
      {"2021" + std::string(length, 'a'), 0},
  };
  for (const auto& [version, status] : table) {
    stage("system - 44l, live system, - localtime, /usr/share/zoneinfo.default/+VERSION = " + version);
    const auto result = run_release_binary([] { ::dup2(::open("/dev/null", O_WRONLY), STDERR_FILENO); });
    EXPECT_EQ(result.status, status) << version.substr(0, 8);
    EXPECT_EQ(read_disk().at("/var/db/timezone/localtime"), "> /var/db/timezone/zoneinfo/America/Los_Angeles");
  }
}

}  // namespace
