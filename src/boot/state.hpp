#pragma once

#include <string>

namespace boot {

/// Puts the state directory and the dataset root into their data-protection class, where the platform has them.
/// A directory that is missing or cannot be opened gives no warning; none is created.
void prepare_state_directories() noexcept;

/// Returns what "tz_latest" holds, unexamined: the path of the newest installed dataset. Empty when there is no link.
///
/// Throws what `fs::read_symlink` throws.
std::string latest_dataset_path();

/// Returns the path of the dataset that the live zoneinfo link points into, empty for the system partition.
///
/// Throws what `fs::read_symlink` throws and, after a warning, the `int` -1 for a missing link and for one that leads
/// neither into a dataset nor exactly to the system partition's zone files.
std::string current_dataset_path();

/// Creates the marker by which the clean-up job knows that an installed dataset was given up. A marker that exists
/// keeps its contents. A failure gives a warning only.
void mark_needs_cleanup() noexcept;

}  // namespace boot
