#pragma once

namespace boot {

/// Keeps a local time link that leads through the live zoneinfo link, rewrites one of the legacy form if the zone
/// exists, and replaces anything else by America/Los_Angeles.
///
/// Throws errno, after a warning, when the link cannot be created: EEXIST when what was there could not be removed;
/// otherwise that is gone.
void repair_localtime_link();

}  // namespace boot
