// The mounts of the device's root directory.
#pragma once

#include <string>

namespace corvexd::sim {

// Makes `root` a mount of its own in this mount namespace and the current directory.
bool mount_root(const std::string& root);

// Mounts the host's programs, libraries and devices into the current directory, and moves this
// process into it. On failure these say what failed and answer false.
bool mount_rest_and_enter();

}  // namespace corvexd::sim
