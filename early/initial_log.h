// The record of the device's initial phase, and what keeps it small.
#pragma once

#include <stdint.h>

namespace corvexd {

// Starts the initial-phase recorders and the thread that keeps their area small, unless the marker
// says that the initial phase is over. Main thread, once. Returns without waiting.
void execute911Logcat();

// Thread body: every 100 seconds, deletes files of the area until it holds 15 MiB at most. Never
// returns.
void* delete_file(void*);

// Deletes the first existing file of the area's deletion order; false when there is none or it
// could not be deleted (logged).
bool deleteFile();

// The size in bytes of all files below a directory, links not followed; -1 when it cannot be
// opened. The sum keeps 32 bits. Any thread.
int32_t getDirSize(const char* path);

}  // namespace corvexd
