#include "core/log.h"

#include <android/log.h>
#include <errno.h>
#include <stdarg.h>
#include <stdio.h>

namespace corvexd {
namespace {

constexpr char kTag[] = "corvexd";

// The capacity of one log record. __android_log_print would cut a line at a quarter of it, and a
// command with its path is longer than that.
constexpr size_t kMaxLine = 4068 - 1 - sizeof kTag;

__attribute__((format(printf, 2, 0))) void write_line(int priority, const char* format,
                                                      va_list arguments) {
  int saved_errno = errno;
  char line[kMaxLine];
  vsnprintf(line, sizeof line, format, arguments);
  __android_log_write(priority, kTag, line);
  errno = saved_errno;
}

}  // namespace

void log_debug(const char* format, ...) {
  va_list arguments;
  va_start(arguments, format);
  write_line(ANDROID_LOG_DEBUG, format, arguments);
  va_end(arguments);
}

void log_info(const char* format, ...) {
  va_list arguments;
  va_start(arguments, format);
  write_line(ANDROID_LOG_INFO, format, arguments);
  va_end(arguments);
}

void log_error(const char* format, ...) {
  va_list arguments;
  va_start(arguments, format);
  write_line(ANDROID_LOG_ERROR, format, arguments);
  va_end(arguments);
}

}  // namespace corvexd
