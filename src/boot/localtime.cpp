#include "boot/localtime.hpp"

#include <err.h>

#include <cstdio>
#include <string>
#include <string_view>

#include "fs/file_system.hpp"
#include "paths.hpp"

namespace boot {
namespace {

void replace_localtime_link(const char* target) {
  // Unlike fs::remove, std::remove also removes an empty directory. If removal fails, create_symlink reports it.
  std::remove(paths::localtime_link);
  fs::create_symlink(target, paths::localtime_link);
}

/// Keeps the user's zone: accepts a target through the live zoneinfo link, and rewrites a target of the legacy form.
/// Returns false when the zone cannot be kept.
bool try_keep_zone() {
  const auto target = fs::read_symlink(paths::localtime_link);
  if (target.starts_with(paths::zoneinfo_link)) {
    return true;
  }
  if (!target.starts_with(paths::legacy_zoneinfo_prefix)) {
    return false;
  }
  constexpr auto legacy_length = std::string_view(paths::legacy_zoneinfo_prefix).size();
  const auto corrected = paths::zoneinfo_link + target.substr(legacy_length);
  ::warn("Correcting localtime link to %s", corrected.c_str());
  if (!fs::path_exists(corrected.c_str())) {
    return false;
  }
  replace_localtime_link(corrected.c_str());
  return true;
}

}  // namespace

void repair_localtime_link() {
  try {
    if (try_keep_zone()) {
      return;
    }
  } catch (...) {
    // Whatever failed, a device with some local time is better than one with none.
  }
  ::warn("localtime link invalid; resetting to America/Los_Angeles");
  replace_localtime_link(paths::fallback_localtime);
}

}  // namespace boot
