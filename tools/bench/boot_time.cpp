// How long the daemon takes from its exec to that of the boot recorders, and to serving.
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

// When the latest of the first `count` recorders has started.
long long time_of_recorders(size_t count) {
  std::vector<long long> times;
  for (const ProbeReport& report : probe_reports(count)) {
    times.push_back(atoll(report.rest.back().c_str() + sizeof "started"));
  }
  std::sort(times.begin(), times.end());
  return times[count - 1];
}

void print(const char* what, std::vector<double> milliseconds) {
  std::sort(milliseconds.begin(), milliseconds.end());
  printf("start to %s, %d starts: median %.1f ms, from %.1f to %.1f ms\n", what, kStarts,
         milliseconds[kStarts / 2], milliseconds.front(), milliseconds.back());
}

double milliseconds_since(long long start, long long end) {
  return static_cast<double>(end - start) / 1e6;
}

int run_starts() {
  LogCatcher log;
  log.start();
  make_device_ready();
  install_probes("live");
  std::vector<double> recorders, commands;
  for (int i = 0; i < kStarts; ++i) {
    clear_probe_reports();
    long long start = now();
    BootingDaemon daemon("/build/corvexd");
    send_commands({"CHANGEPATH"});
    commands.push_back(milliseconds_since(start, now()));
    recorders.push_back(milliseconds_since(start, time_of_recorders(4)));
  }
  print("fourth boot recorder", recorders);
  print("first command served", commands);
  return 0;
}

}  // namespace
}  // namespace corvexd::test

int main() {
  corvexd::test::enter_device_root();
  corvexd::test::make_empty_device();
  return corvexd::test::run_starts();
}
