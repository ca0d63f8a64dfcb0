// What no process shows: the scanners beside the grammars that they stand for, and the values that are raised.
#include <fts.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <functional>
#include <regex>
#include <stdexcept>
#include <string>

#include "boot/state.hpp"
#include "dataset/dataset.hpp"
#include "dataset/icu.hpp"
#include "fs/file_system.hpp"
#include "version/data_version.hpp"

/// Takes the place of the C library's: there is never memory for a walk.
FTS* fts_open(char* const* /*roots*/, int /*options*/, int (* /*order*/)(const FTSENT**, const FTSENT**)) {
  errno = ENOMEM;
  return nullptr;
}

namespace {

using version::data_version;

/// Calls `visit` with `text` and up to `longest` more bytes of the alphabet.
void for_each_string(const std::string& alphabet, std::size_t longest,
                     const std::function<void(const std::string&)>& visit, const std::string& text = {}) {
  visit(text);
  for (const char byte : longest > 0 ? alphabet : "") {
    for_each_string(alphabet, longest - 1, visit, text + byte);
  }
}

std::string text_of(int year, const std::string& letters, int major, int minor) {
  return std::to_string(year) + ", " + letters + ", " + std::to_string(major) + ", " + std::to_string(minor);
}

/// Returns the fields of a record that held another version before it was parsed into.
std::string parsed(const std::string& text) {
  data_version version("1old.2.3");
  try {
    parse_version(version, text);
  } catch (const std::out_of_range&) {
    return "too large: " + text_of(version.year, version.letters, version.major, version.minor);
  }
  return text_of(version.year, version.letters, version.major, version.minor);
}

TEST(Version, IsParsedByItsGrammar) {
  const std::regex grammar("([0-9]+)([a-z]+)(?:\\.([0-9]+))?(?:\\.([0-9]+))?");
  const auto number = [](const std::string& group) { return group.empty() ? -1 : std::stoi(group); };
  int accepted = 0;
  for_each_string("09azA.\xff", 6, [&](const std::string& text) {
    std::smatch groups;
    const bool matches = std::regex_match(text, groups, grammar);
    accepted += matches ? 1 : 0;
    const auto expected =
        matches ? text_of(number(groups[1]), groups[2], number(groups[3]), number(groups[4])) : text_of(-1, "", -1, -1);
    EXPECT_EQ(parsed(text), expected) << testing::PrintToString(text);
  });
  EXPECT_GT(accepted, 10);
}

TEST(Version, IsSetUpToANumberThatIsTooLarge) {
  EXPECT_EQ(parsed("2147483647a.2147483647.2147483647"), "2147483647, a, 2147483647, 2147483647");
  EXPECT_EQ(parsed("2147483648a.5.6"), "too large: 1, old, 2, 3");
  EXPECT_EQ(parsed("2020a.2147483648.6"), "too large: 2020, a, 2, 3");
  EXPECT_EQ(parsed("2020a.5.2147483648"), "too large: 2020, a, 5, 3");
}

TEST(Version, IsComparedFieldByField) {
  const char* const ascending[] = {"x",         "0a",      "2020a",    "2020a.0",    "2020a.1",
                                   "2020a.1.0", "2020a.9", "2020a.10", "2020aa.9.9", "2020b"};
  for (const auto& a : ascending) {
    for (const auto& b : ascending) {
      EXPECT_EQ(newer_than(data_version(a), data_version(b)), &a > &b) << a << ' ' << b;
      EXPECT_EQ(same_version(data_version(a), data_version(b)), &a == &b) << a << ' ' << b;
    }
  }
}

TEST(Icu, SchemaIsInTheFileName) {
  const std::regex pattern("icutz([0-9]+[lbe])\\.dat");
  int accepted = 0;
  for (const std::string name : {"icutz*.dat", "icut*.dat", "xicutz*.dat", "*.dat", "Icutz*.dat", "icutz*-dat",
                                 "icutz*.dat\n", "icutz*dat", "icutz*"}) {
    const auto star = name.find('*');
    for_each_string("09lbeX.", 3, [&](const std::string& middle) {
      const auto file = name.substr(0, star) + middle + name.substr(star + 1);
      std::smatch groups;
      const auto expected = std::regex_match(file, groups, pattern) ? groups[1].str() : "";
      accepted += expected.empty() ? 0 : 1;
      EXPECT_EQ(dataset::schema_in_file_name(file), expected) << testing::PrintToString(file);
    });
  }
  EXPECT_GT(accepted, 10);
}

std::string raised_by(const std::function<void()>& action) {
  try {
    action();
  } catch (int error) {
    return std::strerror(error);
  } catch (const std::invalid_argument& error) {
    return error.what();
  }
  return "";
}

TEST(Icu, ReportsWhatCannotBeWalkedOrCompared) {
  const dataset::vrel_icu icu;
  const dataset::vrel_zoneinfo zoneinfo;
  testing::internal::CaptureStderr();
  EXPECT_TRUE(zoneinfo.compatible_schema(&icu));
  EXPECT_FALSE(icu.compatible_schema(&zoneinfo));
  EXPECT_EQ(raised_by([] { const dataset::vrel_icu walked("/x"); }), "Cannot allocate memory");
  const auto warnings = testing::internal::GetCapturedStderr();
  EXPECT_TRUE(std::regex_search(
      warnings, std::regex(" vrel_icu::compatible_schema: could not dynamic_cast other component: .*\n"
                           ".* tz_icu::initialize: fts_open of /x/icutz failed, Cannot allocate memory: Cannot ")))
      << warnings;
}

TEST(Failures, RaiseTheErrnoOfTheCallThoughTheWarningFails) {
  ::close(STDERR_FILENO);
  EXPECT_EQ(raised_by([] { fs::remove(""); }), "");
  EXPECT_EQ(raised_by([] { fs::remove("/"); }), "Is a directory");
  EXPECT_EQ(raised_by([] { fs::remove("/dev/null/x"); }), "Not a directory");
  EXPECT_EQ(raised_by([] { fs::read_symlink("/"); }), "Invalid argument");
  EXPECT_EQ(raised_by([] { fs::read_symlink("/dev/null/x"); }), "Not a directory");
  EXPECT_EQ(raised_by([] { fs::create_symlink("target", "/"); }), "File exists");
  EXPECT_EQ(raised_by([] { boot::dataset_path_from_link("/elsewhere"); }), "Unknown error -1");
  EXPECT_EQ(raised_by([] { const dataset::vrel_dataset rejected("/elsewhere"); }), "badpath");
}

}  // namespace
