#pragma once

#include <memory>
#include <string>
#include <vector>

#include "dataset/component.hpp"
#include "version/data_version.hpp"

namespace dataset {

/// One complete set of time-zone data that can be made live. The constructor reads it.
class vrel_dataset {
 public:
  /// Reads the dataset at `path`, which is "/var/db/timezone/tz/" followed by the version string. The directory need
  /// not exist. With an empty path, reads the system partition's dataset, whose version string ends in ".1.0".
  ///
  /// Throws `std::invalid_argument` "badpath", after a warning, for a path of another form, and what `parse_version`
  /// and the constructor of `vrel_icu` throw.
  explicit vrel_dataset(const std::string& path = {});

  vrel_dataset(const vrel_dataset&) = delete;
  vrel_dataset& operator=(const vrel_dataset&) = delete;

  /// Makes the system partition's data live. Throws what building that dataset and `activate_all` throw.
  static void reset_to_system();

  friend bool same_path(const vrel_dataset& a, const vrel_dataset& b) noexcept;
  friend bool newer_than(const vrel_dataset& a, const vrel_dataset& b) noexcept;

  /// Returns whether each component of `a` is compatible with its counterpart in `b`.
  friend bool all_compatible(const vrel_dataset& a, const vrel_dataset& b);

  /// Makes `d` live. Throws errno when a link cannot be created; the links after it are not touched.
  friend void activate_all(const vrel_dataset& d);

  friend std::string version_string(const vrel_dataset& d);

 private:
  void create_components();

  version::data_version data_version_;
  std::string version_string_;
  std::string dataset_path_;                                               // empty: the system partition
  std::vector<std::shared_ptr<const vrel_dataset_component>> components_;  // zoneinfo, then ICU
};

}  // namespace dataset
