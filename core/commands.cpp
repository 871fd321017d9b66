#include "core/commands.h"

#include <errno.h>
#include <string.h>
#include <sys/socket.h>
#include <unistd.h>

#include "capture/capture.h"
#include "capture/children.h"
#include "core/log.h"
#include "core/state.h"
#include "storage/capture_paths.h"
#include "storage/delete.h"
#include "storage/log_directory.h"
#include "thermal/thermal_sampler.h"

namespace corvexd {
namespace {

void begin_capture(int) {
  checkLogPath();
  renameLastDirectoryName();
  createLogDirectory();
  makeLogAbsolutePath();
  executeLogcat();
}

void end_capture(int) { stopLogcat(); }

void start_sampler(int) { getCpuxThermal(); }

void stop_sampler(int) { terminate_child(cpu_thermal_pid); }

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

void change_path(int) { checkLogPath(); }

struct Command {
  const char* word;
  void (*action)(int connection);
};

constexpr Command kCommands[] = {
    {"LOGBEGIN", begin_capture},
    {"LOGSTOP", end_capture},
    {"CACHECLEAR", nullptr},
    {"BUGREPORT", nullptr},
    {"CPUTHERMAL", start_sampler},
    {"STOPCPUTHERMAL", stop_sampler},
    {"DELETELOG", delete_logs},
    {"OEM_BT_DEBUG_ENABLE", nullptr},
    {"OEM_BT_DEBUG_DISABLE", nullptr},
    {"OEM_GPS_DEBUG_ENABLE", nullptr},
    {"OEM_GPS_DEBUG_DISABLE", nullptr},
    {"OEM_NFC_DEBUG_ENABLE", nullptr},
    {"OEM_NFC_DEBUG_DISABLE", nullptr},
    {"WIFI_SNIFFLOG_START", nullptr},
    {"WIFI_SNIFFLOG_STOP", nullptr},
    {"CHANGEPATH", change_path},
};

}  // namespace

void run_command(const char* text, int connection) {
  for (const Command& command : kCommands) {
    // A word without an action is known and does nothing yet.
    if (strcmp(text, command.word) == 0 && command.action != nullptr) command.action(connection);
  }
}

}  // namespace corvexd
