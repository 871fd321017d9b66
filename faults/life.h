// One life of the daemon, from its start on an eventful device to its end, traced and disturbed.
#pragma once

#include <string>
#include <vector>

#include "faults/trace.h"
#include "faults/traced_daemon.h"

namespace corvexd::faults {

struct Life {
  std::vector<Call> calls;
  std::vector<std::string> log;
  std::vector<std::string> problems;  // what no fault may lead to
  int status = -1;                    // the daemon ended by itself with it
};

// Makes the calling process's device root ready for lives.
void prepare_root();

// Lives one life. With no fault every call named in `traced` is recorded, else what was injected.
Life live(const Fault* fault, const std::string& traced);

}  // namespace corvexd::faults
