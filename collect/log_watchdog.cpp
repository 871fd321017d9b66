#include "collect/log_watchdog.h"

#include <cutils/properties.h>
#include <sys/stat.h>
#include <time.h>
#include <unistd.h>

#include "capture/recorders.h"
#include "core/log.h"
#include "core/sleep.h"
#include "storage/capture_paths.h"

namespace corvexd {
namespace {

constexpr time_t kStaleAfter = 300;  // seconds
constexpr time_t kCheckPeriod = 60;

constexpr const char* kRestarted[] = {"logd", "logd-reinit", "corvexd"};

void check_log() {
  const Path path = android_log_path.get();
  struct stat status;
  if (access(path.c_str(), R_OK) != 0) return;
  const time_t now = time(nullptr);
  if (lstat(path.c_str(), &status) != 0 || now - kStaleAfter <= status.st_mtime) return;
  log_info("corvexd now: %lld, %s last modified time : %lld", static_cast<long long>(now),
           path.c_str(), static_cast<long long>(status.st_mtime));
  for (const char* service : kRestarted) property_set("ctl.restart", service);
}

}  // namespace

void* log_file_observer(void*) {
  while (capture_running) {
    check_log();
    sleep_seconds(kCheckPeriod);
  }
  return nullptr;
}

}  // namespace corvexd
