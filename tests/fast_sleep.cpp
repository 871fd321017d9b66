// Time for tests: pauses of seconds last hundredths of it, and leave a line each with what they
// were to last. The long ones are reported, and end when the test says so: a file of that name
// appears.
#include <errno.h>
#include <fcntl.h>
#include <stdio.h>
#include <unistd.h>

#include "core/sleep.h"

namespace corvexd {
namespace {

constexpr time_t kLong = 60;

void sleep_for(long nanoseconds) {
  struct timespec left = {0, nanoseconds};
  while (nanosleep(&left, &left) != 0 && errno == EINTR) {
  }
}

}  // namespace

void sleep_seconds(time_t seconds) {
  char line[24];
  const int length = snprintf(line, sizeof line, "%lld\n", static_cast<long long>(seconds));
  const int lines = open("/probe/pauses", O_CREAT | O_WRONLY | O_APPEND | O_CLOEXEC, 0600);
  if (write(lines, line, length) != length) errno = 0;
  close(lines);
  if (seconds < kLong) return sleep_for(seconds * 10'000'000);
  char started[64], end[64];
  snprintf(started, sizeof started, "/probe/pause_%lld", static_cast<long long>(seconds));
  snprintf(end, sizeof end, "/probe/end_pause_%lld", static_cast<long long>(seconds));
  close(open(started, O_CREAT | O_WRONLY | O_CLOEXEC, 0600));
  while (unlink(end) != 0) sleep_for(10'000'000);
}

}  // namespace corvexd
