// One-shot dumps that the client waits for.
#pragma once

namespace corvexd {

// Runs the platform's bug report tool into a time-stamped file of the current log directory and
// waits until it has ended, which can take minutes. Main thread. Without a current log directory
// nothing is run (logged).
void getBugreport();

// Clears the device's log buffers and waits until that is done. Main thread.
void cacheClear();

// Composes the shell command line that runs /system/bin/`command` into the file "<time>-<kind>.log"
// of the current log directory, and writes that file's name into `file_name` (100 bytes at least).
// The line lives in one buffer, until the next call; null (logged) when it cannot be composed.
const char* otherLogsCommand(const char* command, const char* kind, char* file_name);

}  // namespace corvexd
