#include "dataset/component.hpp"

#include <err.h>

#include "fs/file_system.hpp"
#include "paths.hpp"

namespace dataset {

vrel_zoneinfo::vrel_zoneinfo(const std::string& path)
    : vrel_dataset_component(path), data_directory_(path.empty() ? paths::system_zoneinfo : path + "/zoneinfo") {
  initialize();
}

void vrel_zoneinfo::initialize() { zoneinfo_version_ = fs::first_word((data_directory_ + "/+VERSION").c_str()); }

bool vrel_zoneinfo::compatible_schema(const vrel_dataset_component* /*other*/) const { return true; }

void vrel_zoneinfo::activate() const {
  try {
    fs::remove(paths::zoneinfo_link);
  } catch (...) {
    // If anything is left there, creating the new link fails, and that decides.
    ::warn("Unlink of zoneinfo softlink failed");
  }
  fs::create_symlink(data_directory_.c_str(), paths::zoneinfo_link);
}

std::string vrel_zoneinfo::zoneinfo_version() const { return zoneinfo_version_; }

}  // namespace dataset
