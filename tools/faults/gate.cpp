// Runs before the daemon's main: stops until somebody traces the process and lets it go on.
//
// The tracer counts calls of each thread and child apart and disturbs the Nth of every one of them.
// To disturb the main thread alone, or all others, the main thread first makes kReservedCalls idle
// calls: its own come after that number, which no other reaches. The killing signal is ignored
// meanwhile.
#include <errno.h>
#include <signal.h>
#include <stdlib.h>
#include <unistd.h>

#include "core/sleep.h"
#include "tools/faults/traced_daemon.h"

namespace {

__attribute__((constructor)) void wait_at_gate() {
  raise(SIGSTOP);
  const char* number = getenv(corvexd::faults::kReservedVariable);
  if (number == nullptr) return;
  signal(corvexd::faults::kKillingSignal, SIG_IGN);
  for (int i = 0; i < corvexd::faults::kReservedCalls; ++i) {
    syscall(strtol(number, nullptr, 10), -1, -1, -1, -1, -1, -1);  // fails whatever it is
  }
  signal(corvexd::faults::kKillingSignal, SIG_DFL);
  unsetenv(corvexd::faults::kReservedVariable);
}

}  // namespace

namespace corvexd {

// A hundredth of every time; a minute is longer than a traced start and shorter than a run.
void sleep_seconds(time_t seconds) {
  long milliseconds = seconds < 60 ? seconds * 10 : seconds * 18;
  struct timespec left = {milliseconds / 1000, milliseconds % 1000 * 1'000'000};
  while (nanosleep(&left, &left) != 0 && errno == EINTR) {
  }
}

}  // namespace corvexd
