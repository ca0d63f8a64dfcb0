#pragma once

namespace boot {

/// Makes the live links right, once, at the start of the system: decides between the dataset that is live, the latest
/// installed one and the system partition's, makes one of them live, and repairs what surrounds the links.
///
/// Returns the exit status: 0 when the links are right, also when that took the fallback to the system partition's
/// data; 1 when the zoneinfo or the local time link could not be made. Everything that went wrong has been warned of.
int reconcile();

}  // namespace boot
