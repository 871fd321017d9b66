// What the tracer has written down.
#pragma once

#include <string>
#include <vector>

namespace corvexd::faults {

// A call that was traced.
struct Call {
  bool in_main = false;
  bool injected = false;
  int when = 0;  // the how manyth of its name on its thread
  std::string name;
  std::string path;                    // of its argument; of its descriptor when it takes no path
  std::string error;                   // the system's text; empty when it succeeded
  std::string site;                    // the chain of return addresses inside the daemon
  std::vector<std::string> functions;  // the daemon's, innermost first
};

// Adds the calls of one thread or process, or those of them that were injected, to `calls`.
void read_trace(const std::string& file, bool in_main, bool injected_only,
                std::vector<Call>& calls);

}  // namespace corvexd::faults
