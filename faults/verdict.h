// What the daemon may do when a call of its has failed, and must.
#pragma once

#include <string>

#include "faults/life.h"

namespace corvexd::faults {

// Adds to the life's problems what went otherwise than it must.
void judge(Life& life);

// The daemon's functions in which the call was made, outermost first.
std::string callers(const Call& call);

}  // namespace corvexd::faults
