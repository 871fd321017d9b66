// The device's services: which there are, and their starting, ending and starting again.
#pragma once

#include <stdint.h>
#include <sys/types.h>

#include <string>
#include <vector>

namespace corvexd::sim {

struct ServiceDefinition;

class Services {
 public:
  Services();

  // Each answers false when there is no service of that name. A service that runs is not started
  // twice; one that is stopped or restarted is killed with all of its process group at once.
  bool start(const std::string& name);
  bool stop(const std::string& name);
  bool restart(const std::string& name);

  // Starts what runs from boot on.
  void start_at_boot();

  // Takes note of every child that has ended.
  void reap();

  // Starts again what has ended, each not sooner than a second after its last start. Answers the
  // milliseconds until the next is due, -1 when none is.
  int start_due();

 private:
  struct Service {
    const ServiceDefinition* definition;
    pid_t pid = 0;        // 0: not running
    bool wanted = false;  // to be started whenever it does not run
    int64_t last_start = 0;
  };

  Service* find(const std::string& name);
  void launch(Service* service);

  std::vector<Service> services_;
};

}  // namespace corvexd::sim
