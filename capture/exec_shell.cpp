#include "capture/exec_shell.h"

#include <errno.h>
#include <fcntl.h>
#include <paths.h>
#include <stdio.h>
#include <string.h>
#include <unistd.h>

#include <utility>

#include "core/files.h"
#include "core/fixed_string.h"
#include "core/log.h"
#include "core/sleep.h"
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
  use_as_output(start.output);
  const char* arguments[] = {"sh", "-c", start.command, nullptr};
  exec_program(_PATH_BSHELL, arguments);
}

}  // namespace

void use_as_output(int fd) {
  dup2(fd, STDOUT_FILENO);
  fcntl(STDOUT_FILENO, F_SETFD, 0);  // dup2 leaves the flag set if fd is standard output already
}

bool start_shell(ChildSlot& slot, const char* command, unique_fd output) {
  if (output == -1) {
    dprintf(STDERR_FILENO, "corvexd: no output for %s: %s\n", command, strerror(errno));
    return true;
  }
  const ShellStart start = {command, output};
  start_child(slot, run_shell, &start);
  return slot.pid > 0;
}

void exec_shell(const char* command, const char* name) {
  const Path output = Path(LOG_DIR.get()).append("/").append(name);
  if (!output.fits_or_log()) return;
  FixedString<512> line, started;
  line.append(command).append(" > ").append(output.c_str());
  started.append(command);
  if (isInDataPartition) {
    line.append(" ; chown system:system ").append(output.c_str());
    log_info("corvexd: isInDataPartition  \n");
  } else {
    started.append("&");
  }
  if (!line.append("&").fits_or_log()) return;

  // Does what the line says, but the daemon opens the file and changes its owner itself.
  unique_fd file = open_program_output(output.c_str());
  if (file != -1) give_to_system(file);
  if (start_shell(dump_slot, started.c_str(), std::move(file))) sleep_seconds(kHeadStart);
  log_info("corvexd: shell_cmd is %s \n", line.c_str());
}

}  // namespace corvexd
