#pragma once

#include <memory>
#include <string>
#include <vector>

#include "dataset/component.hpp"
#include "version/data_version.hpp"

namespace dataset {

/// One complete set of time-zone data that can be made live. It is read when it is built.
class vrel_dataset {
 public:
  /// The dataset at `path`, which is "/var/db/timezone/tz/" and its version string and need not exist; that of the
  /// system partition if empty, whose version string ends in ".1.0".
  ///
  /// Throws `std::invalid_argument` "badpath", after a warning, for a path of any other form, and what parsing the
  /// version and reading the ICU data throw.
  explicit vrel_dataset(const std::string& path = {});

  vrel_dataset(const vrel_dataset&) = delete;
  vrel_dataset& operator=(const vrel_dataset&) = delete;

  /// Makes the system partition's data live. Throws what building that dataset and `activate_all` throw.
  static void reset_to_system();

  friend bool same_path(const vrel_dataset& a, const vrel_dataset& b) noexcept;
  friend bool newer_than(const vrel_dataset& a, const vrel_dataset& b) noexcept;

  /// Returns whether each component of `a` is compatible with its counterpart in `b`.
  friend bool all_compatible(const vrel_dataset& a, const vrel_dataset& b);

  /// Makes `d` live. Throws errno when a link cannot be created; those after it are not touched.
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
