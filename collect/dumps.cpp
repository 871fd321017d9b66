#include "collect/dumps.h"

#include <android-base/unique_fd.h>
#include <errno.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/wait.h>
#include <unistd.h>

#include "capture/children.h"
#include "capture/exec_shell.h"
#include "core/files.h"
#include "core/fixed_string.h"
#include "core/local_time.h"
#include "core/log.h"
#include "storage/current_directory.h"

using android::base::unique_fd;

namespace corvexd {
namespace {

constexpr char kRedirection[] = " > ";

ChildSlot bugreport_slot;
ChildSlot clear_slot;

// The line says where the report goes. This child opens that file itself, before it starts the
// tool: the shell would follow a link that somebody has put there.
void run_bugreport(const void* command_line) {
  const char* line = static_cast<const char*>(command_line);
  const char* path = strstr(line, kRedirection) + strlen(kRedirection);
  const unique_fd output = open_program_output(path);
  if (output == -1) {
    dprintf(STDERR_FILENO, "corvexd: %s: %s\n", path, strerror(errno));
    return;
  }
  use_as_output(output);
  const Path tool = Path().append(line, strstr(line, kRedirection) - line);
  _exit(system(tool.c_str()) == 0 ? 0 : 1);
}

void run_clear(const void*) {
  const char* arguments[] = {"logcat", "-c", nullptr};
  exec_program("/system/bin/logcat", arguments);
}

void run_and_wait(ChildSlot& slot, void (*body)(const void*), const void* argument,
                  const char* name) {
  start_child(slot, body, argument);
  if (slot.pid < 0) {
    log_error("corvexd: %s process fork error: %s", name, strerror(errno));
    return;
  }
  if (WIFSIGNALED(wait_for_child(slot))) log_error("corvexd: Child terminated abnormally\n");
}

}  // namespace

void getBugreport() {
  char file_name[100];
  const char* line = otherLogsCommand("bugreport", "BUGREPORT", file_name);
  if (line != nullptr) run_and_wait(bugreport_slot, run_bugreport, line, "Bugreport");
}

void cacheClear() { run_and_wait(clear_slot, run_clear, nullptr, "Clear"); }

const char* otherLogsCommand(const char* command, const char* kind, char* file_name) {
  static FixedString<200> line;
  Path directory;
  if (!find_current_directory(WhichMark::kFirstPlain, &directory)) {
    log_error("corvexd: no current log directory for %s\n", command);
    return nullptr;
  }
  Timestamp file = local_timestamp();
  file.append("-").append(kind).append(".log");
  line.clear().append("/system/bin/").append(command).append(kRedirection);
  line.append(directory.c_str()).append("/").append(file.c_str());
  if (!file.fits() || !line.fits_or_log()) return nullptr;
  strcpy(file_name, file.c_str());
  return line.c_str();
}

}  // namespace corvexd
