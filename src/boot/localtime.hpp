#pragma once

namespace boot {

/// Repairs the local time link. A target that begins with the path of the live zoneinfo link is kept, even if there is
/// no such zone. A target of the legacy form is rewritten if the zone exists. Anything else is replaced with a link to
/// America/Los_Angeles.
///
/// Throws errno, after a warning, when the link cannot be created. With EEXIST the old entry is still there, otherwise
/// it has been removed.
void repair_localtime_link();

}  // namespace boot
