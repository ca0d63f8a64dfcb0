#pragma once

#include <string>

namespace boot {

/// Gives the state directory and the dataset root their data-protection class, where the platform has them. Creates
/// neither. Failures cause no warning.
void prepare_state_directories() noexcept;

/// Returns the target of "tz_latest", not validated; empty when there is no link. Throws what `fs::read_symlink`
/// throws.
std::string latest_dataset_path();

/// Returns the path of the dataset that the live zoneinfo link points into, empty for the system partition.
///
/// Throws what `fs::read_symlink` throws. Throws the `int` -1, after a warning, for a missing link or another target.
std::string current_dataset_path();

/// Creates the marker for the clean-up job if it does not exist. A failure only causes a warning.
void mark_needs_cleanup() noexcept;

}  // namespace boot
