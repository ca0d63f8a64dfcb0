#pragma once

#include <string>

namespace dataset {

/// One kind of data in a dataset: its directory, what has to be known of it, and the live link that leads to it.
/// A component reads its directory when it is built and never changes afterwards.
///
/// The destructor is neither virtual nor public: a component is created by `std::make_shared` of its concrete class,
/// whose handle destroys that class, and is never deleted through this interface.
class vrel_dataset_component {
 public:
  vrel_dataset_component(const vrel_dataset_component&) = delete;
  vrel_dataset_component& operator=(const vrel_dataset_component&) = delete;

  /// Returns whether this data and that of `other`, a component of another dataset, can stand in for each other.
  virtual bool compatible_schema(const vrel_dataset_component* other) const = 0;

  /// Repoints the live link of this kind of data at this component's directory: removes the link and creates it anew.
  /// A link that cannot be removed gives warnings only.
  ///
  /// Throws errno when the link cannot be created; what was removed stays removed.
  virtual void activate() const = 0;

 protected:
  explicit vrel_dataset_component(const std::string& path) : dataset_path_(path) {}
  ~vrel_dataset_component() = default;

  const std::string dataset_path_;  // empty: the system partition
};

/// The compiled zone files of a dataset. They have no schema: any fits any other.
class vrel_zoneinfo final : public vrel_dataset_component {
 public:
  /// The zone files of the dataset at `path`; those of the system partition when `path` is empty.
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
