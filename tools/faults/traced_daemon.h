// The daemon with a tracer at it that disturbs its calls.
#pragma once

#include <signal.h>
#include <sys/types.h>

#include <map>
#include <string>
#include <vector>

#include "tests/daemon.h"

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
  std::string callers;  // of the call, for the report
};

// A call that was traced.
struct Call {
  bool in_main;
  int when;  // the how manyth of its name on its thread
  std::string name;
  std::string site;     // the chain of return addresses inside the daemon
  std::string callers;  // the daemon's functions, outermost first
};

bool holds(const std::string& text, const char* part);

// The daemon at its gate, in a session by which all its descendants are found. When it has ended
// they are ended, as init does that, too.
class TracedDaemon : public test::BootingDaemon {
 public:
  // With a fault it is disturbed, and what failed is written down; else every call named in
  // `traced` is. With neither it lives alone.
  TracedDaemon(const Fault* fault, const std::string& traced);
  ~TracedDaemon() { end(); }

  // The status with which it ended, as a shell shows it; -1 while it lives. Any thread.
  int status() const;
  bool has_ended() const { return status() != -1; }

  // Whether the tracer holds up one of its threads or children for longer than each stop takes.
  bool is_held_up() const;

  // Its threads and those of its descendants, each with its state as /proc shows it.
  std::map<std::string, char> tasks() const;

  // Takes the tracer away; the daemon goes on. Returns the calls that it wrote down.
  std::vector<Call> let_go();

  // Kills it and all its descendants.
  void end();

 private:
  std::vector<pid_t> processes() const;

  const bool only_disturbed_;
  pid_t tracer_ = 0;
};

}  // namespace corvexd::faults
