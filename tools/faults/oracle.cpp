#include "tools/faults/oracle.h"

#include <algorithm>
#include <map>
#include <regex>

namespace corvexd::faults {
namespace {

bool holds(const std::string& text, const char* part) {
  return text.find(part) != std::string::npos;
}

constexpr size_t kNamed = 3;  // of what is lost

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

// What may be lost without a word.
constexpr struct {
  const char* call;
  const char* caller;
} kSilent[] = {
    {"", "property_get"},       // the default counts
    {"", "local_time"},         // the zone that was known last counts
    {"inotify_add_watch", ""},  // a directory that is not there is not watched
    {"read", "copy_file"},      // what can be copied is
    {"write", "copy_file"},
    {"clone", "start_child"},          // whose child cannot be started is missing
    {"execve", "start_child"},         // and so is one that becomes no program
    {"mmap", ""},                      // or that lacks memory
    {"access", "make_log_directory"},  // a marker that cannot be read is not there
    {"", "open_program_output"},       // told on standard error, where a shell would tell it
};

bool is_silent(const Call& call) {
  return std::any_of(std::begin(kSilent), std::end(kSilent), [&](const auto& row) {
    return holds(call.name, row.call) && holds(call.callers, row.caller);
  });
}

// Where the daemon is of no use any more when a call fails: no control socket, or a log directory
// that cannot take its first file.
bool may_end_at(const Call& call) {
  for (const char* caller :
       {"listen_on_control_socket", "begin_log_directory", "provide_current_directory"}) {
    if (holds(call.callers, caller)) return true;
  }
  return false;
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

// Who asks again after a pause, or for something else.
constexpr const char* kAsksAgain[] = {"wait_for_", "record_cpux_thermal", "property_"};

// One that does not take no for an answer uses up all the refusals there are.
bool is_stubborn(const Run& run) {
  std::map<std::string, int> refusals;
  return std::any_of(run.calls.begin(), run.calls.end(), [&](const Call& call) {
    bool may_ask = std::any_of(std::begin(kAsksAgain), std::end(kAsksAgain),
                               [&](const char* caller) { return holds(call.callers, caller); });
    // Where a library hides the callers, who asks is not known.
    return !may_ask && !call.site.empty() && ++refusals[call.site] > kReservedCalls / 2;
  });
}

void judge_losses(const Fault* fault, const Normal& normal, Run& run) {
  bool fails = fault != nullptr && fault->mode == Mode::kFail;
  bool is_delayed = fault != nullptr && fault->mode == Mode::kDelay;
  bool may_be_silent = std::any_of(run.calls.begin(), run.calls.end(), is_silent);
  if (fails && (may_be_silent || says_something_unusual(run, normal))) return;
  std::string lost;
  size_t count = 0;
  for (const auto& [name, times] : normal) {
    // What a recorder had in hand when the disturbance ended it is gone.
    if (is_delayed && name.rfind("LOGS/", 0) == 0 && !holds(name, " whole")) continue;
    if (run.achieved[name] < times && ++count <= kNamed) lost += (count == 1 ? "" : ", ") + name;
  }
  if (count == 0) return;
  run.problems.push_back((fails ? "without a word, it lacks " : "lacks ") + lost + " (" +
                         std::to_string(count) + " in all)");
}

}  // namespace

void add_to_normal(const Run& run, bool first, Normal& normal) {
  for (auto& [name, times] : normal) {
    auto found = run.achieved.find(name);
    times = std::min(times, found == run.achieved.end() ? 0 : found->second);
  }
  if (first) normal = run.achieved;
  for (const char* name : kRequired) normal[name] = std::max(normal[name], 1);
  for (const std::string& line : run.log) normal[said(line)] = 0;
}

void judge(const Fault* fault, const Normal& normal, Run& run) {
  bool was_killed = fault != nullptr && fault->mode == Mode::kKill;
  int killed_status = 128 + kKillingSignal;
  bool fails = fault != nullptr && fault->mode == Mode::kFail;
  if (fails && is_stubborn(run)) run.problems.emplace_back("tries again without end");
  bool may_end =
      was_killed ? run.status == killed_status
                 : run.status == 1 && std::any_of(run.calls.begin(), run.calls.end(), may_end_at);
  if (run.status == -1 && !was_killed) judge_losses(fault, normal, run);
  if (run.status != -1 && !may_end) {
    run.problems.push_back("ends with status " + std::to_string(run.status));
  }
}

}  // namespace corvexd::faults
