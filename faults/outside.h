// A watch over what stands outside the places that the daemon writes to.
#pragma once

#include <map>
#include <string>
#include <vector>

namespace corvexd::faults {

// Each path with all there is to it.
using Outside = std::map<std::string, std::string>;

// Notes `path`, with what lies below it.
void look_at(const std::string& path, Outside& outside);

// Adds what differs to `problems`, and removes what was made.
void compare(const Outside& before, const Outside& after, std::vector<std::string>& problems);

}  // namespace corvexd::faults
