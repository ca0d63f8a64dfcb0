#pragma once

#include <cstdint>
#include <string>

namespace version {

/// A dataset's version, such as 2020a.1.0, parsed. The default value stands for no valid version, and is older than
/// every valid version.
struct data_version {
  data_version() = default;

  /// Throws what `parse_version` throws.
  explicit data_version(const std::string& text);

  std::int32_t year = -1;
  std::string letters;      // "a" to "z", at least one in a valid version
  std::int32_t major = -1;  // -1: not given
  std::int32_t minor = -1;  // -1: not given
};

/// Parses a version string: decimal digits, lower-case letters, then up to two times a dot and decimal digits, with
/// nothing before, between or after. Any other text gives two warnings and resets `version` to its default.
///
/// Throws `std::out_of_range`, without a warning, for a number above 2147483647; the fields before it are set then.
void parse_version(data_version& version, const std::string& text);

/// Returns whether `a` is strictly newer than `b`, by year, letters (as bytes, a longer string after its prefix),
/// major and minor number. A missing number is older than any number.
bool newer_than(const data_version& a, const data_version& b) noexcept;

/// Returns whether all four fields are equal.
bool same_version(const data_version& a, const data_version& b) noexcept;

}  // namespace version
