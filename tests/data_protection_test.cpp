// The calls that a platform with data-protection classes gets. Here they end in the functions below, which only note
// them down, so that no path is touched.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <cstdarg>
#include <string>
#include <vector>

#include "boot/state.hpp"

namespace {

std::vector<std::string> calls;

int note(const std::string& call, int result) {
  calls.push_back(call);
  return result;
}

}  // namespace

// NOLINTBEGIN(bugprone-reserved-identifier)
extern "C" {
int __wrap_open(const char* path, int flags, ...) {
  return note(std::string("open ") + path + (flags == (O_RDONLY | O_CLOEXEC) ? "" : " with other flags"), 7);
}
int __wrap_fcntl(int descriptor, int command, ...) {
  va_list arguments;
  va_start(arguments, command);
  const int protection_class = va_arg(arguments, int);
  va_end(arguments);
  return note(
      "fcntl " + std::to_string(descriptor) + " " + std::to_string(command) + " " + std::to_string(protection_class),
      -1);
}
int __wrap_close(int descriptor) { return note("close " + std::to_string(descriptor), 0); }
int __wrap_fstat(int descriptor, struct stat* /*status*/) { return note("fstat " + std::to_string(descriptor), 0); }
int open_dprotected_np(const char* path, int flags, int protection_class, int dpflags, ...) {
  va_list arguments;
  va_start(arguments, dpflags);
  const auto mode = va_arg(arguments, mode_t);
  va_end(arguments);
  return note(std::string("open_dprotected_np ") + path + (flags == (O_RDWR | O_CREAT) ? "" : " with other flags") +
                  " class " + std::to_string(protection_class) + " dpflags " + std::to_string(dpflags) + " mode " +
                  std::to_string(mode),
              9);
}
}
// NOLINTEND(bugprone-reserved-identifier)

TEST(DataProtection, DirectoriesAndMarkerGetTheirClass) {
  boot::prepare_state_directories();
  boot::mark_needs_cleanup();
  EXPECT_EQ(calls,
            (std::vector<std::string>{"open /var/db/timezone/", "fcntl 7 64 4", "close 7",     //
                                      "open /var/db/timezone/tz/", "fcntl 7 64 4", "close 7",  //
                                      "open_dprotected_np /var/db/timezone/needs_cleanup class 4 dpflags 0 mode 438",
                                      "fstat 9", "close 9"}));
}
