// The record of CPU frequencies and thermal zones.
#pragma once

#include "capture/children.h"

namespace corvexd {

// The latest sampler; it keeps its number when the sampler has ended.
extern ChildSlot cpu_thermal_pid;

// Starts a sampler into the current log directory, which is made when there is none. Main thread.
// Returns at once, with the result of the fork. A sampler that runs already goes on beside it.
int getCpuxThermal();

// The sampler: every three seconds, appends a line to a file of its own in the directory `path`
// (ends in "/"). Runs in the sampler's child until that is ended; `value` governs nothing.
[[noreturn]] void record_cpux_thermal(const char* path, int value);

}  // namespace corvexd
