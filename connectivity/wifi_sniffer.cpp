#include "connectivity/wifi_sniffer.h"

#include <unistd.h>

#include "core/log.h"
#include "core/sleep.h"

namespace corvexd {

ChildSlot sniff_set_pid;
ChildSlot sniff_start_pid;
ChildSlot sniff_stop_pid;

namespace {

// The time that the driver needs between the two commands that switch its log on.
constexpr time_t kSettlingTime = 5;  // seconds

struct Job {
  ChildSlot* slot;
  const char* vendor_tool;  // where it exists, else
  const char* system_tool;
  const char* arguments[6];
  time_t delay;  // seconds between the fork and the tool, in both processes
};

constexpr Job kSetJob = {&sniff_set_pid,
                         "/vendor/bin/pktlogconf",
                         "/system/bin/pktlogconf",
                         {"pktlogconf", "-s", "16000000", "-a", "cld"},
                         kSettlingTime};
constexpr Job kStartJob = {&sniff_start_pid,
                           "/vendor/bin/iwpriv",
                           "/system/bin/iwpriv",
                           {"iwpriv", "wlan0", "pktlog", "1"},
                           0};
constexpr Job kStopJob = {&sniff_stop_pid,
                          "/vendor/bin/iwpriv",
                          "/system/bin/iwpriv",
                          {"iwpriv", "wlan0", "pktlog", "0"},
                          0};

void run_job(const void* argument) {
  const auto& job = *static_cast<const Job*>(argument);
  if (job.delay > 0) sleep_seconds(job.delay);
  bool in_vendor = access(job.vendor_tool, F_OK) == 0;
  exec_program(in_vendor ? job.vendor_tool : job.system_tool, job.arguments);
}

void start_job(const Job& job) {
  terminate_child(*job.slot);
  forget_child(*job.slot);
  start_child(*job.slot, run_job, &job);
  if (job.delay > 0) sleep_seconds(job.delay);
}

}  // namespace

void wifi_snifflog_start() {
  start_job(kSetJob);
  log_info("corvexd:wifi_snifflog_start...sniff_set...\n");
  start_job(kStartJob);
  log_info("corvexd:wifi_snifflog_start...sniff_start....\n");
}

void wifi_snifflog_stop() {
  start_job(kStopJob);
  log_info("corvexd:wifi_snifflog_stop...sniff_stop....\n");
}

}  // namespace corvexd
