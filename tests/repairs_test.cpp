#include <gtest/gtest.h>

#include <cerrno>

#include "boot/legacy_icu.hpp"
#include "boot/localtime.hpp"
#include "sandbox.hpp"

namespace {

using sandbox::changed, sandbox::expect_warnings, sandbox::observe, sandbox::read_disk, sandbox::stage;

struct repair {
  std::string situation;
  const char* changes;
  std::vector<std::string> warnings = {};
  int raised = 0;
};

void expect_repair(void (*operation)(), const repair& row) {
  SCOPED_TRACE(row.situation);
  const auto before = read_disk();
  const auto result = observe(operation);
  EXPECT_EQ(read_disk(), changed(before, row.changes));
  EXPECT_EQ(result.thrown, row.raised == 0 ? "" : std::to_string(row.raised));
  expect_warnings(result.warnings, row.warnings);
}

TEST(Localtime, Repair) {
  const char* const fallback = "localtime > /var/db/timezone/zoneinfo/America/Los_Angeles";
  const std::string reset = "localtime link invalid; resetting to America/Los_Angeles";
  const std::string created =
      "create_symlink: from /var/db/timezone/localtime to /var/db/timezone/zoneinfo/America/Los_Angeles";
  const std::string correcting = "Correcting localtime link to /var/db/timezone/zoneinfo";
  const repair table[] = {
      {"localtime > /var/db/timezone/zoneinfo/Europe/Paris", ""},
      {"localtime > /var/db/timezone/zoneinfo/No/Such/Zone", ""},
      {"localtime > /var/db/timezone/zoneinfo", ""},
      {"localtime > /var/db/timezone/zoneinfo.old/UTC", ""},
      {"localtime > /usr/share/zoneinfo/Europe/Paris",
       "localtime > /var/db/timezone/zoneinfo/Europe/Paris",
       {correcting + "/Europe/Paris"}},
      {"localtime > /usr/share/zoneinfo", "localtime > /var/db/timezone/zoneinfo", {correcting}},
      {"localtime > /usr/share/zoneinfo/No/Such", fallback, {correcting + "/No/Such", reset}},
      {"localtime > /usr/share/zoneinfo.default/UTC", fallback, {correcting + ".default/UTC", reset}},
      {"localtime > /usr/share/zoneinfo/Europe/Paris, - zoneinfo", fallback, {correcting + "/Europe/Paris", reset}},
      {"localtime > @2020a.1.0/zoneinfo/UTC", fallback, {reset}},
      {"localtime > ../zoneinfo/UTC", fallback, {reset}},
      {"localtime > /var/db/timezone/zoneinf", fallback, {reset}},
      {"localtime > /usr/share/zoneinf", fallback, {reset}},
      {"- localtime", fallback, {reset}},
      {"- localtime, - zoneinfo", fallback, {reset}},
      {"localtime = TZif",
       fallback,
       {"read_symlink: /var/db/timezone/localtime: Invalid argument", reset + ": Invalid argument"}},
      {"- .", "", {reset, created + ": No such file or directory"}, ENOENT},
      {"localtime /", fallback, {"read_symlink: /var/db/timezone/localtime: Invalid argument", reset}},
      {"- localtime, localtime/x =",
       "",
       {"read_symlink: /var/db/timezone/localtime: Invalid argument", reset,
        "create_symlink: from /var/db/timezone/localtime to /var/db/timezone/zoneinfo/America/Los_Angeles: File "
        "exists"},
       EEXIST},
  };
  for (const auto& row : table) {
    stage("system 2021a 44l, zoneinfo > /usr/share/zoneinfo.default, " + row.situation);
    expect_repair(boot::repair_localtime_link, row);
  }
}

TEST(LegacyIcuLink, Migration) {
  const std::string not_a_link = "read_symlink: /var/db/icutz: Invalid argument";
  const std::string not_removed = "remove: could not remove /var/db/icutz: Is a directory";
  const std::string no_copy = "Could not migrate /var/db/icutz to /var/db/timezone/icutz";
  const repair table[] = {
      {"", ""},
      {"icutz > anywhere", ""},
      {"/var/db/icutz > timezone/tz", "icutz > timezone/tz, - /var/db/icutz"},
      {"/var/db/icutz > @2021b.1.0/icutz", "icutz > @2021b.1.0/icutz, - /var/db/icutz"},
      {"/var/db/icutz > @2021b.1.0/icutz, icutz > tz", "- /var/db/icutz"},
      {"/var/db/icutz > @2021b.1.0/icutz, icutz = file", "- /var/db/icutz"},
      {"/var/db/icutz > nowhere", ""},
      {"/var/db/icutz > nowhere, icutz > tz", ""},
      {"/var/db/icutz > timezone/tz, icutz > nowhere",
       "- /var/db/icutz",
       {"create_symlink: from /var/db/timezone/icutz to timezone/tz: File exists", no_copy}},
      {"/var/db/icutz /", "", {not_a_link, no_copy, not_removed, "Could not remove /var/db/icutz"}},
      {"/var/db/icutz = file", "- /var/db/icutz", {not_a_link, no_copy + ": Invalid argument"}},
      {"/var/db/icutz /, icutz = file", "", {not_removed, "Could not remove /var/db/icutz: Is a directory"}},
      {"/var/db/icutz > /usr, - .",
       "- /var/db/icutz",
       {"create_symlink: from /var/db/timezone/icutz to /usr: No such file or directory",
        no_copy + ": No such file or directory"}},
  };
  for (const auto& row : table) {
    stage("dataset 2021b.1.0 44l, " + row.situation);
    expect_repair(boot::migrate_legacy_icu_link, row);
  }
}

}  // namespace
