#include "capture/exec_shell.h"

#include <stdio.h>

#include "core/log.h"
#include "core/path_buffer.h"
#include "core/pause.h"
#include "core/state.h"

namespace corvexd {
namespace {

constexpr time_t kHeadStart = 1;  // seconds

}  // namespace

void exec_shell(const char* command, const char* name) {
  const Path directory = LOG_DIR.get();
  const Path output = Path(directory).append("/").append(name);
  if (!output.fits_or_log()) return;
  PathBuffer<512> line;
  line.append(command).append(" > ").append(output.c_str());
  if (isInDataPartition) {
    line.append(" ; chown system:system ").append(output.c_str());
    log_info("corvexd: isInDataPartition  \n");
  }
  if (!line.append("&").fits_or_log()) return;

  // The handler may reap the shell before pclose waits for it; pclose then returns at once.
  if (FILE* pipe = popen(line.c_str(), "re")) {
    pause_seconds(kHeadStart);
    pclose(pipe);
  }
  log_info("corvexd: shell_cmd is %s \n", line.c_str());
}

}  // namespace corvexd
