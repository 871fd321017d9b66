// Any bytes from a client.
#include <signal.h>
#include <stdint.h>
#include <sys/socket.h>
#include <sys/wait.h>
#include <unistd.h>

#include "core/state.h"
#include "service/control_socket.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  corvexd::checkLogPath();
  int ends[2];
  if (socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends) != 0) __builtin_trap();
  if (write(ends[1], data, size) != static_cast<ssize_t>(size)) __builtin_trap();
  shutdown(ends[1], SHUT_WR);
  corvexd::serve_connection(ends[0]);
  for (int end : ends) close(end);
  kill(-1, SIGKILL);  // every recorder and sampler: there is nobody else in the device
  while (waitpid(-1, nullptr, 0) > 0) {
  }
  return 0;
}
