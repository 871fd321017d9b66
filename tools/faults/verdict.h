// What the daemon may do when its calls are disturbed, and must.
#pragma once

#include <string>

#include "tools/faults/life.h"

namespace corvexd::faults {

// What every life without faults achieves at least; and, as nothing more than known, each line
// that one of them logs.
using Normal = Achievements;

// Takes a life without faults into account; `first` for the first one.
void add_to_normal(const Life& life, bool first, Normal& normal);

// As a text, for other processes.
std::string write_normal(const Normal& normal);
Normal read_normal(const std::string& text);

// Adds to the life's problems what went otherwise than it must.
void judge(const Fault* fault, const Normal& normal, Life& life);

}  // namespace corvexd::faults
