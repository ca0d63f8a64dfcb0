#pragma once

namespace boot {

/// Makes "/var/db/timezone/localtime" point through the live zoneinfo link at a zone file. A target that begins with
/// "/var/db/timezone/zoneinfo" is left alone, whether or not it exists; one that begins with "/usr/share/zoneinfo" gets
/// the other beginning if the result exists; anything else is replaced by America/Los_Angeles. A change gives
/// warnings.
///
/// Throws errno, after a warning, when that last link cannot be created. What was there is then gone, unless it could
/// not be removed and is what is in the way, such as a directory with something in it (EEXIST).
void repair_localtime_link();

}  // namespace boot
