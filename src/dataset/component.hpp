#pragma once

#include <string>

namespace dataset {

/// One kind of data in a dataset. It is read when the component is built. `std::make_shared` of the concrete class
/// creates it, so that the handle destroys that class: the destructor here is not virtual.
class vrel_dataset_component {
 public:
  vrel_dataset_component(const vrel_dataset_component&) = delete;
  vrel_dataset_component& operator=(const vrel_dataset_component&) = delete;

  /// Returns whether this data and that of another dataset can stand in for each other.
  virtual bool compatible_schema(const vrel_dataset_component* other) const = 0;

  /// Removes the live link of this kind of data, a failure giving warnings only, and creates it anew.
  ///
  /// Throws errno, after a warning, when it cannot be created: EEXIST when the old one is still there; otherwise it is
  /// missing.
  virtual void activate() const = 0;

 protected:
  explicit vrel_dataset_component(const std::string& path) : dataset_path_(path) {}
  ~vrel_dataset_component() = default;

  const std::string dataset_path_;  // empty: the system partition
};

/// The compiled zone files of the dataset at a path, of the system partition if that is empty. Any fit any others.
class vrel_zoneinfo final : public vrel_dataset_component {
 public:
  explicit vrel_zoneinfo(const std::string& path = {});

  bool compatible_schema(const vrel_dataset_component* other) const override;
  void activate() const override;

  /// Returns the first word of the version file "+VERSION", empty when there is none.
  std::string zoneinfo_version() const;

 private:
  void initialize();

  std::string data_directory_;
  std::string zoneinfo_version_;
};

}  // namespace dataset
