#include "dataset/icu.hpp"

#include <err.h>
#include <fts.h>
#include <sys/stat.h>

#include <cerrno>
#include <cstring>
#include <memory>
#include <string_view>

#include "fs/file_system.hpp"
#include "paths.hpp"

namespace dataset {
namespace {

struct walk_closer {
  void operator()(FTS* walk) const noexcept { ::fts_close(walk); }
};
using walk_handle = std::unique_ptr<FTS, walk_closer>;

bool is_file_readable_by_others(const FTSENT& entry) {
  return entry.fts_errno == 0 && entry.fts_info == FTS_F && (entry.fts_statp->st_mode & S_IROTH) != 0;
}

/// Returns the schema in the name of an ICU data file: "icutz", the schema, ".dat", where the schema is decimal digits
/// and one of the letters l, b and e. Empty for any other name.
std::string_view schema_in_file_name(std::string_view name) noexcept {
  constexpr std::string_view prefix = "icutz";
  constexpr std::string_view suffix = ".dat";
  if (!name.starts_with(prefix) || !name.ends_with(suffix)) {
    return {};
  }
  name.remove_prefix(prefix.size());
  name.remove_suffix(suffix.size());
  const auto digits = name.find_first_not_of("0123456789");
  const bool digits_and_byte_order = name.size() >= 2 && digits == name.size() - 1 &&
                                     std::string_view("lbe").find(name.back()) != std::string_view::npos;
  return digits_and_byte_order ? name : std::string_view();
}

}  // namespace

vrel_icu::vrel_icu(const std::string& path)
    : vrel_dataset_component(path), data_directory_(path.empty() ? paths::system_icu : path + "/icutz") {
  initialize();
}

void vrel_icu::initialize() {
  if (dataset_path_.empty()) {
    schema_ = fs::first_word((data_directory_ + "/icutzformat.txt").c_str());
    return;
  }
  read_schema_from_file_names();
  if (schema_.empty()) {
    ::warn("No ICU schema found for %s", dataset_path_.c_str());
  }
}

void vrel_icu::read_schema_from_file_names() {
  char* const roots[] = {data_directory_.data(), nullptr};
  const walk_handle walk(::fts_open(roots, FTS_COMFOLLOW | FTS_PHYSICAL | FTS_XDEV, nullptr));
  if (!walk) {
    fs::warn_and_raise("tz_icu::initialize: fts_open of %s failed, %s", data_directory_.c_str(), std::strerror(errno));
  }
  FTSENT* entry = nullptr;
  while (schema_.empty() && (entry = ::fts_read(walk.get())) != nullptr) {
    if (entry->fts_level == 1 && is_file_readable_by_others(*entry)) {
      schema_ = schema_in_file_name({entry->fts_name, entry->fts_namelen});
    }
  }
}

bool vrel_icu::compatible_schema(const vrel_dataset_component* other) const {
  const auto* const other_icu = dynamic_cast<const vrel_icu*>(other);
  if (other_icu == nullptr) {
    ::warn("vrel_icu::compatible_schema: could not dynamic_cast other component");
    return false;
  }
  return schema_ == other_icu->schema_;
}

void vrel_icu::activate() const {
  try {
    fs::remove(paths::icu_link);
    fs::remove(paths::legacy_icu_link);
  } catch (...) {
    // For installed data, creating the new link fails if the old entry is still there. For the system's data, an old
    // live link may stay, and only the warning tells. No program uses the legacy link.
    ::warn("unlink of ICU softlink failed");
  }
  if (!dataset_path_.empty()) {
    fs::create_symlink(data_directory_.c_str(), paths::icu_link);
  }
}

}  // namespace dataset
