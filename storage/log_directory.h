// The numbered log directories under the log root.
#pragma once

#include "core/fixed_string.h"

namespace corvexd {

// Each of these takes current_directory_mutex for itself.

// Removes the "_current" mark (the last 8 characters of the name) from every directory under the
// log root that bears it. Main thread. Failures are logged; such a directory keeps its name.
void renameLastDirectoryName();

// Makes the next numbered log directory, marked "_current", sets LOG_DIR to it and fills it with
// what every log directory starts with. Main thread. Returns what making its "boot_log" returned (0
// or -1). Ends the process with status 1 when the directory cannot take its first file: without
// one the daemon is of no use, and init starts it again.
int createLogDirectory();

// Both as one step, so that an artefact always finds exactly one mark. Every capture begins with
// it.
void begin_log_directory();

// The directory that bears the mark, made when there is none. Main thread.
Path provide_current_directory();

}  // namespace corvexd
