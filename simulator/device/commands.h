// The two things that corvex-device does.
#pragma once

#include <string>

namespace corvexd::sim {

struct BootOptions {
  bool quiet = false;      // what its programs say on standard error is of no interest
  bool encrypted = false;  // its data partition has to be decrypted before it is used
};

// Runs a device on `root` until a SIGINT or SIGTERM, then ends everything in it. Answers the exit
// status.
int boot_device(const std::string& root, const BootOptions& options);

// Runs a command, found on the device's path, in the device that runs on `root`. Answers its exit
// status; 125 when there is no such device, and 127 when there is no such command.
int run_in_device(const std::string& root, char** command);

// What every process of the device finds in its environment.
extern const char* const kDeviceEnvironment[];

}  // namespace corvexd::sim
