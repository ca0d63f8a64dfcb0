#include <csignal>
#include <cstdlib>

#include "boot/reconcile.hpp"

int main() {
  // A log that has gone away must not end the program half-way: a warning may get lost, the links must not.
  std::signal(SIGPIPE, SIG_IGN);
  try {
    return boot::reconcile();
  } catch (...) {
    return EXIT_FAILURE;  // Out of memory: nothing else gets here.
  }
}
