#pragma once

#include <sys/types.h>

/// Data-protection classes of files, on platforms that have them. Elsewhere the first function does nothing, and the
/// second opens without a class.
namespace platform {

/// Gives the file or directory the class. A failure causes no warning.
void set_protection_class(const char* path, int protection_class) noexcept;

/// Opens `path` as `open` does; a file that the call creates has the class. Returns the descriptor, or -1 with errno
/// set.
int open_protected(const char* path, int flags, int protection_class, mode_t mode) noexcept;

}  // namespace platform
