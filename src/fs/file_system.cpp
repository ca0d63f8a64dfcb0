#include "fs/file_system.hpp"

#include <err.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdarg>
#include <cstddef>

namespace fs {
namespace {

/// An open file, closed when it goes out of scope.
class file {
 public:
  /// Opens the file without waiting for the other end of a FIFO or for a device.
  file(const char* path, int flags, mode_t mode = 0) noexcept
      : descriptor_(::open(path, flags | O_CLOEXEC | O_NONBLOCK, mode)) {}
  ~file() {
    if (descriptor_ >= 0) {
      ::close(descriptor_);
    }
  }
  file(const file&) = delete;
  file& operator=(const file&) = delete;

  /// Returns whether the file is open and neither a FIFO, a socket nor a device. A directory passes: reading it fails
  /// with an errno value that says what is wrong.
  bool is_usable() const noexcept {
    struct stat status;
    return descriptor_ >= 0 && ::fstat(descriptor_, &status) == 0 &&
           (S_ISREG(status.st_mode) || S_ISDIR(status.st_mode));
  }
  int descriptor() const noexcept { return descriptor_; }

 private:
  int descriptor_;
};

}  // namespace

void warn_and_raise(const char* format, ...) {
  // A closed standard error makes warn itself fail, and that overwrites errno.
  const int error = errno;
  va_list arguments;
  va_start(arguments, format);
  ::vwarn(format, arguments);
  va_end(arguments);
  throw error;
}

void remove(const char* path) {
  if (::unlink(path) == 0 || errno == ENOENT) {
    return;
  }
  warn_and_raise("remove: could not remove %s", path);
}

bool path_exists(const char* path) noexcept { return ::access(path, F_OK) == 0; }

std::string read_symlink(const char* path) {
  constexpr std::size_t longest_target = 1024;
  char buffer[longest_target];
  const auto length = ::readlink(path, buffer, longest_target);
  if (length < 0) {
    if (errno == ENOENT) {
      return {};
    }
    warn_and_raise("read_symlink: %s", path);
  }
  return {buffer, static_cast<std::size_t>(length)};
}

void create_symlink(const char* target, const char* link) {
  if (::symlink(target, link) != 0) {
    warn_and_raise("create_symlink: from %s to %s", link, target);
  }
}

std::string first_word(const char* path) {
  constexpr std::string_view white_space = " \t\n\v\f\r";
  constexpr std::size_t most_bytes = 16U << 20U;
  std::string word;
  const file source(path, O_RDONLY);
  if (!source.is_usable()) {
    return word;
  }
  char buffer[4096];
  ssize_t length = 0;
  for (std::size_t count = 0; count < most_bytes && (length = ::read(source.descriptor(), buffer, sizeof buffer)) > 0;
       count += static_cast<std::size_t>(length)) {
    std::string_view rest(buffer, static_cast<std::size_t>(length));
    if (word.empty()) {
      rest.remove_prefix(std::min(rest.find_first_not_of(white_space), rest.size()));
    }
    const auto end = rest.find_first_of(white_space);
    word += rest.substr(0, end);
    if (end != std::string_view::npos) {
      break;
    }
  }
  return word;
}

void write_file(const char* path, std::string_view text) noexcept {
  const file destination(path, O_WRONLY | O_CREAT | O_TRUNC, 0666);
  if (destination.is_usable()) {
    [[maybe_unused]] const auto written = ::write(destination.descriptor(), text.data(), text.size());
  }
}

}  // namespace fs
