#include "tests/property_service.h"

#include <sys/socket.h>
#include <unistd.h>

#include "tests/device_root.h"

namespace corvexd::test {
namespace {

std::string receive_text(int client) {
  uint32_t length = 0;
  recv(client, &length, sizeof length, MSG_WAITALL);
  std::string text(length, '\0');
  if (length > 0) recv(client, text.data(), length, MSG_WAITALL);
  return text;
}

}  // namespace

PropertyService::PropertyService()
    : socket_(bound_socket(SOCK_STREAM, "/dev/socket/property_service")) {
  listen(socket_, 8);
  server_ = std::thread([this] { serve(); });
}

PropertyService::~PropertyService() {
  shutdown(socket_, SHUT_RDWR);
  server_.join();
  close(socket_);
}

void PropertyService::serve() {
  for (int client; (client = accept4(socket_, nullptr, nullptr, SOCK_CLOEXEC)) != -1;) {
    // A child that was forked in the middle of a request keeps the connection when it has failed.
    const struct timeval patience = {2, 0};
    setsockopt(client, SOL_SOCKET, SO_RCVTIMEO, &patience, sizeof patience);
    uint32_t command = 0;
    if (recv(client, &command, sizeof command, MSG_WAITALL) != sizeof command) {
      close(client);  // its daemon was ended before it had asked
      continue;
    }
    EXPECT_EQ(0x00020001u, command);
    std::string key = receive_text(client);
    std::string value = receive_text(client);
    const uint32_t result = key.rfind("ro.", 0) == 0 ? 24 : 0;
    if (result == 0 && key.rfind("ctl.", 0) != 0) set_property(key, value);
    {
      std::lock_guard<std::mutex> lock(mutex_);
      requests_.emplace_back(key, value);
    }
    send(client, &result, sizeof result, MSG_NOSIGNAL);
    close(client);
  }
}

std::vector<std::pair<std::string, std::string>> PropertyService::requests() {
  std::lock_guard<std::mutex> lock(mutex_);
  return requests_;
}

std::string property(const std::string& key) { return read_file("/dev/__properties__/" + key); }

}  // namespace corvexd::test
