#pragma once

#include <string>

namespace boot {

/// On a platform with data-protection classes, gives the state directory and the dataset root their class. Creates
/// neither. Failures cause no warning.
void prepare_state_directories() noexcept;

/// Returns the target of "tz_latest", not validated; empty when nothing is there. Throws what `fs::read_symlink`
/// throws.
std::string latest_dataset_path();

/// Returns the path of the dataset that the live zoneinfo link points into, empty for the system partition.
///
/// Throws what `fs::read_symlink` throws. Throws the `int` -1, after a warning, for a missing link or another target.
std::string current_dataset_path();

/// Creates the marker for the clean-up job if it does not exist. A failure only causes a warning.
void mark_needs_cleanup() noexcept;

}  // namespace boot
