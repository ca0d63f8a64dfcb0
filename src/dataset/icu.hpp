#pragma once

#include <string>

#include "dataset/component.hpp"

namespace dataset {

/// The ICU data of the dataset at a path, of the system partition if that is empty. It has a schema, such as 44l, and
/// fits only data of the same schema, an empty one included.
class vrel_icu final : public vrel_dataset_component {
 public:
  /// Installed data without a schema gives a warning. Throws errno, after a warning, when memory for reading the
  /// directory runs out (ENOMEM).
  explicit vrel_icu(const std::string& path = {});

  /// Warns when `other` is no ICU data.
  bool compatible_schema(const vrel_dataset_component* other) const override;

  /// Also removes the legacy link, unless the live link cannot be removed. For the system's data no link is created.
  void activate() const override;

 private:
  void initialize();
  void read_schema_from_file_names();

  std::string schema_;
  std::string data_directory_;
};

}  // namespace dataset
