#include <csignal>
#include <cstdlib>

#include "boot/reconcile.hpp"

int main() {
  // A log that has gone away or a limit on file sizes must not end the program half-way: a warning or the record may
  // get lost, the links must not.
  std::signal(SIGPIPE, SIG_IGN);
  std::signal(SIGXFSZ, SIG_IGN);
  return boot::reconcile() ? EXIT_SUCCESS : EXIT_FAILURE;
}
