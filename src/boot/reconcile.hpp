#pragma once

namespace boot {

/// Makes the right dataset live and repairs the links around it.
///
/// Returns false, after a warning, when the fallback has failed or the local time link could not be created. A failure
/// of one does not prevent the other.
bool reconcile() noexcept;

}  // namespace boot
