// One life of the daemon, from its start on an eventful device to its end, traced and disturbed.
#pragma once

#include <string>
#include <vector>

namespace corvexd::faults {

constexpr char kShieldVariable[] = "CORVEX_SHIELD_CALL";
constexpr int kShieldCalls = 1000;

// The `when`th call of the main thread, or of every other thread and child, does not take place.
struct Fault {
  std::string call;
  long number;          // of the call, as the kernel knows it
  std::string outcome;  // as the tracer takes it: "error=EIO", "retval=1"
  bool lasting;         // and none after it
  bool in_main;
  int when;
};

// A call that was traced.
struct Call {
  bool in_main = false;
  bool injected = false;
  int when = 0;  // the how manyth of its name on its thread
  std::string name;
  std::string path;                    // of its argument; of its descriptor when it takes no path
  std::string error;                   // the system's text; empty when it succeeded
  std::string site;                    // the chain of return addresses inside the daemon
  std::vector<std::string> functions;  // the daemon's, innermost first
};

struct Life {
  std::vector<Call> calls;
  std::vector<std::string> log;
  std::vector<std::string> problems;  // what no fault may lead to
  int status = -1;                    // the daemon ended by itself with it
};

// Makes the calling process's device root ready for lives.
void prepare_root();

// Lives one life. With no fault every call named in `traced` is recorded, else what was injected.
Life live(const Fault* fault, const std::string& traced);

std::string describe(const Fault& fault);

}  // namespace corvexd::faults
