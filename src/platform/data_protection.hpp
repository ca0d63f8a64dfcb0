#pragma once

#include <sys/types.h>

/// Data-protection classes of files: the platform's own calls where it has them, their plain counterparts elsewhere.
namespace platform {

/// Puts a file or directory into a protection class, as far as the platform allows it. A failure gives no warning.
/// Makes no call at all on a platform without protection classes.
void set_protection_class(const char* path, int protection_class) noexcept;

/// Opens `path` as `open` does; a file that this creates belongs to the protection class where the platform has
/// them. Returns the descriptor, or -1 with errno set.
int open_protected(const char* path, int flags, int protection_class, mode_t mode) noexcept;

}  // namespace platform
