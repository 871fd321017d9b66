// A running daemon and its client.
#pragma once

#include <sys/types.h>

#include <string>
#include <vector>

#include "tests/log_catcher.h"

namespace corvexd::test {

// Starts the daemon as init does, with its control socket; ends it with SIGKILL.
class BootingDaemon {
 public:
  explicit BootingDaemon(const char* program = "/build/tests/corvexd_fast");
  ~BootingDaemon();

  pid_t pid() const { return pid_; }

 private:
  pid_t pid_;
};

// A daemon on a device that is up and past its initial phase: it serves, its boot recorders live on
// unobserved, and what was logged on the way is forgotten.
class Daemon : public BootingDaemon {
 public:
  explicit Daemon(LogCatcher& log, const char* program = "/build/tests/corvexd_fast");
};

// Lets a start go through without waiting.
void make_device_ready();

// One message as it goes over the wire.
std::string message(const std::string& command);

// A new connection to the control socket; waits up to ten seconds for one that listens.
int connect_to_daemon();

// Sends the bytes over a connection of their own, closes its sending end, and returns what came
// until the daemon ended the connection.
std::string send_bytes(const std::string& bytes);
std::string send_commands(const std::vector<std::string>& commands);

// What a recorder found at its start.
struct ProbeReport {
  pid_t pid;
  std::vector<std::string> arguments;
  std::vector<std::string> rest;  // its signals and descriptors, and last "started" and when
};

// Puts the probe at the recorders' paths, in the given mode: "live", "die" at once, "brief" (end
// after some milliseconds) or "stubborn" (ignore SIGTERM).
void install_probes(const std::string& mode);

// Forgets every report so far.
void clear_probe_reports();

// Every report so far, in the order of the process numbers, after waiting for `count` of them.
std::vector<ProbeReport> probe_reports(size_t count);

// The full path of the one directory marked "_current" under a log root; empty for none.
std::string current_directory(const std::string& root = "/data/corvex");

}  // namespace corvexd::test
