// The command lines of the logcat recorders.
#pragma once

#include <stddef.h>

namespace corvexd {

// What one logcat recorder records and how its files rotate. The texts live as long as the daemon;
// settings are read when the vector is built.
struct LogcatJob {
  const char* size;        // of a file, KiB
  const char* count;       // of rotated files kept
  const char* buffers[3];  // null for none
  bool formatted;          // with the format, filter and mask settings
};

// The argument vector of one recorder, ended by a null entry. Holds no text of its own.
struct LogcatArgv {
  static constexpr size_t kCapacity = 20;
  const char* arguments[kCapacity] = {};
};

LogcatArgv logcat_argv(const LogcatJob& job, const char* file);

// Replaces the calling child by the job's logcat, writing to `file`; status 1 when that fails.
[[noreturn]] void exec_logcat(const LogcatJob& job, const char* file);

}  // namespace corvexd
