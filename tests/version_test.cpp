#include <fcntl.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <ostream>
#include <regex>
#include <stdexcept>

#include "sandbox.hpp"
#include "version/data_version.hpp"

namespace version {
// For GoogleTest, which prints what is not equal.
static void PrintTo(const data_version& v, std::ostream* out) {
  *out << v.year << " '" << v.letters << "' " << v.major << " " << v.minor;
}
static bool operator==(const data_version& a, const data_version& b) { return same_version(a, b); }
}  // namespace version

namespace {

using version::data_version, version::newer_than, version::parse_version, version::same_version;

data_version make(int year, const char* letters, int major, int minor) {
  data_version made;
  made.year = year;
  made.letters = letters;
  made.major = major;
  made.minor = minor;
  return made;
}

TEST(Version, Parses) {
  const std::pair<const char*, data_version> table[] = {
      {"2020a", make(2020, "a", -1, -1)},
      {"2020a.1.0", make(2020, "a", 1, 0)},
      {"2020ab.2", make(2020, "ab", 2, -1)},
      {"02020a.01", make(2020, "a", 1, -1)},
      {"00000000002020a.00000000000000000001", make(2020, "a", 1, -1)},
      {"0z.00", make(0, "z", 0, -1)},
      {"2147483647a.2147483647.2147483647", make(2147483647, "a", 2147483647, 2147483647)},
  };
  for (const auto& [text, expected] : table) {
    auto parsed = make(1, "old", 2, 3);
    sandbox::expect_warnings(sandbox::observe([&, &t = text] { parse_version(parsed, t); }).warnings, {});
    EXPECT_EQ(parsed, expected) << text;
  }
}

TEST(Version, BadTextWarnsTwiceAndResets) {
  for (const std::string text : {"", "2020", "abc", "2020A", "2020a.", "2020a.1.", "2020a.1.0.3", "2020a\n", " 2020a",
                                 "2020a ", "-2020a", "2020a.-1", "2020a..1", "%s%n", "2020\xe9"}) {
    auto parsed = make(1, "old", 2, 3);
    const auto result = sandbox::observe([&] { parse_version(parsed, text); });
    EXPECT_EQ(parsed, data_version()) << text;
    EXPECT_EQ(result.thrown, "");
    sandbox::expect_warnings(result.warnings, {"Cannot parse version string " + text + ", results.size() = 0",
                                               "Cannot parse version string " + text});
  }
}

TEST(Version, TooLargeANumberLeavesTheFieldsBeforeItSet) {
  const std::pair<const char*, data_version> table[] = {
      {"2147483648a.5.6", make(1, "old", 2, 3)},
      {"99999999999999999999a", make(1, "old", 2, 3)},
      {"2020a.2147483648.6", make(2020, "a", 2, 3)},
      {"2020a.5.2147483648", make(2020, "a", 5, 3)},
  };
  for (const auto& [text, expected] : table) {
    auto parsed = make(1, "old", 2, 3);
    const auto result = sandbox::observe([&, &t = text] { EXPECT_THROW(parse_version(parsed, t), std::out_of_range); });
    EXPECT_EQ(parsed, expected) << text;
    sandbox::expect_warnings(result.warnings, {});
  }
}

TEST(Version, AcceptsExactlyWhatTheRegularExpressionAccepts) {
  using namespace std::string_view_literals;
  const std::regex grammar("([0-9]+)([a-z]+)(?:\\.([0-9]+))?(?:\\.([0-9]+))?");
  const auto number = [](const std::string& group) { return group.empty() ? -1 : std::stoi(group); };
  int accepted = 0;
  const auto result = sandbox::observe([&] {
    ::dup2(::open("/dev/null", O_WRONLY), STDERR_FILENO);  // Over a million warnings.
    sandbox::for_each_string("09azA.\n\xff\0"sv, 6, [&](const std::string& text) {
      std::smatch groups;
      data_version expected;
      if (std::regex_match(text, groups, grammar)) {
        expected = make(number(groups[1]), groups[2].str().c_str(), number(groups[3]), number(groups[4]));
        ++accepted;
      }
      if (!same_version(data_version(text), expected)) {
        ADD_FAILURE() << testing::PrintToString(text);
      }
    });
  });
  EXPECT_EQ(result.thrown, "");
  EXPECT_GT(accepted, 100);
}

TEST(Version, Order) {
  // From old to new; every one is newer than all before it.
  const data_version ascending[] = {
      data_version(),           data_version("0a"),        data_version("2020a"),     data_version("2020a.0"),
      data_version("2020a.1"),  data_version("2020a.1.0"), data_version("2020a.1.1"), data_version("2020a.9"),
      data_version("2020a.10"), data_version("2020aa"),    data_version("2020b"),     data_version("2020z.9.9"),
      data_version("2021a"),    make(2021, "\xff", -1, -1)};
  for (const auto& a : ascending) {
    for (const auto& b : ascending) {
      EXPECT_EQ(newer_than(a, b), &a > &b) << testing::PrintToString(a) << ", " << testing::PrintToString(b);
      EXPECT_EQ(same_version(a, b), &a == &b) << testing::PrintToString(a) << ", " << testing::PrintToString(b);
    }
  }
}

}  // namespace
