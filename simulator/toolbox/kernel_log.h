// The machine's kernel log, as lines of the device's log.
#pragma once

#include <android-base/unique_fd.h>
#include <log/log_read.h>

namespace corvexd::sim {

class KernelLog {
 public:
  // Opens it at its oldest record. False when it may not be read (errno says why).
  bool open();

  // Holds -1 while it is not open.
  int fd() const { return fd_; }

  // Reads the next record into `line`; false when none is there yet.
  bool read_line(struct log_msg* line);

 private:
  android::base::unique_fd fd_;
};

}  // namespace corvexd::sim
