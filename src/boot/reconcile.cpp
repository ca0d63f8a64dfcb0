#include "boot/reconcile.hpp"

#include <err.h>

#include <cstdio>
#include <string>

#include "boot/legacy_icu.hpp"
#include "boot/localtime.hpp"
#include "boot/state.hpp"
#include "dataset/dataset.hpp"
#include "fs/file_system.hpp"
#include "paths.hpp"

namespace boot {
namespace {

using dataset::vrel_dataset;

/// Returns the path of the current dataset, empty for the system partition's data. If the zoneinfo link is missing,
/// cannot be read or is not recognised, makes the system partition's data live.
std::string current_path_or_reset() {
  try {
    return current_dataset_path();
  } catch (...) {
    // Normal at the first boot of a device: the link does not exist yet.
    ::warn("Invalid current symlinks; resetting to system partition");
    vrel_dataset::reset_to_system();
    return {};
  }
}

/// Makes the system partition's data live, and creates the marker, unless the current dataset has its schema and is not
/// older. Returns whether the current dataset stays live.
bool keep_or_reset(const vrel_dataset& current, const vrel_dataset& system) {
  if (all_compatible(current, system) && !newer_than(system, current)) {
    return true;
  }
  ::warn("Symlink points at data incompatible with installed system");
  vrel_dataset::reset_to_system();
  mark_needs_cleanup();
  return false;
}

/// Switches from one dataset to another: makes `to` live, creates the marker if `from` is an installed dataset, and
/// writes the record.
void switch_datasets(const vrel_dataset& from, const vrel_dataset& to, const vrel_dataset& system) {
  activate_all(to);
  if (!same_path(from, system)) {
    mark_needs_cleanup();
  }
  // The record is for information only: a failed write is not reported and does not undo the switch.
  fs::write_file(paths::version_difference_record, version_string(from) + '_' + version_string(to));
}

/// Makes the right dataset live.
///
/// Throws when "tz_latest" or a version cannot be used, or a live link cannot be created.
void reconcile_datasets() {
  const vrel_dataset system;
  const auto latest_path = latest_dataset_path();
  const vrel_dataset current(current_path_or_reset());
  const bool kept = keep_or_reset(current, system);
  if (latest_path.empty()) {
    return;
  }
  const vrel_dataset latest(latest_path);
  // `latest` is compared with `current` even if keep_or_reset has just rejected `current`. If `latest` is older than
  // the system dataset, the next boot rejects it.
  if (!all_compatible(latest, system) || !newer_than(latest, current)) {
    ::warn("New update not compatible or older version: %s vs. %s", version_string(latest).c_str(),
           version_string(current).c_str());
    return;
  }
  switch_datasets(kept ? current : system, latest, system);
}

/// Returns whether the step completes. A step that fails must not prevent the next ones.
bool succeeds(void (*step)()) noexcept {
  try {
    step();
    return true;
  } catch (...) {
    return false;
  }
}

}  // namespace

bool reconcile() noexcept {
  prepare_state_directories();
  migrate_legacy_icu_link();
  // Leftovers of earlier runs and releases; harmless if they stay.
  std::remove(paths::needs_cleanup);
  std::remove(paths::legacy_icu);
  bool live = succeeds(reconcile_datasets);
  if (!live) {
    ::warn("Unable to locate data; resetting to system partition");
    live = succeeds(vrel_dataset::reset_to_system);
  }
  const bool local = succeeds(repair_localtime_link);
  return live && local;
}

}  // namespace boot
