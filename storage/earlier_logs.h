// Logs that the device recorded before a capture began.
#pragma once

namespace corvexd {

// Body of the thread that every capture starts: copies the initial-phase logs, the ANR traces, the
// dropbox entries and the recovery and kernel-message logs into the current log directory, and
// ends. Ignores its argument and returns null.
void* copy_file_already_exist(void*);

}  // namespace corvexd
