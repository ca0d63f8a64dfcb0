#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <fstream>
#include <ostream>
#include <stdexcept>

#include "sandbox.hpp"

namespace {

struct boot {
  std::string name;
  sandbox::expectation expected;

  friend void PrintTo(const boot& printed, std::ostream* out) { *out << printed.name; }
};

/// Reads the paragraphs of boots.txt. A line that is none of the others begins a paragraph or goes on with a situation.
std::vector<boot> read_boots() {
  std::vector<boot> boots;
  std::ifstream file(BOOTS);
  if (!file) {
    throw std::runtime_error("cannot read " BOOTS);  // Without rows there would be no test, and so no failure.
  }
  for (std::string line; std::getline(file, line);) {
    if (line.empty() || line.starts_with('#')) {
      continue;
    }
    if (!line.starts_with("  ")) {
      boots.push_back({line, {}});
      continue;
    }
    auto& expected = boots.back().expected;
    if (line.starts_with("  -> ")) {
      expected.changes = line.substr(5);
    } else if (line.starts_with("  ! ")) {
      expected.warnings.push_back(line.substr(4));
    } else if (line.starts_with("  exit ")) {
      expected.status = std::stoi(line.substr(7));
    } else {
      expected.situation += line.substr(2) + ", ";
    }
  }
  return boots;
}

class Boot : public testing::TestWithParam<boot> {
 protected:
  static void check_pass(sandbox::outcome (*pass)()) {
    const auto& expected = GetParam().expected;
    sandbox::check(expected, [&] {
      constexpr char state_directory[] = "/var/db/timezone";
      const timespec long_ago[2] = {};
      struct stat directory {};
      ::utimensat(AT_FDCWD, state_directory, long_ago, 0);
      auto result = pass();
      ::stat(state_directory, &directory);
      const bool has_written = directory.st_mtim.tv_sec != 0;
      EXPECT_FALSE(has_written && expected.warnings.empty() && expected.changes.empty());
      return result;
    });
  }
};

TEST_P(Boot, InProcess) { check_pass(sandbox::run_pass); }

TEST_P(Boot, ReleaseBinary) {
  check_pass([] { return sandbox::run_release_binary(); });
}

INSTANTIATE_TEST_SUITE_P(, Boot, testing::ValuesIn(read_boots()), [](const auto& row) { return row.param.name; });

}  // namespace
