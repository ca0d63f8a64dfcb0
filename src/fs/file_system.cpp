#include "fs/file_system.hpp"

#include <err.h>
#include <unistd.h>

#include <cerrno>
#include <cstdarg>
#include <cstddef>
#include <fstream>

namespace fs {

void warn_and_raise(const char* format, ...) {
  // A closed standard error makes warn itself fail, and that overwrites errno.
  const int error = errno;
  va_list arguments;
  va_start(arguments, format);
  ::vwarn(format, arguments);
  va_end(arguments);
  throw error;
}

void remove(const std::string& path) {
  if (::unlink(path.c_str()) == 0 || errno == ENOENT) {
    return;
  }
  warn_and_raise("remove: could not remove %s", path.c_str());
}

bool path_exists(const std::string& path) noexcept { return ::access(path.c_str(), F_OK) == 0; }

std::string read_symlink(const std::string& path) {
  constexpr std::size_t longest_target = 1024;
  char buffer[longest_target];
  const auto length = ::readlink(path.c_str(), buffer, longest_target);
  if (length < 0) {
    if (errno == ENOENT) {
      return {};
    }
    warn_and_raise("read_symlink: %s", path.c_str());
  }
  return {buffer, static_cast<std::size_t>(length)};
}

void create_symlink(const std::string& target, const std::string& link) {
  if (::symlink(target.c_str(), link.c_str()) != 0) {
    warn_and_raise("create_symlink: from %s to %s", link.c_str(), target.c_str());
  }
}

std::string first_word(const std::string& path) {
  std::string word;
  std::ifstream(path) >> word;
  return word;
}

}  // namespace fs
