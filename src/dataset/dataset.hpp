#pragma once

#include <memory>
#include <string>
#include <vector>

#include "dataset/component.hpp"
#include "version/data_version.hpp"

namespace dataset {

/// One complete set of time-zone data that can be made live: the system partition's, or an installed one. It is read
/// when it is built and never changes afterwards.
class vrel_dataset {
 public:
  /// The dataset installed at `path`, which is "/var/db/timezone/tz/" and its version string. The directory need not
  /// exist: its data then has no schema. When `path` is empty, the dataset of the system partition, whose version
  /// string is the zone files' version followed by ".1.0". A version that cannot be parsed gives warnings only.
  ///
  /// Throws `std::invalid_argument` "badpath", after a warning, for a path of any other form, `std::out_of_range` when
  /// a number in the version is too large, and errno when the ICU data cannot be walked.
  explicit vrel_dataset(const std::string& path = {});

  vrel_dataset(const vrel_dataset&) = delete;
  vrel_dataset& operator=(const vrel_dataset&) = delete;

  /// Makes the system partition's data live. Throws what building that dataset and `activate_all` throw.
  static void reset_to_system();

  /// Returns whether both are at the same path, compared as bytes.
  friend bool same_path(const vrel_dataset& a, const vrel_dataset& b) noexcept;

  /// Returns whether the version of `a` is strictly newer than that of `b`.
  friend bool newer_than(const vrel_dataset& a, const vrel_dataset& b) noexcept;

  /// Returns whether each component of `a` is compatible with its counterpart in `b`.
  friend bool all_compatible(const vrel_dataset& a, const vrel_dataset& b);

  /// Makes `d` live, one component after the other.
  ///
  /// Throws errno when a link cannot be created: the links before it stay repointed, those after it are not touched.
  friend void activate_all(const vrel_dataset& d);

  /// Returns the version as text.
  friend std::string version_string(const vrel_dataset& d);

 private:
  void create_components();

  version::data_version data_version_;
  std::string version_string_;
  std::string dataset_path_;                                               // empty: the system partition
  std::vector<std::shared_ptr<const vrel_dataset_component>> components_;  // zoneinfo, then ICU
};

}  // namespace dataset
