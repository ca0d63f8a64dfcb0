#include "protected_platform.hpp"

#include <fcntl.h>

#include <cstdarg>

/// Opens the file and passes on what it was given in a call that a trace shows: 1000 and the protection class.
int open_dprotected_np(const char* path, int flags, int protection_class, int dpflags, ...) {
  va_list arguments;
  va_start(arguments, dpflags);
  const int descriptor = ::open(path, flags, va_arg(arguments, mode_t));
  va_end(arguments);
  ::fcntl(descriptor, F_SETPROTECTIONCLASS, 1000 + protection_class + 100 * dpflags);
  return descriptor;
}
