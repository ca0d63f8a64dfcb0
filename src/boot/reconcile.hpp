#pragma once

namespace boot {

/// Makes the live links right, once, at the start of the system: decides between the dataset that is live, the latest
/// installed one and the system partition's, makes one of them live, and repairs what surrounds the links.
///
/// Returns the exit status: 0 when the run came to its end, also when that took the fallback to the system partition's
/// data; 1 when the fallback itself or the repair of the local time link failed. The other of the two has then run.
int reconcile();

}  // namespace boot
