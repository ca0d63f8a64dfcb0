#include "boot/legacy_icu.hpp"

#include <err.h>

#include "fs/file_system.hpp"
#include "paths.hpp"

namespace boot {

void migrate_legacy_icu_link() noexcept {
  if (fs::path_exists(paths::legacy_icu_link) && !fs::path_exists(paths::icu_link)) {
    try {
      fs::create_symlink(fs::read_symlink(paths::legacy_icu_link).c_str(), paths::icu_link);
    } catch (...) {
      // ICU uses its own data without the link, and the next switch creates it.
      ::warn("Could not migrate %s to %s", paths::legacy_icu_link, paths::icu_link);
    }
  }
  // Also after a failed copy.
  if (fs::path_exists(paths::legacy_icu_link)) {
    try {
      fs::remove(paths::legacy_icu_link);
    } catch (...) {
      // No program uses the legacy link any more; the next boot tries again.
      ::warn("Could not remove %s", paths::legacy_icu_link);
    }
  }
}

}  // namespace boot
