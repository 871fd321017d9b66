// Which device runs on a root: at most one, and only while its lock is held.
#pragma once

#include <android-base/unique_fd.h>
#include <sys/types.h>

#include <string>

namespace corvexd::sim {

// Takes the root for one device; the lock lasts as long as the answered descriptor. Holds none on
// failure, and has then said why.
android::base::unique_fd lock_device(const std::string& root);

// Tells others which process is the device's init.
bool publish_init(int lock, pid_t init);

// The device's init; 0 when no device runs on that root. What a device left that is gone does not
// count: its lock is free.
pid_t find_init(const std::string& root);

}  // namespace corvexd::sim
