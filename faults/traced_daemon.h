// The daemon with a tracer at it that lets its calls fail.
#pragma once

#include <sys/types.h>
#include <time.h>
#include <unistd.h>

#include <string>

namespace corvexd::faults {

constexpr char kShieldVariable[] = "CORVEX_SHIELD_CALL";
constexpr int kShieldCalls = 1000;
constexpr int kPatience = 15;  // seconds, for what takes milliseconds

// The `when`th call of the main thread, or of every other thread and child, does not take place.
struct Fault {
  std::string call;
  long number;          // of the call, as the kernel knows it
  std::string outcome;  // as the tracer takes it: "error=EIO", "retval=1"
  bool lasting;         // and none after it
  bool in_main;
  int when;
};

// Asks until it is so, or patience ends.
template <typename Done>
bool wait_until(const Done& done) {
  const time_t end = time(nullptr) + kPatience;
  while (!done()) {
    if (time(nullptr) > end) return false;
    usleep(1000);
  }
  return true;
}

// A file of /proc, whose process may end at any moment.
std::string read_facts(const std::string& path);

// The daemon at its gate, started as init does it, and in a session by which all its descendants
// are found; with its end they end.
class TracedDaemon {
 public:
  // With no fault every call named in `traced` is written down, else what was injected.
  TracedDaemon(const Fault* fault, const std::string& traced);
  ~TracedDaemon();

  TracedDaemon(const TracedDaemon&) = delete;
  TracedDaemon& operator=(const TracedDaemon&) = delete;

  pid_t pid() const { return pid_; }
  bool has_ended();

  // As a shell shows it.
  int status() const;

  // Takes the tracer away; the daemon goes on.
  void let_go();

 private:
  void attach(const Fault* fault, const std::string& traced);
  bool kill_session() const;

  pid_t pid_ = 0, tracer_ = 0;
  bool ended_ = false;
  int status_ = 0;
};

}  // namespace corvexd::faults
