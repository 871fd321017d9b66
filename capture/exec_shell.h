// One-shot shell commands into the current log directory.
#pragma once

namespace corvexd {

// Runs `command` through the shell with its output in the file `name` of LOG_DIR, given to the
// system user while the log root lies in the data partition. Main thread. Returns after about one
// second; the command may still be writing then, and how it ends is not looked at.
void exec_shell(const char* command, const char* name);

}  // namespace corvexd
