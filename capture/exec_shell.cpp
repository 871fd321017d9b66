#include "capture/exec_shell.h"

#include <errno.h>
#include <paths.h>
#include <string.h>
#include <unistd.h>

#include <utility>

#include "core/files.h"
#include "core/log.h"
#include "core/path_buffer.h"
#include "core/pause.h"
#include "core/state.h"

using android::base::unique_fd;

namespace corvexd {
namespace {

constexpr time_t kHeadStart = 1;  // seconds

ChildSlot dump_slot;

struct ShellStart {
  const char* command;
  int output;
};

void run_shell(const void* argument) {
  const auto& start = *static_cast<const ShellStart*>(argument);
  dup2(start.output, STDOUT_FILENO);
  const char* arguments[] = {"sh", "-c", start.command, nullptr};
  exec_program(_PATH_BSHELL, arguments);
}

}  // namespace

bool start_shell(ChildSlot& slot, const char* command, unique_fd output) {
  if (output == -1) {
    log_error("corvexd: no output for %s: %s\n", command, strerror(errno));
    return false;
  }
  const ShellStart start = {command, output};
  start_child(slot, run_shell, &start);
  return slot.pid > 0;
}

void exec_shell(const char* command, const char* name) {
  const Path output = Path(LOG_DIR.get()).append("/").append(name);
  if (!output.fits_or_log()) return;
  PathBuffer<512> line;
  line.append(command).append(" > ").append(output.c_str());
  if (isInDataPartition) {
    line.append(" ; chown system:system ").append(output.c_str());
    log_info("corvexd: isInDataPartition  \n");
  }
  if (!line.append("&").fits_or_log()) return;

  // What the line says, but that the file is opened and given away here.
  unique_fd file = open_program_output(output.c_str());
  if (file != -1) give_to_system(file);
  if (start_shell(dump_slot, command, std::move(file))) pause_seconds(kHeadStart);
  log_info("corvexd: shell_cmd is %s \n", line.c_str());
}

}  // namespace corvexd
