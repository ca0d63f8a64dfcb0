// What a platform with data-protection classes declares, to build the program as it is built there. A trace shows the
// class of each file.
#include <fcntl.h>

#define F_SETPROTECTIONCLASS 64

inline int open_dprotected_np(const char* path, int flags, int protection_class, int dpflags, mode_t mode) {
  const int descriptor = ::open(path, flags, mode);
  ::fcntl(descriptor, F_SETPROTECTIONCLASS, protection_class + 100 * dpflags);
  return descriptor;
}
