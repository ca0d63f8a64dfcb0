#include "boot/reconcile.hpp"

#include <err.h>

#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <string>

#include "boot/legacy_icu.hpp"
#include "boot/localtime.hpp"
#include "boot/state.hpp"
#include "dataset/dataset.hpp"
#include "paths.hpp"

namespace boot {
namespace {

using dataset::vrel_dataset;

/// Returns the path of the dataset that the links point into. Links that point nowhere sensible are reset to the
/// system partition first, whose path is empty.
std::string valid_current_path() {
  try {
    return current_dataset_path();
  } catch (...) {
    ::warn("Invalid current symlinks; resetting to system partition");
  }
  vrel_dataset::reset_to_system();
  return {};
}

bool fits_system(const vrel_dataset& current, const vrel_dataset& system) {
  return all_compatible(current, system) && !newer_than(system, current);
}

/// Returns the dataset that the links point at from here on: the current one, or the system partition's in its place.
const vrel_dataset& keep_or_reset(const vrel_dataset& current, const vrel_dataset& system) {
  if (fits_system(current, system)) {
    return current;
  }
  ::warn("Symlink points at data incompatible with installed system");
  vrel_dataset::reset_to_system();
  mark_needs_cleanup();
  return system;
}

// The record is for information: a switch stands without it, so a failure to write it is not reported.
void record_switch(const vrel_dataset& from, const vrel_dataset& to) {
  std::ofstream record(paths::version_difference_record);
  record << version_string(from) << '_' << version_string(to);
}

void decide() {
  const vrel_dataset system;
  const auto latest_path = latest_dataset_path();
  const vrel_dataset current(valid_current_path());
  const auto& in_force = keep_or_reset(current, system);
  if (latest_path.empty()) {
    return;
  }
  const vrel_dataset latest(latest_path);
  if (!all_compatible(latest, system) || !newer_than(latest, current)) {
    ::warn("New update not compatible or older version: %s vs. %s", version_string(latest).c_str(),
           version_string(current).c_str());
    return;
  }
  activate_all(latest);
  if (!same_path(in_force, system)) {
    mark_needs_cleanup();
  }
  record_switch(in_force, latest);
}

/// Makes the right dataset live, or the system partition's when anything goes wrong. Returns whether that went through.
bool make_data_live() {
  try {
    decide();
    return true;
  } catch (...) {
    ::warn("Unable to locate data; resetting to system partition");
  }
  try {
    vrel_dataset::reset_to_system();
    return true;
  } catch (...) {
    return false;  // The local time can be repaired all the same.
  }
}

/// Repairs the local time link. Returns whether that went through.
bool make_localtime_right() {
  try {
    repair_localtime_link();
    return true;
  } catch (...) {
    return false;  // The failed call has warned.
  }
}

}  // namespace

int reconcile() {
  prepare_state_directories();
  migrate_legacy_icu_link();
  std::remove(paths::needs_cleanup);
  std::remove(paths::legacy_icu);
  const bool data_is_live = make_data_live();
  const bool localtime_is_right = make_localtime_right();
  return data_is_live && localtime_is_right ? EXIT_SUCCESS : EXIT_FAILURE;
}

}  // namespace boot
