#include "tests/property_service.h"

#include <sys/socket.h>
#include <unistd.h>

#include "tests/device_root.h"

namespace corvexd::test {
namespace {

constexpr uint32_t kMaxText = 1024;

// False when the request breaks off: its daemon was ended, or a child that was forked in the middle
// of a failed request keeps the connection open.
bool receive(int client, void* data, size_t size) {
  return recv(client, data, size, MSG_WAITALL) == static_cast<ssize_t>(size);
}

bool receive_text(int client, std::string* text) {
  uint32_t length;
  if (!receive(client, &length, sizeof length) || length > kMaxText) return false;
  text->resize(length);
  return length == 0 || receive(client, text->data(), length);
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
  for (std::thread& handler : handlers_) handler.join();
  close(socket_);
}

void PropertyService::serve() {
  for (int client; (client = accept4(socket_, nullptr, nullptr, SOCK_CLOEXEC)) != -1;) {
    handlers_.emplace_back([this, client] {
      serve_request(client);
      close(client);
    });
  }
}

void PropertyService::serve_request(int client) {
  const struct timeval patience = {5, 0};
  setsockopt(client, SOL_SOCKET, SO_RCVTIMEO, &patience, sizeof patience);
  uint32_t command;
  std::string key, value;
  if (!receive(client, &command, sizeof command)) return;
  EXPECT_EQ(0x00020001u, command);
  if (!receive_text(client, &key) || !receive_text(client, &value)) return;
  const uint32_t result = key.rfind("ro.", 0) == 0 ? 24 : 0;
  if (result == 0 && key.rfind("ctl.", 0) != 0) set_property(key, value);
  {
    std::lock_guard<std::mutex> lock(mutex_);
    requests_.emplace_back(key, value);
  }
  send(client, &result, sizeof result, MSG_NOSIGNAL);
}

std::vector<std::pair<std::string, std::string>> PropertyService::requests() {
  std::lock_guard<std::mutex> lock(mutex_);
  return requests_;
}

std::string property(const std::string& key) { return read_file("/dev/__properties__/" + key); }

}  // namespace corvexd::test
