// How long the boot recorders take to run, from the daemon's own exec to theirs.
#include <stdio.h>
#include <stdlib.h>
#include <time.h>

#include <algorithm>
#include <string>
#include <vector>

#include "tests/daemon.h"
#include "tests/device_root.h"
#include "tests/files.h"

namespace corvexd::test {
namespace {

constexpr int kStarts = 20;

long long now() {
  struct timespec time;
  clock_gettime(CLOCK_MONOTONIC, &time);
  return time.tv_sec * 1'000'000'000LL + time.tv_nsec;
}

// Nanoseconds to the start of the latest of the first `count` recorders.
long long time_to_recorders(long long start, size_t count) {
  std::vector<long long> times;
  for (const ProbeReport& report : probe_reports(count)) {
    times.push_back(atoll(report.rest.back().c_str() + sizeof "started") - start);
  }
  std::sort(times.begin(), times.end());
  return times[count - 1];
}

int run_starts() {
  LogCatcher log;
  log.start();
  make_device_ready();
  install_probes("live");
  std::vector<double> milliseconds;
  for (int i = 0; i < kStarts; ++i) {
    clear_probe_reports();
    long long start = now();
    BootingDaemon daemon("/build/corvexd");
    milliseconds.push_back(static_cast<double>(time_to_recorders(start, 4)) / 1e6);
  }
  std::sort(milliseconds.begin(), milliseconds.end());
  printf("start to fourth boot recorder, %d starts: median %.1f ms, from %.1f to %.1f ms\n",
         kStarts, milliseconds[kStarts / 2], milliseconds.front(), milliseconds.back());
  return 0;
}

}  // namespace
}  // namespace corvexd::test

int main() {
  corvexd::test::enter_device_root();
  corvexd::test::make_empty_device();
  return corvexd::test::run_starts();
}
