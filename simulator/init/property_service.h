// The socket through which programs set properties.
#pragma once

#include <android-base/unique_fd.h>
#include <poll.h>

#include <string>
#include <vector>

#include "simulator/init/services.h"

namespace corvexd::sim {

class PropertyService {
 public:
  // "ctl." properties are carried out by `services`, which must live as long as this.
  explicit PropertyService(Services* services) : services_(services) {}

  bool open();

  // Adds what is to be waited for: the socket and one entry for each open connection.
  void add_to(std::vector<struct pollfd>* polls) const;

  // Serves the connections from the answers to those entries, which begin at `polls`.
  void serve(const struct pollfd* polls);

 private:
  struct Client {
    android::base::unique_fd fd;
    std::string request;  // as much as has come
  };

  bool serve_client(Client* client) const;
  bool set(const std::string& key, const std::string& value) const;

  Services* services_;
  android::base::unique_fd listener_;
  std::vector<Client> clients_;
};

}  // namespace corvexd::sim
