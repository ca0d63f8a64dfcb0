#pragma once

#include <string>

#include "dataset/component.hpp"

namespace dataset {

/// The ICU time-zone data of a dataset. It has a schema, such as 44l, and fits only data of the same schema.
class vrel_icu final : public vrel_dataset_component {
 public:
  /// The ICU data of the dataset at `path`; that of the system partition when `path` is empty. Installed data has
  /// the schema that the name of a regular file directly in its directory has, if others can read that file. Without
  /// such a file there is a warning, and the schema is empty.
  ///
  /// Throws errno, after a warning, when the data's directory cannot be walked at all (ENOMEM).
  explicit vrel_icu(const std::string& path = {});

  /// Returns whether `other` is ICU data of the same schema, an empty one included. Warns when it is no ICU data.
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
