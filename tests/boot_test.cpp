#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <ostream>

#include "sandbox.hpp"

namespace {

using sandbox::changed, sandbox::expect_warnings, sandbox::read_disk, sandbox::stage;

struct boot_row {
  const char* name;
  std::string situation;
  const char* changes;
  std::vector<std::string> warnings = {};
  int status = 0;

  friend void PrintTo(const boot_row& row, std::ostream* out) { *out << row.name; }
};

const std::string system_live = "system 2021a 44l, live system, ";
const std::string installed_live = "system 2021a 44l, dataset 2021b.1.0 44l, live 2021b.1.0, ";

const char* const invalid = "Invalid current symlinks; resetting to system partition";
const char* const incompatible = "Symlink points at data incompatible with installed system";
const char* const unable = "Unable to locate data; resetting to system partition";
const char* const zoneinfo_taken =
    "create_symlink: from /var/db/timezone/zoneinfo to /usr/share/zoneinfo.default: File exists";

std::string refused(const std::string& latest, const std::string& current) {
  return "New update not compatible or older version: " + latest + " vs. " + current;
}

const boot_row table[] = {
    // The current dataset is kept.
    {"Quiet", system_live, ""},
    {"QuietInstalled", installed_live, ""},
    {"SameVersionAsSystemIsKept", "system 2021a 44l, dataset 2021a.1.0 44l, live 2021a.1.0", ""},
    {"WithoutAnySchema", "system 2021a -, live system", ""},
    {"OldMarkerAndLegacyPathsGo", system_live + "needs_cleanup = x, /var/db/icu /, /var/db/icutz > icu",
     "- needs_cleanup, - /var/db/icu, - /var/db/icutz, icutz > icu"},
    {"LegacyPathThatCannotGo", system_live + "/var/db/icu/x =, needs_cleanup/x =", ""},

    // The latest dataset is switched to.
    {"SwitchFromSystem", system_live + "dataset 2021b.1.0 44l, latest 2021b.1.0",
     "live 2021b.1.0, record 2021a.1.0_2021b.1.0"},
    {"SwitchFromInstalled",
     installed_live + "dataset 2022a.1.0 44l, latest 2022a.1.0, record a longer and older record",
     "live 2022a.1.0, marker, record 2021b.1.0_2022a.1.0"},
    {"SwitchFromInstalledOfTheSystemsVersion",
     "system 2021a 44l, dataset 2021a.1.0 44l, live 2021a.1.0, dataset 2022a.1.0 44l, latest 2022a.1.0",
     "live 2022a.1.0, marker, record 2021a.1.0_2022a.1.0"},
    {"SwitchWithoutARecord", system_live + "dataset 2021b.1.0 44l, latest 2021b.1.0, TZVersionDiffRecord /",
     "live 2021b.1.0"},
    {"SwitchWithoutAMarker",
     installed_live + "dataset 2022a.1.0 44l, latest 2022a.1.0, needs_cleanup/x =",
     "live 2022a.1.0, record 2021b.1.0_2022a.1.0",
     {"Cannot touch file /var/db/timezone/needs_cleanup: Is a directory"}},

    // The latest dataset is refused.
    {"LatestIsLiveAlready", installed_live + "latest 2021b.1.0", "", {refused("2021b.1.0", "2021b.1.0")}},
    {"LatestIsOlder",
     installed_live + "dataset 2021a.9.0 44l, latest 2021a.9.0",
     "",
     {refused("2021a.9.0", "2021b.1.0")}},
    {"LatestIsOfAnotherSchema",
     system_live + "dataset 2021b.1.0 46l, latest 2021b.1.0",
     "",
     {refused("2021b.1.0", "2021a.1.0")}},
    {"LatestIsMissing",
     system_live + "latest 2021b.1.0",
     "",
     {"No ICU schema found for /var/db/timezone/tz/2021b.1.0", refused("2021b.1.0", "2021a.1.0")}},
    {"LatestHasNoVersion",
     system_live + "dataset new -, latest new",
     "",
     {"Cannot parse version string new, results.size() = 0", "Cannot parse version string new",
      "No ICU schema found for /var/db/timezone/tz/new", refused("new", "2021a.1.0")}},

    // The current dataset is rejected.
    {"SystemIsNewer", "system 2022a 44l, dataset 2021b.1.0 44l, live 2021b.1.0", "live system, marker", {incompatible}},
    {"SystemIsNewerThanCurrentAndLatest",
     "system 2022a 44l, dataset 2021b.1.0 44l, live 2021b.1.0, latest 2021b.1.0",
     "live system, marker",
     {incompatible, refused("2021b.1.0", "2021b.1.0")}},
    {"SystemIsOfAnotherSchema",
     "system 2021a 46l, dataset 2021b.1.0 44l, live 2021b.1.0",
     "live system, marker",
     {incompatible}},
    {"LatestIsOlderThanSystemButNewerThanTheRejected",
     "system 2022z 44l, dataset 2021b.1.0 44l, dataset 2022a.1.0 44l, live 2021b.1.0, latest 2022a.1.0",
     "live 2022a.1.0, marker, record 2022z.1.0_2022a.1.0",
     {incompatible}},

    {"CurrentIsMissing",
     "system 2021a 44l, live 2021b.1.0",
     "live system, marker",
     {"No ICU schema found for /var/db/timezone/tz/2021b.1.0", incompatible}},
    {"LatestFitsTheSystemUnlikeTheRejected",
     "system 2021a 46l, dataset 2021b.1.0 44l, dataset 2022a.1.0 46l, live 2021b.1.0, latest 2022a.1.0, "
     "needs_cleanup/x =",
     "live 2022a.1.0, record 2021a.1.0_2022a.1.0",
     {incompatible, "Cannot touch file /var/db/timezone/needs_cleanup: Is a directory"}},
    {"LatestFitsTheRejectedUnlikeTheSystem",
     "system 2021a 46l, dataset 2021b.1.0 44l, dataset 2022a.1.0 44l, live 2021b.1.0, latest 2022a.1.0",
     "live system, marker",
     {incompatible, refused("2022a.1.0", "2021b.1.0")}},
    {"RejectionIsToldBeforeTheReset",
     "system 2022a 44l, dataset 2021b.1.0 44l, live 2021b.1.0, icutz /",
     "zoneinfo > /usr/share/zoneinfo.default, marker",
     {incompatible, "remove: could not remove /var/db/timezone/icutz: Is a directory",
      "unlink of ICU softlink failed"}},

    // The live zoneinfo link is invalid.
    {"FirstBoot", "system 2021a 44l", "live system", {"Bad zoneinfo link : No such file or directory", invalid}},
    {"InvalidLinkAndLatestAccepted",
     "system 2021a 44l, dataset 2021b.1.0 44l, zoneinfo > anywhere, marker, latest 2021b.1.0",
     "live 2021b.1.0, - needs_cleanup, record 2021a.1.0_2021b.1.0",
     {"Bad zoneinfo link anywhere", invalid}},
    {"InvalidLinkAndLatestRefused",
     "system 2021a 44l, dataset 2020a.1.0 44l, zoneinfo = file, icutz > anywhere, latest 2020a.1.0",
     "live system",
     {"read_symlink: /var/db/timezone/zoneinfo: Invalid argument", invalid, refused("2020a.1.0", "2021a.1.0")}},

    // The fallback.
    {"LatestLiesElsewhere",
     installed_live + "tz_latest > /elsewhere",
     "live system",
     {"vrel_dataset::create_components: bad path /elsewhere", unable}},
    {"LatestIsNoLinkAndIsReadBeforeZoneinfo",
     "system 2021a 44l, zoneinfo > anywhere, tz_latest =",
     "live system",
     {"read_symlink: /var/db/timezone/tz_latest: Invalid argument", unable}},
    {"LatestVersionIsTooLarge",
     installed_live + "dataset 9999999999a 44l, latest 9999999999a",
     "live system",
     {unable}},
    {"SwitchBreaksOffHalfWay",
     system_live + "dataset 2021b.1.0 44l, icutz /, latest 2021b.1.0, record old",
     "",
     {"remove: could not remove /var/db/timezone/icutz: Is a directory", "unlink of ICU softlink failed",
      "create_symlink: from /var/db/timezone/icutz to /var/db/timezone/tz/2021b.1.0/icutz: File exists", unable,
      "remove: could not remove /var/db/timezone/icutz: Is a directory", "unlink of ICU softlink failed"}},
    {"InstalledSwitchBreaksOffHalfWay",
     "system 2021a 44l, dataset 2021b.1.0 44l, dataset 2022a.1.0 44l, live 2021b.1.0, icutz /, latest 2022a.1.0, "
     "marker",
     "zoneinfo > /usr/share/zoneinfo.default, - needs_cleanup",
     {"remove: could not remove /var/db/timezone/icutz: Is a directory", "unlink of ICU softlink failed",
      "create_symlink: from /var/db/timezone/icutz to /var/db/timezone/tz/2022a.1.0/icutz: File exists", unable,
      "remove: could not remove /var/db/timezone/icutz: Is a directory", "unlink of ICU softlink failed"}},
    {"FallbackKeepsTheMarkerOfTheRejection",
     "system 2022a 44l, dataset 2021b.1.0 44l, live 2021b.1.0, tz_latest > /elsewhere",
     "live system, marker",
     {incompatible, "vrel_dataset::create_components: bad path /elsewhere", unable}},
    {"CurrentVersionIsTooLarge",
     "system 2021a 44l, dataset 2021b.1.0 44l, zoneinfo > @9999999999a/zoneinfo, latest 2021b.1.0",
     "live system",
     {unable}},
    {"SystemVersionIsTooLarge", "system 9999999999a 44l, live system", "", {unable}, 1},
    {"SystemWithoutData",
     "live system",
     "",
     {"Cannot parse version string .1.0, results.size() = 0", "Cannot parse version string .1.0",
      "Cannot parse version string .1.0, results.size() = 0", "Cannot parse version string .1.0"}},

    // The two open ends: what can be repaired is, and the status tells of the rest.
    {"ZoneinfoCannotBeMade",
     "system 2021a 44l, zoneinfo/x =, localtime > /elsewhere",
     "localtime > /var/db/timezone/zoneinfo/America/Los_Angeles",
     {"read_symlink: /var/db/timezone/zoneinfo: Invalid argument", invalid,
      "remove: could not remove /var/db/timezone/zoneinfo: Is a directory", "Unlink of zoneinfo softlink failed",
      zoneinfo_taken, unable, "remove: could not remove /var/db/timezone/zoneinfo: Is a directory",
      "Unlink of zoneinfo softlink failed", zoneinfo_taken, "localtime link invalid; resetting to America/Los_Angeles"},
     1},
    {"LocaltimeCannotBeMade",
     system_live + "- localtime, localtime/x =",
     "",
     {"read_symlink: /var/db/timezone/localtime: Invalid argument",
      "localtime link invalid; resetting to America/Los_Angeles",
      "create_symlink: from /var/db/timezone/localtime to /var/db/timezone/zoneinfo/America/Los_Angeles: File exists"},
     1},

    // The local time link is repaired after the switch, in the data that is live by then.
    {"LocaltimeZoneCameWithTheUpdate",
     system_live + "dataset 2021b.1.0 44l, tz/2021b.1.0/zoneinfo/Mars/Olympus = TZif, latest 2021b.1.0, localtime > "
                   "/usr/share/zoneinfo/Mars/Olympus",
     "live 2021b.1.0, record 2021a.1.0_2021b.1.0, localtime > /var/db/timezone/zoneinfo/Mars/Olympus",
     {"Correcting localtime link to /var/db/timezone/zoneinfo/Mars/Olympus"}},
    {"LocaltimeZoneWentWithTheUpdate",
     "system 2022a 44l, dataset 2021b.1.0 44l, tz/2021b.1.0/zoneinfo/Mars/Olympus = TZif, live 2021b.1.0, localtime > "
     "/usr/share/zoneinfo/Mars/Olympus",
     "live system, marker, localtime > /var/db/timezone/zoneinfo/America/Los_Angeles",
     {incompatible, "Correcting localtime link to /var/db/timezone/zoneinfo/Mars/Olympus",
      "localtime link invalid; resetting to America/Los_Angeles"}},
};

class Boot : public testing::TestWithParam<boot_row> {
 protected:
  /// Runs one pass on the row's situation. One that has nothing to change must not so much as touch the directory.
  static void expect_pass(sandbox::outcome (*pass)()) {
    constexpr char state_directory[] = "/var/db/timezone";
    const auto& row = GetParam();
    stage(row.situation);
    const auto before = read_disk();
    const timespec long_ago[2] = {};
    ASSERT_EQ(::utimensat(AT_FDCWD, state_directory, long_ago, 0), 0);

    const auto result = pass();

    expect_warnings(result.warnings, row.warnings);
    EXPECT_EQ(result.status, row.status);
    EXPECT_EQ(read_disk(), changed(before, row.changes));
    struct stat directory {};
    ::stat(state_directory, &directory);
    EXPECT_TRUE(directory.st_mtim.tv_sec == 0 || !row.warnings.empty() || *row.changes != '\0');
  }
};

TEST_P(Boot, InProcess) { expect_pass(sandbox::run_pass); }

TEST_P(Boot, ReleaseBinary) {
  expect_pass([] { return sandbox::run_release_binary(); });
}

std::string name_of(const testing::TestParamInfo<boot_row>& info) { return info.param.name; }

INSTANTIATE_TEST_SUITE_P(, Boot, testing::ValuesIn(table), name_of);

}  // namespace
