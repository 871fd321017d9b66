// A running daemon and its client.
#pragma once

#include <sys/types.h>

#include <string>
#include <vector>

#include "tests/device_root.h"

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

// Makes /nodes, each file in it holding its own name, and a program that is the given daemon with
// those for the kernel's and the firmware's: its /proc is theirs, in which only `self` is real. It
// runs in a session of its own.
extern const char* const kDaemonWithNodes;
void make_nodes(const std::string& daemon = "/build/tests/corvexd_fast");

// How often a pause of that many seconds has begun.
size_t pauses(int seconds);

// One message as it goes over the wire.
std::string message(const std::string& command);

// A new connection to the control socket, or -1 when nobody listens.
int try_to_connect();

// The same, waited for.
int connect_to_daemon();

// Sends all of it over a connection.
void send_all(int connection, const std::string& bytes);

// Sends them over a connection of their own, closes its sending end, and returns what came until
// the daemon ended the connection.
std::string send_commands(const Texts& commands);

// What a recorder found at its start.
struct ProbeReport {
  pid_t pid;
  Texts arguments;
  Texts rest;  // its signals and descriptors, and last "started" and when
};

// Puts the probe at the recorders' paths, in the given mode: "live", "die" at once, "brief" (end
// after some milliseconds) or "stubborn" (end at the second SIGTERM).
void install_probes(const std::string& mode);

// Forgets every report so far.
void clear_probe_reports();

// Every report so far, in the order of the process numbers, after waiting for `count` of them. When
// fewer come, the test fails, and reports of none are added.
std::vector<ProbeReport> probe_reports(size_t count);

// What each was started with, as one would type it.
Texts command_lines(const std::vector<ProbeReport>& reports);

// The full path of the one directory marked "_current" under a log root; empty for none.
std::string current_directory(const std::string& root = "/data/corvex");

}  // namespace corvexd::test
