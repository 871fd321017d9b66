// What logcat is asked to do.
#pragma once

#include <log/logprint.h>
#include <stdint.h>

#include <memory>

namespace corvexd::sim {

struct LogcatOptions {
  uint32_t buffers = 0;  // one bit for each log id, the kernel's included
  std::unique_ptr<AndroidLogFormat, void (*)(AndroidLogFormat*)> format{android_log_format_new(),
                                                                        android_log_format_free};
  const char* file = nullptr;
  uint64_t rotate_kib = 0;
  int rotate_count = 4;
  bool clear = false;
  bool dump = false;  // and end
};

// Reads the command line. On failure says what is wrong and answers false.
bool parse_logcat_options(int argc, char** argv, LogcatOptions* options);

}  // namespace corvexd::sim
