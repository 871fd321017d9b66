#include "service/commands.h"

#include <errno.h>
#include <string.h>
#include <sys/socket.h>
#include <unistd.h>

#include "capture/capture.h"
#include "capture/children.h"
#include "collect/dumps.h"
#include "connectivity/debug_tags.h"
#include "connectivity/wifi_sniffer.h"
#include "core/log.h"
#include "core/state.h"
#include "storage/delete.h"
#include "thermal/thermal_sampler.h"

namespace corvexd {
namespace {

void begin_capture_anew(int) {
  checkLogPath();
  begin_capture();
}

void answer(int connection, const char* reply) {
  size_t left = strlen(reply);
  while (left > 0) {
    // A client that has gone must not end the daemon: no SIGPIPE from this write. The signal's
    // disposition stays as it is, for recorders inherit it.
    ssize_t written = TEMP_FAILURE_RETRY(send(connection, reply, left, MSG_NOSIGNAL));
    if (written < 0) {
      log_error("corvexd: write error: %s\n", strerror(errno));
      return;
    }
    reply += written;
    left -= written;
  }
}

// Both roots are emptied, whichever is in use.
void delete_logs(int connection) {
  bool clean = deleteLog("/data/corvex") == 0 && deleteLog("/storage/emulated/0/corvex") == 0;
  const char* reply = clean ? "CLEANSUCCESS" : "CLEANFAILED";
  log_info("clean log %s \n", reply);
  answer(connection, reply);
}

void start_sniffer(int) {
  log_info("wifi_snifflog_start");
  wifi_snifflog_start();
}

void stop_sniffer(int) {
  log_info("wifi_snifflog_stop");
  wifi_snifflog_stop();
}

struct Command {
  const char* word;
  void (*action)(int connection);
};

constexpr Command kCommands[] = {
    {"LOGBEGIN", begin_capture_anew},
    {"LOGSTOP", [](int) { stopLogcat(); }},
    {"CACHECLEAR", [](int) { cacheClear(); }},
    {"BUGREPORT", [](int) { getBugreport(); }},
    {"CPUTHERMAL", [](int) { getCpuxThermal(); }},
    {"STOPCPUTHERMAL", [](int) { terminate_child(cpu_thermal_pid); }},
    {"DELETELOG", delete_logs},
    {"OEM_BT_DEBUG_ENABLE", [](int) { set_bluetooth_android_log(1); }},
    {"OEM_BT_DEBUG_DISABLE", [](int) { set_bluetooth_android_log(0); }},
    {"OEM_GPS_DEBUG_ENABLE", [](int) { set_gps_android_log(1); }},
    {"OEM_GPS_DEBUG_DISABLE", [](int) { set_gps_android_log(0); }},
    {"OEM_NFC_DEBUG_ENABLE", [](int) { set_nfc_android_log(1); }},
    {"OEM_NFC_DEBUG_DISABLE", [](int) { set_nfc_android_log(0); }},
    {"WIFI_SNIFFLOG_START", start_sniffer},
    {"WIFI_SNIFFLOG_STOP", stop_sniffer},
    {"CHANGEPATH", [](int) { checkLogPath(); }},
};

}  // namespace

void run_command(const char* text, int connection) {
  for (const Command& command : kCommands) {
    if (strcmp(text, command.word) == 0) command.action(connection);
  }
}

}  // namespace corvexd
