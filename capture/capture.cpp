#include "capture/capture.h"

#include <unistd.h>

#include "capture/children.h"
#include "capture/exec_shell.h"
#include "capture/recorders.h"
#include "core/sleep.h"
#include "core/thread.h"
#include "storage/capture_paths.h"
#include "storage/earlier_logs.h"
#include "storage/log_directory.h"

namespace corvexd {
namespace {

constexpr time_t kSettlingTime = 1;  // seconds

struct RecorderStart {
  const Recorder* recorder;
  const CaptureSwitches* switches;
};

void run_recorder(const void* argument) {
  const auto& start = *static_cast<const RecorderStart*>(argument);
  if (start.recorder->reader != nullptr) return run_node_reader(*start.recorder->reader);
  start.recorder->run(*start.switches);
}

// The android recorder uses the two switches that were read before the properties were dumped.
// Every other switch is read when its recorder's turn comes.
bool should_start(const Recorder& recorder, const CaptureSwitches& switches) {
  if (recorder.slot == &android_pid) return switches.main || switches.system;
  return switched_on(recorder.switches[0]);
}

bool should_stop(const Recorder& recorder) {
  bool on = false;
  for (const char* property : recorder.switches) {
    if (property != nullptr && switched_on(property)) on = true;
  }
  return on;
}

void close_slot(int32_t* descriptor) {
  if (descriptor == nullptr || *descriptor < 0) return;
  close(*descriptor);
  *descriptor = -1;
}

}  // namespace

void begin_capture() {
  begin_log_directory();
  makeLogAbsolutePath();
  executeLogcat();
}

void executeLogcat() {
  install_sigchld_handler();
  const CaptureSwitches switches = {switched_on("persist.sys.main"),
                                    switched_on("persist.sys.system"),
                                    switched_on("persist.sys.kernel.kmsg")};
  capture_running = 1;
  start_thread(copy_file_already_exist);
  exec_shell("getprop", "getprop.txt");
  for (const Recorder& recorder : kRecorders) {
    if (!should_start(recorder, switches)) continue;
    RecorderStart start = {&recorder, &switches};
    start_child(*recorder.slot, run_recorder, &start);
  }
  sleep_seconds(kSettlingTime);
  stop_logcat = 0;
}

void stopLogcat() {
  stop_logcat = 1;
  capture_running = 0;
  for (const Recorder& recorder : kRecorders) {
    if (!should_stop(recorder)) continue;
    for (int32_t* descriptor : recorder.descriptors) close_slot(descriptor);
    terminate_child(*recorder.slot);
    forget_child(*recorder.slot);
  }
}

}  // namespace corvexd
