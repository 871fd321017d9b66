// The first minute of every boot, recorded into the boot-log area of the cache log directory.
#pragma once

#include "capture/children.h"

namespace corvexd {

// The boot recorders; final once executeOnBootLogcat has returned.
extern ChildSlot android_boot_pid;
extern ChildSlot radio_boot_pid;
extern ChildSlot event_boot_pid;
extern ChildSlot kernel_boot_pid;

// Sets the files of the previous boot aside and starts the four boot recorders, with the logcat
// settings as they stand: empty, this early. Main thread, once. Returns without waiting.
void executeOnBootLogcat();

// Renames a readable `path` to `path`.pre, replacing what has that name; a failure is logged.
void renameOldBootLog(const char* path);

// Thread body: ends the boot recorders after 60 seconds and, when persistent capture was on as the
// thread started, copies the boot-log area into the current log directory.
void* stopLogAfterBoot(void*);

}  // namespace corvexd
