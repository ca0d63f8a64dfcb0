#include "boot/state.hpp"

#include <gtest/gtest.h>

#include <cerrno>

#include "sandbox.hpp"

namespace {

using sandbox::changed, sandbox::expect_warnings, sandbox::observe, sandbox::read_disk, sandbox::stage;

TEST(State, DatasetPathFromLink) {
  const std::pair<std::string, std::string> accepted[] = {
      {"/var/db/timezone/tz/2020a.1.0/zoneinfo", "/var/db/timezone/tz/2020a.1.0"},
      {"/var/db/timezone/tz/2020a.1.0/icutz", "/var/db/timezone/tz/2020a.1.0"},
      {"/var/db/timezone/tz/a/b/zoneinfo", "/var/db/timezone/tz/a/b"},
      {"/var/db/timezone/tz/x/", "/var/db/timezone/tz/x"},
      {"/var/db/timezone/tz///", "/var/db/timezone/tz//"},
      {"/usr/share/zoneinfo.default", ""},
  };
  for (const auto& [target, path] : accepted) {
    EXPECT_EQ(boot::dataset_path_from_link(target), path) << target;
  }
  for (const std::string target :
       {"/var/db/timezone/tz/2020a.1.0", "/var/db/timezone/tz//zoneinfo", "/var/db/timezone/tz/",
        "/var/db/timezone/tz//", "/var/db/timezone/tz", "/usr/share/zoneinfo.default/", "/usr/share/zoneinfo", "",
        "tz/2020a.1.0/zoneinfo", "/private/var/db/timezone/tz/x/zoneinfo", "%s%n"}) {
    const auto result = observe([&] { boot::dataset_path_from_link(target); });
    EXPECT_EQ(result.thrown, "-1") << target;
    expect_warnings(result.warnings, {"Bad zoneinfo link " + target});
  }
}

TEST(State, CurrentAndLatestAreReadFromTheirLinks) {
  stage("zoneinfo > @2020a.1.0/zoneinfo, tz_latest > any/text");
  EXPECT_EQ(boot::current_dataset_path(), "/var/db/timezone/tz/2020a.1.0");
  EXPECT_EQ(boot::latest_dataset_path(), "any/text");

  stage("");
  EXPECT_EQ(boot::latest_dataset_path(), "");
  EXPECT_EQ(observe([] { boot::current_dataset_path(); }).thrown, "-1");

  stage("zoneinfo =, tz_latest /");
  EXPECT_EQ(observe([] { boot::current_dataset_path(); }).thrown, std::to_string(EINVAL));
  EXPECT_EQ(observe([] { boot::latest_dataset_path(); }).thrown, std::to_string(EINVAL));
}

TEST(State, PreparationMakesNothingAndSaysNothing) {
  for (const auto* const situation : {"", "- tz", "- ."}) {
    stage(situation);
    const auto before = read_disk();
    expect_warnings(observe(boot::prepare_state_directories).warnings, {});
    EXPECT_EQ(read_disk(), before);
  }
}

TEST(State, MarkerIsMadeOnceAndKeepsItsContents) {
  struct {
    const char* situation;
    const char* changes;
    std::vector<std::string> warnings;
  } const table[] = {
      {"", "needs_cleanup =", {}},
      {"needs_cleanup = text", "", {}},
      {"needs_cleanup /", "", {"Cannot touch file /var/db/timezone/needs_cleanup: Is a directory"}},
      {"- .", "", {"Cannot touch file /var/db/timezone/needs_cleanup: No such file or directory"}},
  };
  for (const auto& [situation, changes, warnings] : table) {
    stage(situation);
    const auto before = read_disk();
    expect_warnings(observe(boot::mark_needs_cleanup).warnings, warnings);
    EXPECT_EQ(read_disk(), changed(before, changes)) << situation;
  }
  stage("");
  boot::mark_needs_cleanup();
  expect_warnings(observe(boot::mark_needs_cleanup).warnings, {});
}

}  // namespace
