// The device that the daemon lives on, and what it comes to look like.
#pragma once

#include <map>
#include <string>
#include <vector>

namespace corvexd::faults {

constexpr char kProgram[] = "/build/tools/faults/corvexd_gated";
constexpr char kTraces[] = "/trace";

// Makes the device in the calling process's root one on which everything that the daemon does is
// due.
void make_device();

// Whether of the reserved partition no more than its log has become zeros.
bool partition_is_sound();

// Each path with all there is to it; directories end in "/".
using Files = std::map<std::string, std::string>;

// Notes `path`, with what lies below it; without `all` not the places that the daemon writes to.
void look_at(const std::string& path, Files& files, bool all = false);

// Adds what differs to `problems`, and removes what was made.
void compare(const Files& before, const Files& after, std::vector<std::string>& problems);

// What stands in the log roots. The mark, which passes on, is left out of the names.
Files read_logs();
std::vector<std::string> marked_directories();

// How often something was achieved, by a name that is the same in every run.
using Achievements = std::map<std::string, int>;

// Adds each of the logs, with numbers and times left out of its path, and how much of it there is.
void count_logs(const Files& logs, Achievements& achieved);

// What artefacts consist of: longer than what the daemon copies at once, and its end shows.
extern const std::string kArtefactStart, kArtefactEnd;

}  // namespace corvexd::faults
