#pragma once

#include <string>

namespace dataset {

/// One kind of data in a dataset, read by the constructor. The kinds are classes so that a further one needs no change
/// where datasets are compared and made live. Create components with `std::make_shared` of the concrete class: the
/// destructor is not virtual, and such a handle remembers the class.
class vrel_dataset_component {
 public:
  vrel_dataset_component(const vrel_dataset_component&) = delete;
  vrel_dataset_component& operator=(const vrel_dataset_component&) = delete;

  /// Returns whether this data and `other`, the same kind of data of another dataset, can replace each other.
  virtual bool compatible_schema(const vrel_dataset_component* other) const = 0;

  /// Removes the live link of this kind of data and creates it again. A failed removal only causes warnings.
  ///
  /// Throws errno, after a warning, when the link cannot be created. With EEXIST the old entry is still there,
  /// otherwise there is no link.
  virtual void activate() const = 0;

 protected:
  explicit vrel_dataset_component(const std::string& path) : dataset_path_(path) {}
  ~vrel_dataset_component() = default;

  const std::string dataset_path_;  // empty: the system partition
};

/// The compiled zone files of the dataset at a path, or of the system partition if the path is empty. All zone files
/// are compatible.
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
