#include "simulator/init/property_service.h"

#include <errno.h>
#include <string.h>
#include <sys/socket.h>
#include <sys/stat.h>

#include "simulator/common/protocol.h"
#include "simulator/init/property_store.h"

using android::base::unique_fd;

namespace corvexd::sim {
namespace {

constexpr size_t kMaxClients = 64;
constexpr size_t kMaxText = 1024;  // longer than any name or value that could be right

enum class Parsed { kNeedsMore, kBroken, kDone };

// Takes a length and as many bytes from the request, beginning at `*offset`.
Parsed parse_text(const std::string& request, size_t* offset, std::string* text) {
  uint32_t length;
  if (request.size() < *offset + sizeof length) return Parsed::kNeedsMore;
  memcpy(&length, &request[*offset], sizeof length);
  *offset += sizeof length;
  if (length > kMaxText) return Parsed::kBroken;
  if (request.size() < *offset + length) return Parsed::kNeedsMore;
  *text = request.substr(*offset, length);
  *offset += length;
  return Parsed::kDone;
}

Parsed parse(const std::string& request, std::string* key, std::string* value) {
  uint32_t operation;
  if (request.size() < sizeof operation) return Parsed::kNeedsMore;
  memcpy(&operation, request.data(), sizeof operation);
  if (operation != kPropertySetRequest) return Parsed::kBroken;
  size_t offset = sizeof operation;
  Parsed parsed = parse_text(request, &offset, key);
  return parsed == Parsed::kDone ? parse_text(request, &offset, value) : parsed;
}

}  // namespace

bool PropertyService::open() {
  listener_ = bind_at(kPropertySocket, SOCK_STREAM | SOCK_NONBLOCK);
  return listener_ != -1 && chmod(kPropertySocket, 0666) == 0 && listen(listener_, SOMAXCONN) == 0;
}

void PropertyService::add_to(std::vector<struct pollfd>* polls) const {
  polls->push_back({listener_, POLLIN, 0});
  for (const Client& client : clients_) polls->push_back({client.fd, POLLIN, 0});
}

void PropertyService::serve(const struct pollfd* polls) {
  std::vector<Client> kept;
  for (size_t i = 0; i < clients_.size(); ++i) {
    bool ended = polls[i + 1].revents != 0 && !serve_client(&clients_[i]);
    if (!ended) kept.push_back(std::move(clients_[i]));
  }
  clients_ = std::move(kept);
  if (!(polls[0].revents & POLLIN)) return;
  Client client;
  client.fd = unique_fd(accept4(listener_, nullptr, nullptr, SOCK_CLOEXEC | SOCK_NONBLOCK));
  if (client.fd == -1) return;
  // One that connects and says nothing must not keep the others out.
  if (clients_.size() == kMaxClients) clients_.erase(clients_.begin());
  clients_.push_back(std::move(client));
}

// Answers whether the rest of the request is still to come.
bool PropertyService::serve_client(Client* client) const {
  char bytes[256];
  ssize_t count = recv(client->fd, bytes, sizeof bytes, 0);
  if (count <= 0) return count < 0 && errno == EAGAIN;
  client->request.append(bytes, count);
  std::string key, value;
  Parsed parsed = parse(client->request, &key, &value);
  if (parsed == Parsed::kNeedsMore) return true;
  uint32_t result = parsed == Parsed::kDone && set(key, value) ? 0 : 1;
  // A client that has gone away does not learn the result, and the property is set all the same.
  send(client->fd, &result, sizeof result, MSG_NOSIGNAL);
  return false;
}

bool PropertyService::set(const std::string& key, const std::string& value) const {
  if (key == "ctl.start") return services_->start(value);
  if (key == "ctl.stop") return services_->stop(value);
  if (key == "ctl.restart") return services_->restart(value);
  return store_property(key, value);
}

}  // namespace corvexd::sim
