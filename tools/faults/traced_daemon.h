// The daemon with a tracer at it that disturbs its calls.
#pragma once

#include <signal.h>
#include <sys/types.h>
#include <time.h>
#include <unistd.h>

#include <map>
#include <mutex>
#include <string>
#include <vector>

namespace corvexd::faults {

constexpr char kReservedVariable[] = "CORVEX_RESERVED_CALL";
constexpr int kReservedCalls = 1000;  // the gate makes as many, see there
constexpr int kPatience = 60;         // seconds, for what takes milliseconds unless all are busy

// Ends who gets it like SIGKILL does, as the daemon leaves it alone; but it can be ignored.
constexpr int kKillingSignal = SIGUSR2;

enum class Mode { kFail, kKill, kDelay };

// What becomes of the `when`th call of the main thread, or of that of every other thread and child.
struct Fault {
  Mode mode;
  const char* call;
  long number;          // of the call, as the kernel knows it
  const char* outcome;  // as the tracer takes it: "error=EIO", "retval=1", "delay_enter=1000"
  bool lasting;         // and of every call after it
  bool in_main;
  int when;
};

// A call that was traced.
struct Call {
  bool in_main;
  int when;  // the how manyth of its name on its thread
  std::string name;
  std::string site;     // the chain of return addresses inside the daemon
  std::string callers;  // the daemon's functions, outermost first
};

// Asks until it is so, or patience ends.
template <typename Done>
bool wait_until(const Done& done, int patience = kPatience) {
  const time_t end = time(nullptr) + patience;
  while (!done()) {
    if (time(nullptr) > end) return false;
    usleep(1000);
  }
  return true;
}

// The daemon at its gate, started as init does it, and in a session by which all its descendants
// are found. When it has ended they are ended, as init does that, too.
class TracedDaemon {
 public:
  // With a fault it is disturbed, and what failed is written down; else every call named in
  // `traced` is. With neither it lives alone.
  TracedDaemon(const Fault* fault, const std::string& traced);
  ~TracedDaemon() { end(); }

  TracedDaemon(const TracedDaemon&) = delete;
  TracedDaemon& operator=(const TracedDaemon&) = delete;

  pid_t pid() const { return pid_; }
  bool has_ended();    // and its descendants with it
  int status() const;  // as a shell shows it

  // Whether the tracer holds up one of its threads or children for longer than each stop takes.
  bool is_held_up() const;

  // Its threads and those of its descendants, and whether each waits: for its time, for another, or
  // for nothing any more.
  std::map<std::string, bool> tasks() const;

  // Takes the tracer away; the daemon goes on. Returns the calls that it wrote down.
  std::vector<Call> let_go();

  // Kills it and all its descendants.
  void end();

 private:
  void kill_all() const;
  void attach(const std::string& tracer);
  std::vector<pid_t> processes() const;
  std::map<std::string, char> task_states() const;

  const bool only_disturbed_;
  pid_t pid_ = 0, tracer_ = 0;
  std::mutex mutex_;  // over what follows
  bool ended_ = false;
  int status_ = 0;
};

}  // namespace corvexd::faults
