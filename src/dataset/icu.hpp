#pragma once

#include <string>

#include "dataset/component.hpp"

namespace dataset {

/// The ICU data of the dataset at a path, or of the system partition if the path is empty. The data has a schema, such
/// as 44l. The schema can be empty. Data is compatible only with data of the same schema.
class vrel_icu final : public vrel_dataset_component {
 public:
  /// Warns when installed data has no schema. Throws errno, after a warning, when memory for reading the directory runs
  /// out (ENOMEM).
  explicit vrel_icu(const std::string& path = {});

  /// Warns when `other` is no ICU data.
  bool compatible_schema(const vrel_dataset_component* other) const override;

  /// Also removes the legacy link, unless the live link cannot be removed. Creates no link for the system's data.
  void activate() const override;

 private:
  void initialize();
  void read_schema_from_file_names();

  std::string schema_;
  std::string data_directory_;
};

}  // namespace dataset
