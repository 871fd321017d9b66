// Verbose logging of the Bluetooth, NFC and location components, by their "log.tag." properties.
#pragma once

namespace corvexd {

// Set every tag of one component to "VERBOSE" when `enable` is 1, else to "INFO". Any thread; the
// last one wins.
void set_bluetooth_android_log(int enable);
void set_nfc_android_log(int enable);
void set_gps_android_log(int enable);

// Applies the levels that the persistent switches ask for, once.
void set_connectivit_android_log();

// Thread body: applies them eight times in the first seconds after start. The tags do not survive a
// reboot, and other start-up code may set them, too.
void* connectivity_log_check(void*);

}  // namespace corvexd
