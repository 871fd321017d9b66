#include "tools/faults/oracle.h"

#include <algorithm>
#include <map>
#include <regex>

namespace corvexd::faults {
namespace {

// What each run without faults achieves, or the daemon itself is broken.
constexpr const char* kRequired[] = {"one mark",
                                     "a name in the new zone",
                                     "deletion answered CLEANSUCCESS",
                                     "what was deleted is gone",
                                     "LOGS/TIME/versionNumber not empty",
                                     "LOGS/TIME/old whole",
                                     "LOGS/TIME/kernel.log not empty",
                                     "LOGS/TIME/anr/TIME/anr_open whole",
                                     "LOGS/TIME/tombstones/TIME/tombstone_last whole",
                                     "LOGS/TIME/tombstones/TIME/tombstone_after whole"};

// Of a call and its callers: where something may be lost without a word.
const std::regex kSilent(
    "property_get|"                   // the default counts
    "local_time|"                     // the zone that was known last counts
    "open_program_output|"            // told on standard error, where a shell would tell it
    "^inotify_add_watch|"             // a directory that is not there is not watched
    "^(read|write) .*copy_file|"      // what can be copied is
    "^(clone|execve) .*start_child|"  // whose child cannot be started is missing
    "^mmap|"                          // and so is who lacks memory
    "^access .*make_log_directory");  // a marker that cannot be read is not there

// Where the daemon is of no use any more when a call fails: no control socket, or a log directory
// that cannot take its first file.
const std::regex kFatal("listen_on_control_socket|begin_log_directory|provide_current_directory");

// Who asks again after a pause, or for something else.
const std::regex kAsksAgain("wait_for_|record_cpux_thermal|property_");

bool is_at(const Call& call, const std::regex& places) {
  return std::regex_search(call.name + " " + call.callers, places);
}

bool is_any_at(const Run& run, const std::regex& places) {
  return std::any_of(run.calls.begin(), run.calls.end(),
                     [&](const Call& call) { return is_at(call, places); });
}

// A line of the log among what was achieved.
std::string said(const std::string& line) {
  static const std::regex number("[0-9]+|\n");
  return "says " + std::regex_replace(line, number, "#");
}

bool says_something_unusual(const Run& run, const Normal& normal) {
  return std::any_of(run.log.begin(), run.log.end(),
                     [&](const std::string& line) { return normal.count(said(line)) == 0; });
}

// One that does not take no for an answer uses up all the refusals there are.
bool is_stubborn(const Run& run) {
  std::map<std::string, int> refusals;
  return std::any_of(run.calls.begin(), run.calls.end(), [&](const Call& call) {
    // Where a library hides the callers, who asks is not known.
    return !call.site.empty() && !is_at(call, kAsksAgain) &&
           ++refusals[call.site] > kReservedCalls / 2;
  });
}

bool is(const Fault* fault, Mode mode) { return fault != nullptr && fault->mode == mode; }

void judge_losses(const Fault* fault, const Normal& normal, Run& run) {
  const bool fails = is(fault, Mode::kFail);
  if (fails && (is_any_at(run, kSilent) || says_something_unusual(run, normal))) return;
  std::string first;
  int count = 0;
  for (const auto& [name, times] : normal) {
    // What a recorder had in hand when the disturbance ended it is gone.
    if (is(fault, Mode::kDelay) && name.rfind("LOGS/", 0) == 0 && !holds(name, " whole")) continue;
    if (run.achieved[name] < times && ++count == 1) first = name;
  }
  if (count == 0) return;
  run.problems.push_back((fails ? "without a word, it lacks " : "lacks ") + first + ", " +
                         std::to_string(count) + " in all");
}

}  // namespace

void add_to_normal(const Run& run, Normal& normal) {
  for (auto& [name, times] : normal) {
    auto found = run.achieved.find(name);
    times = std::min(times, found == run.achieved.end() ? 0 : found->second);
  }
  if (normal.empty()) normal = run.achieved;
  for (const char* name : kRequired) normal[name] = std::max(normal[name], 1);
  for (const std::string& line : run.log) normal[said(line)] = 0;
}

void judge(const Fault* fault, const Normal& normal, Run& run) {
  const bool was_killed = is(fault, Mode::kKill);
  const bool may_end =
      was_killed ? run.status == 128 + kKillingSignal : run.status == 1 && is_any_at(run, kFatal);
  if (run.status != -1 && !may_end)
    run.problems.push_back("ends with status " + std::to_string(run.status));
  if (run.status == -1 && !was_killed) judge_losses(fault, normal, run);
  if (is(fault, Mode::kFail) && is_stubborn(run))
    run.problems.emplace_back("tries again without end");
}

}  // namespace corvexd::faults
