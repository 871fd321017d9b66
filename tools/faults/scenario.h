// One run of the daemon, from its start on an eventful device to its end, with one fault or none.
#pragma once

#include <string>
#include <vector>

#include "tools/faults/device.h"
#include "tools/faults/traced_daemon.h"

namespace corvexd::faults {

struct Run {
  std::vector<Call> calls;
  std::vector<std::string> log;
  Achievements achieved;
  std::vector<std::string> problems;  // what no fault may lead to
  int status = -1;                    // the daemon ended with it
};

// With no fault every call named in `traced` is recorded, else what was disturbed.
Run run_scenario(const Fault* fault, const std::string& traced);

}  // namespace corvexd::faults
