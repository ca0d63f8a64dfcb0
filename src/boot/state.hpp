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
/// Throws what `fs::read_symlink` throws, and what `dataset_path_from_link` throws: it rejects a missing link.
std::string current_dataset_path();

/// Returns the path of the dataset that the zoneinfo link's `target` lies in: all before the last "/" when the target
/// begins with "/var/db/timezone/tz/" and at least one byte is between that and the last "/"; the empty string for
/// the system partition's zone files.
///
/// Throws the `int` -1, after a warning, for every other target.
std::string dataset_path_from_link(const std::string& target);

/// Creates the marker by which the clean-up job knows that an installed dataset was given up. A marker that exists
/// keeps its contents. A failure gives a warning only.
void mark_needs_cleanup() noexcept;

}  // namespace boot
