#include "boot/localtime.hpp"

#include <err.h>

#include <cstdio>
#include <string>
#include <string_view>

#include "fs/file_system.hpp"
#include "paths.hpp"

namespace boot {
namespace {

constexpr char fallback_zone[] = "America/Los_Angeles";

void replace_localtime_link(const std::string& target) {
  // Unlike fs::remove this takes an empty directory away too. If anything is left, the new link fails, which tells.
  std::remove(paths::localtime_link);
  fs::create_symlink(target, paths::localtime_link);
}

/// Brings the link into its form as far as it can without giving up the zone. Returns whether it could.
bool keep_zone() {
  const auto target = fs::read_symlink(paths::localtime_link);
  if (target.starts_with(paths::zoneinfo_link)) {
    return true;
  }
  if (!target.starts_with(paths::older_zoneinfo_prefix)) {
    return false;
  }
  constexpr auto older_length = std::string_view(paths::older_zoneinfo_prefix).size();
  const auto corrected = paths::zoneinfo_link + target.substr(older_length);
  ::warn("Correcting localtime link to %s", corrected.c_str());
  if (!fs::path_exists(corrected)) {
    return false;
  }
  replace_localtime_link(corrected);
  return true;
}

}  // namespace

void repair_localtime_link() {
  try {
    if (keep_zone()) {
      return;
    }
  } catch (...) {
    // Whatever failed, a device with some local time is better than one with none.
  }
  ::warn("localtime link invalid; resetting to %s", fallback_zone);
  replace_localtime_link(std::string(paths::zoneinfo_link) + "/" + fallback_zone);
}

}  // namespace boot
