#pragma once

namespace boot {

/// Makes the dataset live that is to be live at this boot, and repairs the links around it.
///
/// Returns false, after a warning, when even the fallback has failed, or the local time link could not be created; each
/// is tried whatever became of the other.
bool reconcile() noexcept;

}  // namespace boot
