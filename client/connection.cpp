#include "client/connection.h"

#include <errno.h>
#include <poll.h>
#include <stdint.h>
#include <string.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

namespace corvexd {
namespace {

enum class Progress { kGoesOn, kDone, kBroken };  // kBroken: errno says how

Progress after_failure() {
  return errno == EAGAIN || errno == EINTR ? Progress::kGoesOn : Progress::kBroken;
}

Progress send_some(int connection, const std::string& messages, size_t* sent) {
  const ssize_t n =
      send(connection, messages.data() + *sent, messages.size() - *sent, MSG_NOSIGNAL);
  if (n < 0) return after_failure();
  *sent += static_cast<size_t>(n);
  if (*sent < messages.size()) return Progress::kGoesOn;
  // The daemon ends the connection when it has run everything before this end.
  shutdown(connection, SHUT_WR);
  return Progress::kDone;
}

Progress receive_some(int connection, ElapsedClock* clock, Replies* replies) {
  char buffer[512];
  const ssize_t n = recv(connection, buffer, sizeof(buffer), 0);
  if (n < 0) return after_failure();
  if (n == 0) return Progress::kDone;
  clock->hide();
  if (replies->receive(buffer, static_cast<size_t>(n))) return Progress::kGoesOn;
  errno = EBADMSG;
  return Progress::kBroken;
}

}  // namespace

std::string frame(const std::vector<const CommandWord*>& words) {
  std::string messages;
  for (const CommandWord* word : words) {
    const uint16_t length = static_cast<uint16_t>(strlen(word->word));
    messages.append(reinterpret_cast<const char*>(&length), sizeof(length)).append(word->word);
  }
  return messages;
}

int connect_to_daemon(const std::string& path, ElapsedClock* clock) {
  sockaddr_un address{};
  address.sun_family = AF_UNIX;
  if (path.size() >= sizeof(address.sun_path)) {
    errno = ENAMETOOLONG;
    return -1;
  }
  memcpy(address.sun_path, path.data(), path.size());
  const int connection = socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0);
  if (connection < 0) return -1;
  // A full queue cannot be polled for; it is asked again ten times a second.
  while (connect(connection, reinterpret_cast<sockaddr*>(&address), sizeof(address)) != 0) {
    if (errno != EAGAIN) {
      const int error = errno;
      close(connection);
      errno = error;
      return -1;
    }
    clock->draw();
    poll(nullptr, 0, 100);
  }
  return connection;
}

int converse(int connection, const std::string& messages, ElapsedClock* clock, Replies* replies) {
  size_t sent = 0;
  Progress sending = Progress::kGoesOn;
  int send_error = 0;
  while (true) {
    const short wanted = sending == Progress::kGoesOn ? POLLIN | POLLOUT : POLLIN;
    pollfd waiting{connection, wanted, 0};
    if (poll(&waiting, 1, clock->until_next()) < 0 && errno != EINTR) return errno;
    clock->draw();
    if (sending == Progress::kGoesOn) {
      sending = send_some(connection, messages, &sent);
      // What the daemon answered before it stopped reading can still be read.
      if (sending == Progress::kBroken) send_error = errno;
    }
    const Progress receiving = receive_some(connection, clock, replies);
    if (receiving == Progress::kBroken) return errno;
    if (receiving == Progress::kDone) return sending == Progress::kGoesOn ? EPIPE : send_error;
  }
}

}  // namespace corvexd
