#include "early/boot_log.h"

#include <errno.h>
#include <stdio.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

#include <initializer_list>

#include "capture/logcat_argv.h"
#include "core/directory.h"
#include "core/fixed_string.h"
#include "core/log.h"
#include "core/properties.h"
#include "core/sleep.h"
#include "core/state.h"
#include "early/area.h"
#include "storage/copy.h"

namespace corvexd {

ChildSlot android_boot_pid;
ChildSlot radio_boot_pid;
ChildSlot event_boot_pid;
ChildSlot kernel_boot_pid;

namespace {

constexpr char kArea[] = "boot_log/";
constexpr time_t kRecordedTime = 60;  // seconds

struct BootRecorder {
  ChildSlot* slot;
  const char* file;
  LogcatJob job;
  void (*log)(const char* format, ...);
  const char* line;
};

// In the order in which they are started.
constexpr BootRecorder kBootRecorders[] = {
    {&android_boot_pid,
     "boot_log/android_boot.log",
     {"8192", "1", {"system", "main", "crash"}, true},
     log_info,
     "corvexd: android_boot_pid"},
    {&radio_boot_pid,
     "boot_log/radio_boot.log",
     {"4096", "1", {"radio"}, true},
     log_info,
     "corvexd: radio_boot_pid"},
    {&event_boot_pid,
     "boot_log/event_boot.log",
     {"4096", "1", {"events"}, true},
     log_info,
     "corvexd: event_boot_pid"},
    {&kernel_boot_pid,
     "boot_log/kernel_boot.log",
     {"4096", "1", {"kernel"}, false},
     log_error,
     "corvexd: kernel_boot_pid \n"},
};

constexpr const char* kOldFiles[] = {
    "boot_log/android_boot.log", "boot_log/android_boot.log.1", "boot_log/event_boot.log",
    "boot_log/event_boot.log.1", "boot_log/kernel_boot.log",    "boot_log/kernel_boot.log.1",
    "boot_log/radio_boot.log",   "boot_log/radio_boot.log.1",
};

void run_boot_recorder(const void* argument) {
  const auto& recorder = *static_cast<const BootRecorder*>(argument);
  recorder.log("%s", recorder.line);
  exec_logcat(recorder.job, cache_file(recorder.file).c_str());
}

}  // namespace

void renameOldBootLog(const char* path) {
  if (access(path, R_OK) != 0) return;
  const Path old_generation = Path().append(path).append(".pre");
  if (!old_generation.fits_or_log()) return;
  const Place place = locate(path);
  const char* old_name = strrchr(old_generation.c_str(), '/') + 1;
  if (place.folder == -1 || renameat(place.folder, place.name, place.folder, old_name) != 0) {
    log_error("corvexd: Rename %s failed! Error: %s\n", path, strerror(errno));
  }
}

void executeOnBootLogcat() {
  install_sigchld_handler();
  provide_area(kArea);
  for (const char* file : kOldFiles) renameOldBootLog(cache_file(file).c_str());
  log_error("corvexd: executeOnBootLogcat start \n");
  for (const BootRecorder& recorder : kBootRecorders) {
    start_child(*recorder.slot, run_boot_recorder, &recorder);
  }
}

void* stopLogAfterBoot(void*) {
  const bool persistent_capture = property_is("persist.sys.assert.panic", "true");
  const Path area = cache_file(kArea);
  sleep_seconds(kRecordedTime);
  for (ChildSlot* slot : {&android_boot_pid, &event_boot_pid, &kernel_boot_pid, &radio_boot_pid}) {
    terminate_child(*slot);
  }
  log_error("corvexd: executeOnBootLogcat stop \n");
  if (persistent_capture) copy_folder(area.c_str(), "/boot_log/");
  return nullptr;
}

}  // namespace corvexd
