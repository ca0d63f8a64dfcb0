#include "boot/state.hpp"

#include <err.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <string_view>

#include "fs/file_system.hpp"
#include "paths.hpp"
#include "platform/data_protection.hpp"

namespace boot {
namespace {

constexpr int protection_class = 4;
constexpr int rejected_link = -1;

/// Creates the file if it does not exist. Returns whether every call succeeded; otherwise errno is that of a failed
/// call.
bool touch(const char* path) noexcept {
  const int descriptor = platform::open_protected(path, O_RDWR | O_CREAT, protection_class, 0666);
  if (descriptor < 0) {
    return false;
  }
  struct stat status;  // Not used. A file that has no status is not there after all.
  const bool is_there = ::fstat(descriptor, &status) == 0;
  const bool closed = ::close(descriptor) == 0;
  return is_there && closed;
}

/// Returns the path of the dataset to which `target`, the target of the zoneinfo link, belongs. For the dataset root, a
/// name, a "/" and anything, this is what is before the last "/". For the system partition's zone files it is empty.
///
/// Throws the `int` -1, after a warning, for every other target.
std::string dataset_path_from_link(const std::string& target) {
  constexpr std::string_view root = paths::dataset_root;
  if (target.starts_with(root)) {
    const auto last_slash = target.rfind('/');
    // At least one byte must be between the root and that slash: the name of the dataset.
    if (last_slash > root.size()) {
      return target.substr(0, last_slash);
    }
  } else if (target == paths::system_zoneinfo) {
    return {};
  }
  ::warn("Bad zoneinfo link %s", target.c_str());
  throw rejected_link;
}

}  // namespace

void prepare_state_directories() noexcept {
  // The class is optional: the data can be used without it.
  platform::set_protection_class(paths::state_directory, protection_class);
  platform::set_protection_class(paths::dataset_root, protection_class);
}

std::string latest_dataset_path() { return fs::read_symlink(paths::latest_link); }

std::string current_dataset_path() { return dataset_path_from_link(fs::read_symlink(paths::zoneinfo_link)); }

void mark_needs_cleanup() noexcept {
  if (!touch(paths::needs_cleanup)) {
    // The live data is right all the same; only the clean-up has to wait.
    ::warn("Cannot touch file %s", paths::needs_cleanup);
  }
}

}  // namespace boot
