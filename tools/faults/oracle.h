// What the daemon may do when its calls are disturbed, and must.
#pragma once

#include <string>

#include "tools/faults/scenario.h"

namespace corvexd::faults {

// What every run without faults achieves at least; and, at 0, each line that one of them logs.
using Normal = Achievements;

// Takes a run without faults into account.
void add_to_normal(const Run& run, Normal& normal);

// Adds to the run's problems what went otherwise than it must.
void judge(const Fault* fault, const Normal& normal, Run& run);

}  // namespace corvexd::faults
