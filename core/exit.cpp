#include "core/exit.h"

#include <sys/socket.h>
#include <unistd.h>

namespace corvexd {

std::atomic<int> listening_socket{-1};
std::atomic<int> client_connection{-1};

void exit_daemon() {
  shutdown(client_connection, SHUT_RDWR);
  // The shutdown does not reach clients in the backlog. Accepting and closing ends them, too.
  shutdown(listening_socket, SHUT_RDWR);
  int queued;
  while ((queued = accept4(listening_socket, nullptr, nullptr, SOCK_CLOEXEC)) != -1) close(queued);
  _exit(1);
}

}  // namespace corvexd
