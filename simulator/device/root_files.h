// The files of the device's root directory.
#pragma once

#include <string>

namespace corvexd::sim {

// Both work in the current directory, the device's root, and leave what the device keeps in /data,
// /cache and /storage, but for what no boot takes over from the last. On failure each says what
// failed and answers false.

// Makes the directories and small files that a device has from the start: an encrypted one has a
// file-system table that forces encryption.
bool make_root_files(bool encrypted);

// Copies the device's programs from the build folder.
bool copy_programs(const std::string& build);

// One line on standard error about a file operation that failed; false for the caller to answer.
bool report_failure(const std::string& path);

}  // namespace corvexd::sim
