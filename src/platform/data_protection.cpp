#include "platform/data_protection.hpp"

#include <fcntl.h>
#include <unistd.h>

namespace platform {

#ifdef F_SETPROTECTIONCLASS

void set_protection_class(const char* path, int protection_class) noexcept {
  const int descriptor = ::open(path, O_RDONLY | O_CLOEXEC);
  if (descriptor < 0) {
    return;
  }
  ::fcntl(descriptor, F_SETPROTECTIONCLASS, protection_class);
  ::close(descriptor);
}

int open_protected(const char* path, int flags, int protection_class, mode_t mode) noexcept {
  constexpr int no_dpflags = 0;
  return ::open_dprotected_np(path, flags, protection_class, no_dpflags, mode);
}

#else

void set_protection_class(const char* /*path*/, int /*protection_class*/) noexcept {}

int open_protected(const char* path, int flags, int /*protection_class*/, mode_t mode) noexcept {
  return ::open(path, flags, mode);
}

#endif

}  // namespace platform
