#pragma once

/// The map of every fixed path. The directories and files in a dataset are named by its components.
namespace paths {

// The system partition, read-only.
inline constexpr char system_zoneinfo[] = "/usr/share/zoneinfo.default";  // compiled zone files and "+VERSION"
inline constexpr char system_icu[] = "/usr/share/icu";                    // ICU data and "icutzformat.txt"

// The state directory. Neither this directory nor the dataset root is created by this program.
inline constexpr char state_directory[] = "/var/db/timezone/";
inline constexpr char dataset_root[] = "/var/db/timezone/tz/";  // one directory per installed dataset, by its version

// The live links, through which programs reach the data.
inline constexpr char zoneinfo_link[] = "/var/db/timezone/zoneinfo";    // the zone files of the live dataset
inline constexpr char icu_link[] = "/var/db/timezone/icutz";            // its ICU data, if it is an installed one
inline constexpr char localtime_link[] = "/var/db/timezone/localtime";  // one zone file, through zoneinfo_link
inline constexpr char fallback_localtime[] = "/var/db/timezone/zoneinfo/America/Los_Angeles";  // without a usable zone

// Notes to and from other software.
inline constexpr char latest_link[] = "/var/db/timezone/tz_latest";        // newest dataset, from the update installer
inline constexpr char needs_cleanup[] = "/var/db/timezone/needs_cleanup";  // empty marker, for the clean-up job
inline constexpr char version_difference_record[] = "/var/db/timezone/TZVersionDiffRecord";  // the last switch

// Leftovers of earlier releases of the system.
inline constexpr char legacy_icu_link[] = "/var/db/icutz";               // earlier place of icu_link
inline constexpr char legacy_icu[] = "/var/db/icu";                      // no longer used
inline constexpr char legacy_zoneinfo_prefix[] = "/usr/share/zoneinfo";  // localtime_link pointed there

}  // namespace paths
