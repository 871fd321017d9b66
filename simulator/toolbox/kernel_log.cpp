#include "simulator/toolbox/kernel_log.h"

#include <android/log.h>
#include <errno.h>
#include <fcntl.h>
#include <log/log_id.h>
#include <stdio.h>
#include <string.h>
#include <time.h>
#include <unistd.h>

namespace corvexd::sim {
namespace {

constexpr char kTag[] = "kernel";
constexpr uint64_t kSecond = 1000000000;

// By the kernel's level, 0 (emergency) to 7 (debug).
constexpr uint8_t kPriorities[] = {ANDROID_LOG_FATAL, ANDROID_LOG_FATAL, ANDROID_LOG_FATAL,
                                   ANDROID_LOG_ERROR, ANDROID_LOG_WARN,  ANDROID_LOG_INFO,
                                   ANDROID_LOG_INFO,  ANDROID_LOG_DEBUG};

uint64_t clock_now(clockid_t clock) {
  struct timespec now;
  clock_gettime(clock, &now);
  return now.tv_sec * kSecond + now.tv_nsec;
}

// A record is "level,number,microseconds since boot,flags;text", then a line end and, perhaps,
// lines that describe its device.
bool parse(char* record, struct log_msg* line) {
  unsigned level;
  unsigned long long microseconds;
  char* text = strchr(record, ';');
  if (text == nullptr || sscanf(record, "%u,%*u,%llu", &level, &microseconds) != 2) return false;
  ++text;
  text[strcspn(text, "\n")] = '\0';

  uint64_t time =
      clock_now(CLOCK_REALTIME) - clock_now(CLOCK_MONOTONIC) + microseconds * (kSecond / 1000000);
  line->entry = {};
  line->entry.hdr_size = sizeof line->entry;
  line->entry.sec = static_cast<uint32_t>(time / kSecond);
  line->entry.nsec = static_cast<uint32_t>(time % kSecond);
  line->entry.lid = LOG_ID_KERNEL;
  int length = snprintf(line->entry.msg, LOGGER_ENTRY_MAX_PAYLOAD, "%c%s%c%s",
                        kPriorities[level & 7], kTag, '\0', text);
  if (length >= LOGGER_ENTRY_MAX_PAYLOAD) length = LOGGER_ENTRY_MAX_PAYLOAD - 1;
  line->entry.len = static_cast<uint16_t>(length + 1);
  return true;
}

}  // namespace

bool KernelLog::open() {
  fd_.reset(::open("/dev/kmsg", O_RDONLY | O_NONBLOCK | O_CLOEXEC));
  return fd_ != -1;
}

bool KernelLog::read_line(struct log_msg* line) {
  char record[8192 + 1];
  for (;;) {
    ssize_t count = read(fd_, record, sizeof record - 1);
    // The kernel's ring came round over records not read yet: the next read goes on behind them.
    if (count < 0 && (errno == EPIPE || errno == EINTR)) continue;
    if (count <= 0) return false;
    record[count] = '\0';
    if (parse(record, line)) return true;
  }
}

}  // namespace corvexd::sim
