#include "dataset/dataset.hpp"

#include <gtest/gtest.h>
#include <sys/inotify.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <regex>
#include <stdexcept>

#include "dataset/icu.hpp"
#include "sandbox.hpp"

namespace {

using dataset::vrel_dataset, dataset::vrel_icu, dataset::vrel_zoneinfo;
using sandbox::expect_warnings, sandbox::observe, sandbox::stage;

const std::string installed = "/var/db/timezone/tz/2021b.1.0";
const std::string no_schema = "No ICU schema found for " + installed;

TEST(Zoneinfo, ReadsItsVersion) {
  stage("system 2021a 44l, tz/2021b.1.0/zoneinfo/+VERSION = 2021b and more");
  EXPECT_EQ(vrel_zoneinfo().zoneinfo_version(), "2021a");
  EXPECT_EQ(vrel_zoneinfo("").zoneinfo_version(), "2021a");
  EXPECT_EQ(vrel_zoneinfo(installed).zoneinfo_version(), "2021b");
  EXPECT_EQ(vrel_zoneinfo("/var/db/timezone/tz/none").zoneinfo_version(), "");
}

TEST(Zoneinfo, FitsAnyComponent) {
  stage("");
  const vrel_icu icu;
  EXPECT_TRUE(vrel_zoneinfo().compatible_schema(&icu));
}

TEST(Icu, SchemaComesFromTheNameOfAReadableFileDirectlyInTheDirectory) {
  const std::pair<const char*, std::string> table[] = {
      {"tz/2021b.1.0/icutz/icutz44l.dat =, tz/2021b.1.0/icutz/README =", "44l"},
      {"tz/2021b.1.0/icutz/icutz44l.dat.bak =, tz/2021b.1.0/icutz/icutz7e.dat =", "7e"},
      {"tz/2021b.1.0/icutz/a/icutz46b.dat =, tz/2021b.1.0/icutz/icutz44b.dat =, tz/2021b.1.0/icutz/z/icutz46b.dat =",
       "44b"},
      {"tz/elsewhere/icutz44l.dat =, tz/2021b.1.0/icutz > ../elsewhere", "44l"},
      {"tz/2021b.1.0/icutz/icutz44l.dat > ../zoneinfo, tz/2021b.1.0/zoneinfo =", "-"},
      {"tz/2021b.1.0/icutz/icutz44l.dat/icutz44l.dat =", "-"},
      {"tz/2021b.1.0/icutz/ICUTZ44L.DAT =", "-"},
      {"tz/2021b.1.0/icutz = icutz44l.dat", "-"},
      {"tz/2021b.1.0/icutz /", "-"},
      {"", "-"},
  };
  for (const auto& [situation, schema] : table) {
    stage("system - " + schema + ", " + situation);
    const auto result = observe([] {
      const vrel_icu system;
      EXPECT_TRUE(vrel_icu(installed).compatible_schema(&system));
    });
    expect_warnings(result.warnings, schema != "-" ? std::vector<std::string>() : std::vector{no_schema});
    EXPECT_EQ(result.thrown, "") << situation;
  }
}

TEST(Icu, TheFileMustBeReadableByOthers) {
  for (const auto& [mode, found] : {std::pair{0644U, true}, {0604U, true}, {0600U, false}, {0640U, false}}) {
    stage("dataset 2021b.1.0 44l, system - -");
    ::chmod((installed + "/icutz/icutz44l.dat").c_str(), mode);
    const auto result = observe([] { const vrel_icu icu(installed); });
    expect_warnings(result.warnings, found ? std::vector<std::string>() : std::vector{no_schema});
  }
}

TEST(Icu, TheFirstOfSeveralFilesInTheOrderOfTheDirectoryCounts) {
  stage(
      "dataset 2021b.1.0 44l, tz/2021b.1.0/icutz/icutz45l.dat =, tz/2021b.1.0/icutz/icutz46l.dat =, "
      "dataset icutz44l.dat 44l, dataset icutz45l.dat 45l, dataset icutz46l.dat 46l");
  const auto first = std::filesystem::directory_iterator(installed + "/icutz")->path().filename().string();
  const vrel_icu expected("/var/db/timezone/tz/" + first);
  EXPECT_TRUE(vrel_icu(installed).compatible_schema(&expected)) << first;
}

TEST(Icu, FileNamesMatchAsTheRegularExpressionMatches) {
  using namespace std::string_view_literals;
  const std::regex pattern("icutz([0-9]+[lbe])\\.dat");
  int accepted = 0;
  for (const std::string prefix : {"icutz", "icut", "Icutz", "xicutz", ""}) {
    for (const std::string suffix : {".dat", "-dat", "dat", ".DAT", ".dat\n", ".dat.dat", ""}) {
      sandbox::for_each_string("09lbexL.\n\xff\0"sv, 4, [&](const std::string& middle) {
        const auto name = prefix + middle + suffix;
        std::smatch groups;
        const auto expected = std::regex_match(name, groups, pattern) ? groups[1].str() : "";
        accepted += expected.empty() ? 0 : 1;
        if (dataset::schema_in_file_name(name) != expected) {
          ADD_FAILURE() << testing::PrintToString(name);
        }
      });
    }
  }
  EXPECT_GT(accepted, 40);
}

TEST(Icu, ATreeBelowTheDirectoryIsNotWalked) {
  stage("dataset 2021b.1.0 44l, tz/2021b.1.0/icutz/a /");
  const auto tree = installed + "/icutz/a";
  const int watch = ::inotify_init1(IN_NONBLOCK | IN_CLOEXEC);
  ASSERT_GE(::inotify_add_watch(watch, tree.c_str(), IN_OPEN), 0);
  inotify_event seen{};
  ASSERT_EQ(observe([] { const vrel_icu icu(installed); }).thrown, "");
  EXPECT_EQ(::read(watch, &seen, sizeof seen), -1) << "the walk has opened it";
  const std::filesystem::directory_iterator opens(tree);
  EXPECT_GT(::read(watch, &seen, sizeof seen), 0) << "the watch sees nothing";
  ::close(watch);
}

TEST(Icu, FitsTheSameSchemaOnly) {
  stage("system 2021a 44l, dataset same 44l, dataset other 46l, dataset none -, dataset none2 -");
  const vrel_icu system;
  const vrel_icu same("/var/db/timezone/tz/same");
  const vrel_icu other("/var/db/timezone/tz/other");
  const vrel_zoneinfo zoneinfo;
  const auto result = observe([&] {
    const vrel_icu none("/var/db/timezone/tz/none");
    const vrel_icu none_either("/var/db/timezone/tz/none2");
    EXPECT_TRUE(same.compatible_schema(&system));
    EXPECT_FALSE(other.compatible_schema(&system));
    EXPECT_FALSE(none.compatible_schema(&system));
    EXPECT_TRUE(none.compatible_schema(&none_either));
    EXPECT_FALSE(same.compatible_schema(&zoneinfo));
  });
  EXPECT_EQ(result.thrown, "");
  expect_warnings(result.warnings, {"No ICU schema found for /var/db/timezone/tz/none",
                                    "No ICU schema found for /var/db/timezone/tz/none2",
                                    "vrel_icu::compatible_schema: could not dynamic_cast other component"});
}

TEST(Dataset, PathsOutsideTheRootAreRejected) {
  stage("system 2021a 44l");
  for (const std::string path : {"/var/db/timezone/tz/", "/var/db/timezone/tz", "/var/db/timezone/tzdata/2020a.1.0",
                                 "/private/var/db/timezone/tz/2020a.1.0", "var/db/timezone/tz/2020a.1.0", "x"}) {
    const auto result = observe([&] { const vrel_dataset rejected(path); });
    EXPECT_EQ(result.thrown, "badpath") << path;
    expect_warnings(result.warnings, {"vrel_dataset::create_components: bad path " + path});
  }
}

TEST(Dataset, NamesItsVersion) {
  stage("system 2021a 44l, dataset 2021b.1.0 44l, dataset 2021b.1.0/ 44l, dataset x 44l");
  const std::pair<const char*, const char*> table[] = {{"", "2021a.1.0"},
                                                       {"/var/db/timezone/tz/2021b.1.0", "2021b.1.0"},
                                                       {"/var/db/timezone/tz/2021b.1.0/", "2021b.1.0/"},
                                                       {"/var/db/timezone/tz/x", "x"}};
  for (const auto& [path, version] : table) {
    const auto result = observe([&, &p = path, &v = version] { EXPECT_EQ(version_string(vrel_dataset(p)), v); });
    EXPECT_EQ(result.thrown, "") << path;
  }
}

TEST(Dataset, WithoutAValidVersionIsBuiltAndOlderThanAll) {
  stage("system - 44l, dataset 0a 44l");
  const vrel_dataset valid("/var/db/timezone/tz/0a");
  const auto result = observe([&] {
    const vrel_dataset system;
    EXPECT_EQ(version_string(system), ".1.0");
    EXPECT_TRUE(newer_than(valid, system));
    EXPECT_FALSE(newer_than(system, valid));
    EXPECT_TRUE(all_compatible(valid, system));
  });
  EXPECT_EQ(result.thrown, "");
  expect_warnings(result.warnings,
                  {"Cannot parse version string .1.0, results.size() = 0", "Cannot parse version string .1.0"});
  EXPECT_THROW(vrel_dataset("/var/db/timezone/tz/2147483648a"), std::out_of_range);
}

TEST(Dataset, PathsAreComparedAsBytes) {
  stage("system 2021a 44l, dataset 2021a.1.0 44l");
  const vrel_dataset system;
  const vrel_dataset same_version("/var/db/timezone/tz/2021a.1.0");
  const vrel_dataset same_version_again("/var/db/timezone/tz/2021a.1.0");
  EXPECT_TRUE(same_path(system, vrel_dataset("")));
  EXPECT_TRUE(same_path(same_version, same_version_again));
  EXPECT_FALSE(same_path(system, same_version));
}

}  // namespace
