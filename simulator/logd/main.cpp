// The device's log daemon: takes the lines that programs write and serves those who read them.
#include <log/log_read.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/socket.h>

#include "simulator/common/protocol.h"
#include "simulator/logd/log_store.h"
#include "simulator/logd/readers.h"

namespace corvexd::sim {
namespace {

constexpr int kDatagramsAtOnce = 256;  // then the readers get their turn

// Takes one line from the socket into the store; false when none waits.
bool receive_line(int fd, LogStore* store) {
  char datagram[sizeof(LogHeader) + LOGGER_ENTRY_MAX_PAYLOAD];
  alignas(struct cmsghdr) char control[CMSG_SPACE(sizeof(struct ucred))];
  struct iovec part = {datagram, sizeof datagram};
  struct msghdr message = {};
  message.msg_iov = &part;
  message.msg_iovlen = 1;
  message.msg_control = control;
  message.msg_controllen = sizeof control;
  ssize_t count = recvmsg(fd, &message, MSG_DONTWAIT);
  if (count < 0) return false;
  struct ucred writer = {};
  struct cmsghdr* header = CMSG_FIRSTHDR(&message);
  if (header != nullptr && header->cmsg_type == SCM_CREDENTIALS) {
    memcpy(&writer, CMSG_DATA(header), sizeof writer);
  }
  store->add(datagram, count, writer);
  return true;
}

// The descriptor of a socket that init made for this service; -1 when there is none.
int socket_from_init(const char* variable) {
  const char* number = getenv(variable);
  return number != nullptr ? atoi(number) : -1;
}

int serve() {
  int writers = socket_from_init("ANDROID_SOCKET_logdw");
  int listener = socket_from_init("ANDROID_SOCKET_logdr");
  if (writers < 0 || listener < 0 || listen(listener, SOMAXCONN) != 0) {
    fprintf(stderr, "logd: needs its sockets from init\n");
    return 1;
  }
  LogStore store;
  Readers readers(listener, &store);
  std::vector<struct pollfd> polls;
  for (;;) {
    polls.assign(1, {writers, POLLIN, 0});
    readers.add_to(&polls);
    if (poll(polls.data(), polls.size(), -1) < 0) continue;
    for (int i = 0; i < kDatagramsAtOnce && receive_line(writers, &store); ++i) {
    }
    readers.serve(&polls[1]);
  }
}

}  // namespace
}  // namespace corvexd::sim

int main() { return corvexd::sim::serve(); }
