// What no process shows: the scanners beside the grammar that they stand for, and the values that are raised.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <cerrno>
#include <filesystem>
#include <functional>
#include <regex>
#include <stdexcept>
#include <string>
#include <string_view>
#include <utility>

#include "boot/state.hpp"
#include "dataset/component.hpp"
#include "dataset/icu.hpp"
#include "fs/file_system.hpp"
#include "version/data_version.hpp"

namespace {

using namespace std::string_literals;
using version::data_version;

/// Calls `visit` with every string of up to `longest` bytes from a set of bytes that matter, begun with `text`.
void for_each_string(std::size_t longest, const std::function<void(const std::string&)>& visit, std::string text = {}) {
  visit(text);
  for (const char byte : longest > 0 ? "09albeXz.\n\xff\0"s : ""s) {
    for_each_string(longest - 1, visit, text + byte);
  }
}

data_version version_of(int year, const std::string& letters, int major, int minor) {
  data_version made;
  made.year = year;
  made.letters = letters;
  made.major = major;
  made.minor = minor;
  return made;
}

int number(const std::string& group) { return group.empty() ? -1 : std::stoi(group); }

TEST(Version, AcceptsWhatTheGrammarAccepts) {
  const std::regex grammar("([0-9]+)([a-z]+)(?:\\.([0-9]+))?(?:\\.([0-9]+))?");
  int accepted = 0;
  for_each_string(5, [&](const std::string& text) {
    std::smatch groups;
    auto expected = data_version();
    if (std::regex_match(text, groups, grammar)) {
      expected = version_of(number(groups[1]), groups[2], number(groups[3]), number(groups[4]));
      ++accepted;
    }
    EXPECT_TRUE(same_version(data_version(text), expected)) << testing::PrintToString(text);
  });
  EXPECT_GT(accepted, 1000);
}

TEST(Icu, AcceptsTheFileNamesThatThePatternAccepts) {
  const std::regex pattern("icutz([0-9]+[lbe])\\.dat");
  int accepted = 0;
  for (const auto& [prefix, suffix] : {std::pair("icutz", ".dat"),
                                       {"icut", ".dat"},
                                       {"xicutz", ".dat"},
                                       {"", ".dat"},
                                       {"Icutz", ".dat"},
                                       {"icutz", "-dat"},
                                       {"icutz", ".dat\n"},
                                       {"icutz", ""}}) {
    for_each_string(3, [&, &p = prefix, &s = suffix](const std::string& middle) {
      const auto name = p + middle + s;
      std::smatch groups;
      const auto expected = std::regex_match(name, groups, pattern) ? groups[1].str() : "";
      accepted += expected.empty() ? 0 : 1;
      EXPECT_EQ(dataset::schema_in_file_name(name), expected) << testing::PrintToString(name);
    });
  }
  EXPECT_EQ(accepted, 24);
}

TEST(Version, TooLargeANumberLeavesTheFieldsBeforeItSet) {
  const std::pair<const char*, data_version> table[] = {{"2147483648a.5.6", version_of(1, "old", 2, 3)},
                                                        {"2020a.2147483648.6", version_of(2020, "a", 2, 3)},
                                                        {"2020a.5.2147483648", version_of(2020, "a", 5, 3)}};
  for (const auto& [text, expected] : table) {
    auto parsed = version_of(1, "old", 2, 3);
    EXPECT_THROW(parse_version(parsed, text), std::out_of_range) << text;
    EXPECT_TRUE(same_version(parsed, expected)) << text;
  }
}

TEST(Version, BadTextResetsAllFields) {
  auto parsed = version_of(1, "old", 2, 3);
  parse_version(parsed, "2020");
  EXPECT_TRUE(same_version(parsed, data_version()));
}

TEST(Version, EveryFieldCounts) {
  const data_version ascending[] = {data_version(),
                                    data_version("0a"),
                                    data_version("2020a"),
                                    data_version("2020a.0"),
                                    data_version("2020a.0.0"),
                                    data_version("2020a.9"),
                                    data_version("2020a.10"),
                                    data_version("2020aa"),
                                    data_version("2020b"),
                                    version_of(2020, "\xff", -1, -1)};
  for (const auto& a : ascending) {
    for (const auto& b : ascending) {
      EXPECT_EQ(newer_than(a, b), &a > &b);
      EXPECT_EQ(same_version(a, b), &a == &b);
    }
  }
}

int raised_by(const std::function<void()>& action) {
  try {
    action();
  } catch (int error) {
    return error;
  }
  return 0;
}

TEST(Failures, RaiseTheErrnoOfTheCall) {
  const auto directory = std::filesystem::temp_directory_path().string();
  EXPECT_EQ(raised_by([&] { fs::remove(directory + "/"); }), EISDIR);
  EXPECT_EQ(raised_by([&] { fs::read_symlink(directory + "/."); }), EINVAL);
  EXPECT_EQ(raised_by([&] { fs::create_symlink("target", directory); }), EEXIST);
  EXPECT_EQ(raised_by([&] { fs::create_symlink("target", directory + "/no/link"); }), ENOENT);
  EXPECT_EQ(raised_by([&] { fs::remove(""); }), 0);
  EXPECT_EQ(raised_by([] { boot::dataset_path_from_link("/elsewhere"); }), -1);
}

TEST(Failures, RaiseTheErrnoOfTheCallWhenTheWarningFails) {
  const int saved = ::fcntl(STDERR_FILENO, F_DUPFD_CLOEXEC, 0);
  ::close(STDERR_FILENO);
  const int raised = raised_by([] { fs::remove("/"); });
  ::dup2(saved, STDERR_FILENO);
  EXPECT_EQ(raised, EISDIR);
}

TEST(Components, OfAnotherKindFitZoneFilesOnly) {
  const dataset::vrel_icu icu("/no/such/dataset");
  const dataset::vrel_zoneinfo zoneinfo("/no/such/dataset");
  EXPECT_TRUE(zoneinfo.compatible_schema(&icu));
  testing::internal::CaptureStderr();
  EXPECT_FALSE(icu.compatible_schema(&zoneinfo));
  EXPECT_NE(testing::internal::GetCapturedStderr().find(
                "vrel_icu::compatible_schema: could not dynamic_cast other component"),
            std::string::npos);
}

}  // namespace
