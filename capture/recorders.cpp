#include "capture/recorders.h"

#include "capture/logcat_argv.h"
#include "capture/node_reader.h"
#include "core/log.h"
#include "core/properties.h"
#include "core/settings.h"
#include "core/state.h"
#include "storage/capture_paths.h"

namespace corvexd {

ChildSlot android_pid;
ChildSlot radio_pid;
ChildSlot event_pid;
ChildSlot kernel_pid;
ChildSlot tcpdump_pid;
ChildSlot qsee_pid;
ChildSlot tz_pid;
ChildSlot bootloader_pid;
ChildSlot pre_bootloader_pid;

int32_t kernel_from_fd = -1, kernel_to_fd = -1;
int32_t qsee_from_fd = -1, qsee_to_fd = -1;
int32_t tz_from_fd = -1, tz_to_fd = -1;
int32_t bootloader_from_fd = -1, bootloader_to_fd = -1;
int32_t pre_bootloader_from_fd = -1, pre_bootloader_to_fd = -1;

std::atomic<uint8_t> stop_logcat{1};
std::atomic<uint8_t> capture_running{0};

namespace {

constexpr LogcatJob kMainAndSystem = {
    android_logsize, android_lognum, {"system", "main", "crash"}, true};
constexpr LogcatJob kMainOnly = {android_logsize, android_lognum, {"main", "crash"}, true};
constexpr LogcatJob kSystemOnly = {android_logsize, android_lognum, {"system", "crash"}, true};
constexpr LogcatJob kRadio = {radio_logsize, radio_lognum, {"radio"}, true};
constexpr LogcatJob kEvents = {event_logsize, event_lognum, {"events"}, true};
constexpr LogcatJob kKernel = {kernel_logsize, kernel_lognum, {"kernel"}, false};

void run_android(const CaptureSwitches& switches) {
  const LogcatJob& job = !switches.system ? kMainOnly
                         : switches.main  ? kMainAndSystem
                                          : kSystemOnly;
  exec_logcat(job, android_log_path.get().c_str());
}

void run_radio(const CaptureSwitches&) { exec_logcat(kRadio, radio_log_path.get().c_str()); }

void run_events(const CaptureSwitches&) { exec_logcat(kEvents, event_log_path.get().c_str()); }

void run_kernel(const CaptureSwitches& switches) {
  log_info("corvexd: kernel_pid");
  if (switches.kernel_kmsg) return cat_kernel_from_dev();
  exec_logcat(kKernel, kernel_log_path.get().c_str());
}

void run_tcpdump(const CaptureSwitches&) {
  const Path path = tcpdump_path.get();
  const char* user = isInDataPartition ? "system" : "root";
  const char* arguments[] = {"tcpdump",       "-i", "any",          "-p", "-s",         "0",  "-C",
                             tcpdump_logsize, "-W", tcpdump_lognum, "-w", path.c_str(), "-Z", user,
                             nullptr};
  exec_program("/system/xbin/tcpdump", arguments);
}

}  // namespace

const Recorder kRecorders[kRecorderCount] = {
    {{"persist.sys.main", "persist.sys.system"}, &android_pid, run_android, nullptr, {}},
    {{"persist.sys.radio"}, &radio_pid, run_radio, nullptr, {}},
    {{"persist.sys.event"}, &event_pid, run_events, nullptr, {}},
    {{"persist.sys.kernel"}, &kernel_pid, run_kernel, nullptr, {&kernel_to_fd, &kernel_from_fd}},
    {{"persist.sys.tcpdump"}, &tcpdump_pid, run_tcpdump, nullptr, {}},
    {{"persist.sys.qsee"}, &qsee_pid, nullptr, &kQseeReader, {&qsee_from_fd, &qsee_to_fd}},
    {{"persist.sys.tz"}, &tz_pid, nullptr, &kTzReader, {&tz_from_fd, &tz_to_fd}},
    {{"persist.sys.bootloader"},
     &bootloader_pid,
     nullptr,
     &kBootloaderReader,
     {&bootloader_from_fd, &bootloader_to_fd}},
    {{"persist.sys.pre_bootloader"},
     &pre_bootloader_pid,
     nullptr,
     &kPreBootloaderReader,
     {&pre_bootloader_from_fd, &pre_bootloader_to_fd}},
};

bool switched_on(const char* property) { return property_is(property, "yes", "no"); }

}  // namespace corvexd
