#pragma once

namespace boot {

/// Makes "/var/db/timezone/localtime" point through the live zoneinfo link at a zone file. A link that does is left
/// alone, whether or not the zone exists; one that points into "/usr/share/zoneinfo" is rewritten when the zone exists
/// in the live data; anything else gives way to a link to America/Los_Angeles. Each change gives a warning.
///
/// Throws errno, after a warning, when that last link cannot be made; what stood there is then gone, unless it is
/// what stood in the way.
void repair_localtime_link();

}  // namespace boot
