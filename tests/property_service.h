// Plays init's property service.
#pragma once

#include <mutex>
#include <string>
#include <thread>
#include <utility>
#include <vector>

namespace corvexd::test {

// Stores what is set, and keeps the list; "ctl." requests are only listed, "ro." refused.
class PropertyService {
 public:
  PropertyService();
  ~PropertyService();

  std::vector<std::pair<std::string, std::string>> requests();

 private:
  void serve();
  void serve_request(int client);

  int socket_;
  std::mutex mutex_;
  std::vector<std::pair<std::string, std::string>> requests_;
  std::vector<std::thread> handlers_;  // one for each request
  std::thread server_;
};

std::string property(const std::string& key);

}  // namespace corvexd::test
