#pragma once

namespace boot {

/// Makes "/var/db/timezone/localtime" point through the live zoneinfo link at a zone file. A target that begins with
/// "/var/db/timezone/zoneinfo" is left alone, whether or not it exists. In one that begins with "/usr/share/zoneinfo"
/// this is replaced by "/var/db/timezone/zoneinfo", if the result exists. Anything else is replaced by
/// America/Los_Angeles. A change gives warnings.
///
/// Throws errno, after a warning, when the link to America/Los_Angeles cannot be created. The old link is then gone. A
/// directory with something in it stays (EEXIST).
void repair_localtime_link();

}  // namespace boot
