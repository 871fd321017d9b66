#include "collect/file_observer.h"
#include "collect/log_watchdog.h"
#include "connectivity/debug_tags.h"
#include "core/log.h"
#include "core/settings.h"
#include "core/state.h"
#include "core/thread.h"
#include "early/boot_log.h"
#include "early/initial_log.h"
#include "service/control_socket.h"
#include "service/startup.h"

namespace corvexd {

// The start-up order: the boot recorders come first, because the first lines of a boot matter most.
// The data partition is touched only when it can be used.
[[noreturn]] static void run() {
  log_info("corvexd main start\n");
  choose_cache_directory();
  const bool force_encrypted = data_is_force_encrypted();
  log_info("corvexd firing up\n");
  set_control_socket_cloexec();
  executeOnBootLogcat();
  start_thread(stopLogAfterBoot);
  start_thread(connectivity_log_check);
  wait_for_layout();
  wait_for_data_partition(force_encrypted);
  loadSettings();
  checkLogPath();
  execute911Logcat();
  listen_on_control_socket();
  start_persistent_capture();
  start_diagnostic_service();
  start_thread(file_observer);
  start_thread(log_file_observer);
  serve_clients();
}

}  // namespace corvexd

int main() { corvexd::run(); }
