// Shell commands whose output goes into a file.
#pragma once

#include <android-base/unique_fd.h>

#include "capture/children.h"

namespace corvexd {

// Makes an open file the standard output of the calling child and of what it runs.
void use_as_output(int fd);

// Starts `command` in a shell, a child in this slot, with `output` as its standard output. The
// command line names no file: the shell would follow a link that somebody has put there. Any
// thread. Does not wait; false when the fork failed. If `output` could not be opened (errno says
// why), that is reported on standard error, as a shell does.
bool start_shell(ChildSlot& slot, const char* command, android::base::unique_fd output);

// Runs `command` through the shell with its output in the file `name` of LOG_DIR, given to the
// system user while the log root lies in the data partition. Main thread. Returns after about one
// second. The command may still be writing then; its exit status is ignored.
void exec_shell(const char* command, const char* name);

}  // namespace corvexd
