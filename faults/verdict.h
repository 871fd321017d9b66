// What the daemon may do when its calls are disturbed, and must.
#pragma once

#include <set>
#include <string>

#include "faults/life.h"

namespace corvexd::faults {

// What lives without faults have in common.
struct Normal {
  Achievements achieved;        // at least
  std::set<std::string> lines;  // of the log, without numbers; those of any such life
};

// Takes a life without faults into account; `first` for the first one.
void add_to_normal(const Life& life, bool first, Normal& normal);

// As a text, for other processes.
std::string write_normal(const Normal& normal);
Normal read_normal(const std::string& text);

// Adds to the life's problems what went otherwise than it must.
void judge(const Fault* fault, const Normal& normal, Life& life);

}  // namespace corvexd::faults
