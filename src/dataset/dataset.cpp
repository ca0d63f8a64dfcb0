#include "dataset/dataset.hpp"

#include <err.h>

#include <algorithm>
#include <stdexcept>
#include <string_view>

#include "dataset/icu.hpp"
#include "paths.hpp"

namespace dataset {
namespace {

/// Returns the part of an installed dataset's path after the dataset root. Warns and throws `std::invalid_argument`
/// when the part is empty or the path does not begin with the root.
std::string version_from_path(const std::string& path) {
  constexpr std::string_view root = paths::dataset_root;
  if (path.size() <= root.size() || !path.starts_with(root)) {
    ::warn("vrel_dataset::create_components: bad path %s", path.c_str());
    throw std::invalid_argument("badpath");
  }
  return path.substr(root.size());
}

}  // namespace

vrel_dataset::vrel_dataset(const std::string& path) : dataset_path_(path) { create_components(); }

void vrel_dataset::create_components() {
  const auto zoneinfo = std::make_shared<const vrel_zoneinfo>(dataset_path_);
  version_string_ = dataset_path_.empty() ? zoneinfo->zoneinfo_version() + ".1.0" : version_from_path(dataset_path_);
  data_version_ = version::data_version(version_string_);
  components_.push_back(zoneinfo);
  components_.push_back(std::make_shared<const vrel_icu>(dataset_path_));
}

void vrel_dataset::reset_to_system() {
  // Reads the system dataset again, because the first attempt may have failed. Its warnings can therefore appear twice.
  const vrel_dataset system;
  activate_all(system);
}

bool same_path(const vrel_dataset& a, const vrel_dataset& b) noexcept { return a.dataset_path_ == b.dataset_path_; }

bool newer_than(const vrel_dataset& a, const vrel_dataset& b) noexcept {
  return version::newer_than(a.data_version_, b.data_version_);
}

bool all_compatible(const vrel_dataset& a, const vrel_dataset& b) {
  return std::ranges::equal(a.components_, b.components_,
                            [](const auto& own, const auto& other) { return own->compatible_schema(other.get()); });
}

void activate_all(const vrel_dataset& d) {
  for (const auto& component : d.components_) {
    component->activate();
  }
}

std::string version_string(const vrel_dataset& d) { return d.version_string_; }

}  // namespace dataset
