#include "service/control_socket.h"

#include <cutils/sockets.h>
#include <errno.h>
#include <fcntl.h>
#include <stdint.h>
#include <string.h>
#include <sys/socket.h>
#include <unistd.h>

#include "core/exit.h"
#include "core/log.h"
#include "service/commands.h"

namespace corvexd {
namespace {

constexpr char kSocketName[] = "corvexd";
constexpr int kBacklog = 5;
constexpr int kMaxCommand = 1023;

// Reads one message and runs it; false when the connection has ended or cannot be used any more.
bool serve_message(int connection) {
  uint16_t length;
  if (readx(connection, &length, sizeof length) != 0) {
    log_error("failed to read size\n");
    return false;
  }
  if (length == 0 || length > kMaxCommand) {
    log_error("invalid size %d\n", length);
    return false;
  }
  char command[kMaxCommand + 1];
  if (readx(connection, command, length) != 0) {
    log_error("failed to read command\n");
    return false;
  }
  command[length] = '\0';
  log_info("print buf--%s \n", command);
  run_command(command, connection);
  return true;
}

}  // namespace

int readx(int fd, void* buffer, int count) {
  if (count < 0) return -1;
  char* next = static_cast<char*>(buffer);
  for (int left = count; left > 0;) {
    ssize_t got = TEMP_FAILURE_RETRY(read(fd, next, left));
    if (got < 0) {
      log_error("corvexd: read error: %s\n", strerror(errno));
      return -1;
    }
    if (got == 0) {
      log_error("corvexd: eof\n");
      return -1;
    }
    next += got;
    left -= static_cast<int>(got);
  }
  return 0;
}

void set_control_socket_cloexec() {
  int fd = android_get_control_socket(kSocketName);
  if (fd >= 0) fcntl(fd, F_SETFD, FD_CLOEXEC);
}

void listen_on_control_socket() {
  int fd = android_get_control_socket(kSocketName);
  if (fd < 0) {
    log_error("Failed to get socket from environment: %s\n", strerror(errno));
    exit_daemon();
  }
  if (listen(fd, kBacklog) != 0) {
    log_error("Listen on socket failed: %s\n", strerror(errno));
    exit_daemon();
  }
  fcntl(fd, F_SETFD, FD_CLOEXEC);
  listening_socket = fd;
}

void serve_connection(int connection) {
  while (serve_message(connection)) {
  }
}

void serve_clients() {
  for (;;) {
    int connection = accept4(listening_socket, nullptr, nullptr, SOCK_CLOEXEC);
    if (connection < 0) {
      log_error("Accept failed: %s\n", strerror(errno));
      continue;
    }
    client_connection = connection;
    log_info("new connection\n");
    serve_connection(connection);
    log_info("closing connection\n");
    // Readers that were forked meanwhile hold a copy of the descriptor. The client must see the end
    // now.
    shutdown(connection, SHUT_RDWR);
    client_connection = -1;
    close(connection);
  }
}

}  // namespace corvexd
