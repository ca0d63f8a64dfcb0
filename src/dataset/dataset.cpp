#include "dataset/dataset.hpp"

#include <err.h>

#include <algorithm>
#include <stdexcept>
#include <string_view>

#include "dataset/icu.hpp"
#include "paths.hpp"

namespace dataset {
namespace {

/// Returns what follows the dataset root in the path of an installed dataset. Warns and throws
/// `std::invalid_argument` when nothing does or the path lies elsewhere.
std::string version_from_path(const std::string& path) {
  constexpr std::string_view root = paths::dataset_root;
  if (path.size() <= root.size() || !path.starts_with(root)) {
    ::warn("vrel_dataset::create_components: bad path %s", path.c_str());
    throw std::invalid_argument("badpath");
  }
  return path.substr(root.size());
}

}  // namespace

vrel_dataset::vrel_dataset() { create_components(); }

vrel_dataset::vrel_dataset(const std::string& path) : dataset_path(path) { create_components(); }

void vrel_dataset::create_components() {
  const auto zoneinfo = std::make_shared<const vrel_zoneinfo>(dataset_path);
  version_string = dataset_path.empty() ? zoneinfo->zoneinfo_version() + ".1.0" : version_from_path(dataset_path);
  version::parse_version(data_version, version_string);
  components.push_back(zoneinfo);
  components.push_back(std::make_shared<const vrel_icu>(dataset_path));
}

void vrel_dataset::reset_to_system() {
  const vrel_dataset system;
  activate_all(system);
}

bool same_path(const vrel_dataset& a, const vrel_dataset& b) noexcept { return a.dataset_path == b.dataset_path; }

bool newer_than(const vrel_dataset& a, const vrel_dataset& b) noexcept {
  return version::newer_than(a.data_version, b.data_version);
}

bool all_compatible(const vrel_dataset& a, const vrel_dataset& b) {
  return std::equal(a.components.begin(), a.components.end(), b.components.begin(), b.components.end(),
                    [](const auto& own, const auto& other) { return own->compatible_schema(other.get()); });
}

void activate_all(const vrel_dataset& d) {
  for (const auto& component : d.components) {
    component->activate();
  }
}

std::string version_string(const vrel_dataset& d) { return d.version_string; }

}  // namespace dataset
