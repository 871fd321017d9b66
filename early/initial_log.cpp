#include "early/initial_log.h"

#include <cutils/properties.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include "capture/children.h"
#include "capture/logcat_argv.h"
#include "core/directory.h"
#include "core/fixed_string.h"
#include "core/log.h"
#include "core/sleep.h"
#include "core/state.h"
#include "core/thread.h"
#include "early/area.h"

namespace corvexd {
namespace {

constexpr char kArea[] = "log_before_initial/";
constexpr char kMarker[] = "fileAfter911";
constexpr int32_t kSizeLimit = 15'728'640;  // bytes
constexpr time_t kCheckPeriod = 100;        // seconds

struct InitialRecorder {
  ChildSlot* slot;
  const char* file;
  LogcatJob job;
  const char* line;
};

ChildSlot android_slot, kernel_slot, event_slot;

constexpr InitialRecorder kInitialRecorders[] = {
    {&android_slot,
     "log_before_initial/android_initial.log",
     {"2048", "4", {"system", "main", "crash"}, true},
     "corvexd: executeOnBootLogcat android \n"},
    {&kernel_slot,
     "log_before_initial/kernel_initial.log",
     {"1024", "4", {"kernel"}, false},
     "corvexd: executeOnBootLogcat kernel \n"},
    {&event_slot,
     "log_before_initial/event_initial.log",
     {"1024", "4", {"events"}, false},
     "corvexd: executeOnBootLogcat event \n"},
};

// The oldest first; what the events recorder wrote is never deleted.
constexpr const char* kDeletionOrder[] = {
    "log_before_initial/android_initial.log.4", "log_before_initial/android_initial.log.3",
    "log_before_initial/android_initial.log.2", "log_before_initial/android_initial.log.1",
    "log_before_initial/android_initial.log",   "log_before_initial/kernel_initial.log.4",
    "log_before_initial/kernel_initial.log.3",  "log_before_initial/kernel_initial.log.2",
    "log_before_initial/kernel_initial.log.1",  "log_before_initial/kernel_initial.log",
};

void run_initial_recorder(const void* argument) {
  const auto& recorder = *static_cast<const InitialRecorder*>(argument);
  log_error("%s", recorder.line);
  exec_logcat(recorder.job, cache_file(recorder.file).c_str());
}

// Walks by descriptor, so no path below the directory can be too long. Unsigned sums wrap where
// signed ones must not.
uint32_t size_below(const Directory& directory) {
  uint32_t total = 0;
  while (struct dirent* entry = next_entry(directory)) {
    if (is_directory(directory, *entry)) {
      const Directory below = open_directory_at(dirfd(directory.get()), entry->d_name);
      total += below ? size_below(below) : static_cast<uint32_t>(-1);
      continue;
    }
    struct stat status;
    if (fstatat(dirfd(directory.get()), entry->d_name, &status, AT_SYMLINK_NOFOLLOW) == 0) {
      total += static_cast<uint32_t>(status.st_size);
    }
  }
  return total;
}

}  // namespace

void execute911Logcat() {
  install_sigchld_handler();
  if (access(cache_file(kMarker).c_str(), R_OK) == 0) return;
  property_set("oem.after.clear", "false");
  start_thread(delete_file);
  provide_area(kArea);
  for (const InitialRecorder& recorder : kInitialRecorders) {
    start_child(*recorder.slot, run_initial_recorder, &recorder);
  }
}

void* delete_file(void*) {
  log_error("corvexd: delete_file start!\n");
  const Path area = cache_file(kArea);
  for (;;) {
    while (getDirSize(area.c_str()) > kSizeLimit && deleteFile()) {
    }
    sleep_seconds(kCheckPeriod);
  }
}

bool deleteFile() {
  for (const char* name : kDeletionOrder) {
    const Path path = cache_file(name);
    if (access(path.c_str(), R_OK) != 0) continue;
    const Place place = locate(path.c_str());
    if (place.folder != -1 && unlinkat(place.folder, place.name, 0) == 0) return true;
    log_error("corvexd: can't remove %s \n", path.c_str());
    return false;
  }
  return false;
}

int32_t getDirSize(const char* path) {
  Directory directory = open_directory(path);
  return directory ? static_cast<int32_t>(size_below(directory)) : -1;
}

}  // namespace corvexd
