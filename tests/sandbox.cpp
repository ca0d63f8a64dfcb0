#include "sandbox.hpp"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sanitizer/common_interface_defs.h>
#include <sched.h>
#include <sys/mman.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <exception>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <sstream>
#include <stdexcept>

#include "boot/reconcile.hpp"

namespace sandbox {
namespace {

namespace filesystem = std::filesystem;

constexpr char program[] = "tzreconcile";
constexpr char state_directory[] = "/var/db/timezone/";
const char* const covered[] = {"/var", "/usr/share"};

int release_binary = -1;

[[noreturn]] void give_up(const std::string& what, const std::string& remedy) {
  std::fprintf(stderr, "%s: %s\n%s\n", what.c_str(), std::strerror(errno), remedy.c_str());
  std::_Exit(EXIT_FAILURE);
}

std::string content_of(const filesystem::path& path) {
  std::ostringstream content;
  content << std::ifstream(path, std::ios::binary).rdbuf();
  return content.str();
}

void write_file(const filesystem::path& path, std::string_view content) {
  filesystem::create_directories(path.parent_path());
  std::ofstream(path, std::ios::binary) << content;
}

void make_entry(const filesystem::path& path, const std::string& value) {
  if (value == "/") {
    filesystem::create_directories(path);
  } else if (value.starts_with("= ")) {
    write_file(path, value.substr(2));
  } else {
    filesystem::create_directories(path.parent_path());
    filesystem::create_symlink(value.substr(2), path);
  }
}

/// The parts between the separators that are not empty.
std::vector<std::string> split(std::string_view text, std::string_view separator) {
  std::vector<std::string> parts;
  while (!text.empty()) {
    const auto end = std::min(text.find(separator), text.size());
    if (end > 0) {
      parts.emplace_back(text.substr(0, end));
    }
    text.remove_prefix(std::min(end + separator.size(), text.size()));
  }
  return parts;
}

/// The statements on paths that a shorter one stands for.
std::vector<std::string> in_full(const std::string& statement) {
  const auto space = std::min(statement.find(' '), statement.size());
  const auto kind = statement.substr(0, space);
  const auto rest = statement.substr(std::min(space + 1, statement.size()));
  if (statement == "live system") {
    return {"zoneinfo > /usr/share/zoneinfo.default", "- icutz"};
  }
  if (kind == "live") {
    return {"zoneinfo > @" + rest + "/zoneinfo", "icutz > @" + rest + "/icutz"};
  }
  if (kind == "latest") {
    return {"tz_latest > @" + rest};
  }
  if (kind == "marker") {
    return {"needs_cleanup ="};
  }
  return {kind == "record" ? "TZVersionDiffRecord = " + rest : statement};
}

std::vector<std::string> path_statements(std::string_view statements) {
  std::vector<std::string> all;
  for (const auto& statement : split(statements, ", ")) {
    std::ranges::move(in_full(statement), std::back_inserter(all));
  }
  return all;
}

/// The path and value of a statement on a path; the value is empty for "nothing at PATH".
disk::value_type entry_of(const std::string& statement) {
  const filesystem::path base(state_directory);
  if (statement.starts_with("- ")) {
    return {(base / statement.substr(2)).lexically_normal(), ""};
  }
  const auto space = std::min(statement.find(' '), statement.size());
  auto value = statement.substr(std::min(space + 1, statement.size()));
  if (value.empty() || std::string_view("/=>").find(value.front()) == std::string_view::npos) {
    throw std::invalid_argument("no such statement: " + statement);
  }
  if (value == "=") {
    value = "= ";
  } else if (value.starts_with("> @")) {
    value = std::string("> /var/db/timezone/tz/") + value.substr(3);
  }
  return {base / statement.substr(0, space), value};
}

void stage_zones(const filesystem::path& zoneinfo) {
  for (const auto* const zone : {"Europe/Paris", "America/Los_Angeles"}) {
    write_file(zoneinfo / zone, "TZif");
  }
}

bool stage_data(const std::string& statement) {
  std::istringstream words(statement);
  std::string kind;
  std::string version;
  std::string schema;
  words >> kind >> version >> schema;
  if (kind == "system") {
    stage_zones("/usr/share/zoneinfo.default");
    filesystem::create_directories("/usr/share/icu");
    if (version != "-") {
      write_file("/usr/share/zoneinfo.default/+VERSION", version + "\n");
    }
    if (schema != "-") {
      write_file("/usr/share/icu/icutzformat.txt", schema + "\n");
    }
  } else if (kind == "dataset") {
    const filesystem::path path = filesystem::path(state_directory) / "tz" / version;
    stage_zones(path / "zoneinfo");
    filesystem::create_directories(path / "icutz");
    if (schema != "-") {
      write_file(path / "icutz" / ("icutz" + schema + ".dat"), "ICU");
    }
  } else {
    return false;
  }
  return true;
}

void map_to_root(const char* file, unsigned id) { std::ofstream(file) << "0 " << id << " 1"; }

void enter_namespaces() {
  const auto user = ::getuid();
  const auto group = ::getgid();
  if (::unshare(user == 0 ? CLONE_NEWNS : CLONE_NEWNS | CLONE_NEWUSER) != 0) {
    give_up("no private mount namespace",
            "Run as root, or allow user namespaces: sysctl user.max_user_namespaces=10000, and where they exist\n"
            "kernel.unprivileged_userns_clone=1 and kernel.apparmor_restrict_unprivileged_userns=0.");
  }
  if (user != 0) {
    std::ofstream("/proc/self/setgroups") << "deny";
    map_to_root("/proc/self/uid_map", user);
    map_to_root("/proc/self/gid_map", group);
  }
}

/// The warnings in a text of lines that each begin with the program's name. A line that does not begin so belongs to
/// the warning before it, whose text holds a line end.
std::vector<std::string> warnings_in(const std::string& text) {
  if (text.empty()) {
    return {};
  }
  auto warnings = split("\n" + text, std::string("\n") + program + ": ");
  if (!warnings.empty() && warnings.back().ends_with('\n')) {
    warnings.back().pop_back();
  }
  return warnings;
}

/// A file in memory that takes the place of standard error until it goes out of scope.
class captured_stderr {
 public:
  captured_stderr() : saved(::dup(STDERR_FILENO)), memory(::memfd_create("stderr", MFD_CLOEXEC)) {
    ::dup2(memory, STDERR_FILENO);
  }
  ~captured_stderr() {
    ::dup2(saved, STDERR_FILENO);
    ::close(saved);
    ::close(memory);
  }
  captured_stderr(const captured_stderr&) = delete;
  captured_stderr& operator=(const captured_stderr&) = delete;

  std::string text() const { return content_of("/proc/self/fd/" + std::to_string(memory)); }

 private:
  int saved;
  int memory;
};

bool is_warning(const std::string& warning, const std::string& expected) {
  for (int error = 0; error < EHWPOISON; ++error) {
    const auto suffix = std::string(": ") + std::strerror(error);
    if (warning == expected + suffix || (warning == expected && expected.ends_with(suffix))) {
      return true;
    }
  }
  return false;
}

}  // namespace

void enter() {
  release_binary = ::open(RELEASE_BINARY, O_PATH | O_CLOEXEC);
  if (release_binary < 0) {
    give_up("cannot open " RELEASE_BINARY, "Build it first: cmake --preset release && cmake --build --preset release");
  }
  // A sanitizer's report must reach the terminal while a test captures standard error.
  const std::intptr_t terminal = ::dup(STDERR_FILENO);
  __sanitizer_set_report_fd(reinterpret_cast<void*>(terminal));  // NOLINT(performance-no-int-to-ptr)
  program_invocation_short_name = const_cast<char*>(program);
  ::umask(022);
  enter_namespaces();
  if (::mount("none", "/", nullptr, MS_REC | MS_PRIVATE, nullptr) != 0) {
    give_up("cannot make the mounts private", "The tests must not touch the machine's own paths, so they end here.");
  }
  for (const auto* const path : covered) {
    if (::mount("tmpfs", path, "tmpfs", 0, nullptr) != 0) {
      give_up(std::string("cannot mount a tmpfs on ") + path,
              "The kernel needs CONFIG_TMPFS, and no policy against it.");
    }
  }
}

void stage(std::string_view situation) {
  for (const auto* const path : covered) {
    for (const auto& entry : filesystem::directory_iterator(path)) {
      filesystem::remove_all(entry);
    }
  }
  filesystem::create_directories("/var/db/timezone/tz");
  make_entry("/var/db/timezone/localtime", "> /var/db/timezone/zoneinfo/Europe/Paris");
  for (const auto& statement : path_statements(situation)) {
    if (!stage_data(statement)) {
      const auto [path, value] = entry_of(statement);
      filesystem::remove_all(path);
      if (!value.empty()) {
        make_entry(path, value);
      }
    }
  }
}

disk read_disk() {
  disk found;
  for (const auto* const path : covered) {
    for (const auto& entry : filesystem::recursive_directory_iterator(path)) {
      found[entry.path()] = entry.is_symlink()     ? "> " + filesystem::read_symlink(entry).string()
                            : entry.is_directory() ? "/"
                                                   : "= " + content_of(entry);
    }
  }
  return found;
}

disk changed(disk before, std::string_view statements) {
  for (const auto& statement : path_statements(statements)) {
    const auto [path, value] = entry_of(statement);
    if (value.empty()) {
      before.erase(path);
    } else {
      before[path] = value;
    }
  }
  return before;
}

outcome observe(const std::function<void()>& action) {
  outcome result;
  const captured_stderr captured;
  try {
    action();
  } catch (int raised) {
    result.thrown = raised > 0 ? std::strerror(raised) : std::to_string(raised);
  } catch (const std::exception& error) {
    result.thrown = error.what();
  }
  result.warnings = warnings_in(captured.text());
  return result;
}

void check(const expectation& expected, const std::function<outcome()>& run) {
  SCOPED_TRACE(expected.situation);
  stage(expected.situation);
  const auto before = read_disk();
  const auto result = run();
  EXPECT_EQ(read_disk(), changed(before, expected.changes));
  EXPECT_EQ(result.status, expected.status);
  EXPECT_EQ(result.thrown, expected.thrown);
  expect_warnings(result.warnings, expected.warnings);
}

outcome run_pass() {
  int status = -1;
  auto result = observe([&] { status = boot::reconcile(); });
  result.status = status;
  return result;
}

outcome run_release_binary(const std::function<void()>& prepare) {
  int status = -1;
  auto result = observe([&] {
    const auto child = ::fork();
    if (child == 0) {
      char* const arguments[] = {const_cast<char*>(program), nullptr};
      prepare();
      ::fexecve(release_binary, arguments, environ);
      std::_Exit(127);
    }
    ::waitpid(child, &status, 0);
  });
  result.status = WIFEXITED(status) ? WEXITSTATUS(status) : -WTERMSIG(status);
  return result;
}

void expect_warnings(const std::vector<std::string>& warnings, const std::vector<std::string>& expected) {
  EXPECT_TRUE(std::equal(warnings.begin(), warnings.end(), expected.begin(), expected.end(), is_warning))
      << "warnings: " << testing::PrintToString(warnings) << "\nexpected: " << testing::PrintToString(expected);
}

void for_each_string(std::string_view alphabet, std::size_t longest,
                     const std::function<void(const std::string&)>& visit) {
  std::string text;
  const std::function<void()> extend = [&] {
    visit(text);
    if (text.size() == longest) {
      return;
    }
    for (const char byte : alphabet) {
      text.push_back(byte);
      extend();
      text.pop_back();
    }
  };
  extend();
}

}  // namespace sandbox

int main(int argc, char** argv) {
  testing::InitGoogleTest(&argc, argv);
  if (!testing::GTEST_FLAG(list_tests)) {
    sandbox::enter();
  }
  return RUN_ALL_TESTS();
}
