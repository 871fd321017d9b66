#include "service/startup.h"

#include <cutils/fs.h>
#include <cutils/properties.h>
#include <string.h>
#include <unistd.h>

#include "capture/capture.h"
#include "core/log.h"
#include "core/properties.h"
#include "core/sleep.h"
#include "core/state.h"
#include "fs_mgr/fs_mgr_fstab.h"

namespace corvexd {
namespace {

constexpr char kOtherCacheDirectory[] = "/kv2/";
constexpr char kFstab[] = "/vendor/etc/fstab.qcom";
constexpr char kLayoutVersion[] = "/data/.layout_version";
constexpr int kReadyLayout = 3;
constexpr time_t kPollPeriod = 1;  // seconds

bool layout_is_ready() {
  int version;
  return fs_read_atomic_int(kLayoutVersion, &version) == 0 && version >= kReadyLayout;
}

bool framework_has_restarted() {
  return property_is("vold.decrypt", "trigger_restart_framework") &&
         property_is("vold.internalSD.mount", "1");
}

bool internal_storage_is_mounted() {
  log_error("corvexd: Waiting for internal sd be mounted... \n");
  if (property_is("vold.internalSD.mount", "1")) return true;
  return property_is("vold.internalSD.mount", "A") && property_is("ro.mount.tempfs", "true");
}

}  // namespace

void choose_cache_directory() {
  if (access(kOtherCacheDirectory, R_OK) == 0) cache_path = kOtherCacheDirectory;
  log_info("put cache logs in %s \n", cache_path.load());
}

bool data_is_force_encrypted() {
  // Kept for the life of the process.
  static fstab* table = fs_mgr_read_fstab(kFstab);
  const fstab_entry* data = fs_mgr_get_entry_for_mount_point(table, "/data");
  return data != nullptr && (data->fs_mgr_flags & kForceEncryptFlag) != 0;
}

void wait_for_layout() {
  while (!layout_is_ready()) {
    log_error("corvexd: installd fs upgrade not yet complete. Waiting...\n");
    sleep_seconds(kPollPeriod);
  }
}

void wait_for_data_partition(bool force_encrypted) {
  if (force_encrypted) log_error("corvexd: Waiting for restart framework... \n");
  auto is_ready = force_encrypted ? framework_has_restarted : internal_storage_is_mounted;
  while (!is_ready()) sleep_seconds(kPollPeriod);
}

void start_persistent_capture() {
  char panic[PROPERTY_VALUE_MAX];
  property_get("persist.sys.assert.panic", panic, "false");
  log_debug("corvexd: in function %s, persist.sys.assert.panic = %s\n", "main", panic);
  if (strcmp(panic, "true") != 0) return;
  begin_capture();
}

void start_diagnostic_service() {
  if (!property_is("persist.sys.qxdm", "yes", "no")) return;
  log_debug("start diag_mdlog_start");
  property_set("ctl.start", "diag_mdlog_start");
}

}  // namespace corvexd
