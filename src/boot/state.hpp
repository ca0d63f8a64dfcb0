#pragma once

#include <string>

namespace boot {

/// Gives the state directory and the dataset root their data-protection class, where the platform has them. Creates
/// neither. Failures give no warning.
void prepare_state_directories() noexcept;

/// Returns what "tz_latest" holds, unexamined; empty when there is no link. Throws what `fs::read_symlink` throws.
std::string latest_dataset_path();

/// Returns the path of the dataset that the live zoneinfo link leads into, empty for the system partition.
///
/// Throws what `fs::read_symlink` throws and, after a warning, the `int` -1 for a missing link or any other target.
std::string current_dataset_path();

/// Creates the marker for the clean-up job, or leaves it as it is. A failure gives a warning only.
void mark_needs_cleanup() noexcept;

}  // namespace boot
