#include "simulator/common/protocol.h"

#include <stdio.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

using android::base::unique_fd;

namespace corvexd::sim {
namespace {

unique_fd make_socket(const char* path, int type, decltype(&connect) attach) {
  unique_fd fd(socket(AF_UNIX, type | SOCK_CLOEXEC, 0));
  struct sockaddr_un address = {};
  address.sun_family = AF_UNIX;
  snprintf(address.sun_path, sizeof address.sun_path, "%s", path);
  if (fd != -1 && attach(fd, reinterpret_cast<struct sockaddr*>(&address), sizeof address) != 0) {
    fd.reset();
  }
  return fd;
}

}  // namespace

unique_fd connect_to(const char* path, int type) { return make_socket(path, type, connect); }

unique_fd bind_at(const char* path, int type) {
  unlink(path);
  return make_socket(path, type, bind);
}

}  // namespace corvexd::sim
