#include "platform/data_protection.hpp"

#include <fcntl.h>

namespace platform {

#ifdef F_SETPROTECTIONCLASS

void set_protection_class(int descriptor, int protection_class) noexcept {
  ::fcntl(descriptor, F_SETPROTECTIONCLASS, protection_class);
}

int open_protected(const char* path, int flags, int protection_class, mode_t mode) noexcept {
  constexpr int no_dpflags = 0;
  return ::open_dprotected_np(path, flags, protection_class, no_dpflags, mode);
}

#else

void set_protection_class(int /*descriptor*/, int /*protection_class*/) noexcept {}

int open_protected(const char* path, int flags, int /*protection_class*/, mode_t mode) noexcept {
  return ::open(path, flags, mode);
}

#endif

}  // namespace platform
