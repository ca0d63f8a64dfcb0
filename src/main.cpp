#include <csignal>
#include <cstdlib>

#include "boot/reconcile.hpp"

int main() {
  // A log that has gone away must not end the program half-way: a warning may get lost, the links must not.
  std::signal(SIGPIPE, SIG_IGN);
  return boot::reconcile() ? EXIT_SUCCESS : EXIT_FAILURE;
}
