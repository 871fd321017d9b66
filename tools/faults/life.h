// One life of the daemon, from its start on an eventful device to its end, traced and disturbed.
#pragma once

#include <string>
#include <vector>

#include "tools/faults/device.h"
#include "tools/faults/traced_daemon.h"

namespace corvexd::faults {

struct Life {
  std::vector<Call> calls;
  std::vector<std::string> log;
  Achievements achieved;
  std::vector<std::string> problems;  // what nothing may lead to
  int status = -1;                    // the daemon ended with it
};

// Lives one life. With no fault every call named in `traced` is recorded, else what was disturbed.
Life live(const Fault* fault, const std::string& traced);

}  // namespace corvexd::faults
