#include "simulator/toolbox/output.h"

#include <errno.h>
#include <fcntl.h>
#include <stdio.h>
#include <stdlib.h>
#include <sys/stat.h>

namespace corvexd::sim {

bool Output::open_file(const char* path, uint64_t limit, int count) {
  path_ = path;
  limit_ = limit;
  count_ = count;
  file_.reset(open(path, O_WRONLY | O_APPEND | O_CREAT | O_CLOEXEC, 0600));
  fd_ = file_;
  struct stat status;
  if (fd_ == -1 || fstat(fd_, &status) != 0) return false;
  written_ = status.st_size;
  return true;
}

void Output::write_entry(AndroidLogFormat* format, const AndroidLogEntry& entry) {
  int bytes = android_log_printLogLine(format, fd_, &entry);
  if (bytes > 0) add(bytes);
}

void Output::write_text(const std::string& text) {
  ssize_t bytes = write(fd_, text.data(), text.size());
  if (bytes > 0) add(bytes);
}

void Output::add(uint64_t bytes) {
  written_ += bytes;
  if (limit_ > 0 && written_ >= limit_) rotate();
}

void Output::rotate() {
  int width = static_cast<int>(std::to_string(count_).size());
  std::string newer;
  std::string older = path_;
  for (int i = count_; i > 0; --i) {
    char suffix[16];
    snprintf(suffix, sizeof suffix, ".%0*d", width, i);
    older = path_ + suffix;
    snprintf(suffix, sizeof suffix, ".%0*d", width, i - 1);
    newer = i > 1 ? path_ + suffix : path_;
    if (rename(newer.c_str(), older.c_str()) != 0 && errno != ENOENT) {
      fprintf(stderr, "logcat: cannot rotate to %s: %m\n", older.c_str());
    }
  }
  if (!open_file(std::string(path_).c_str(), limit_, count_)) {
    fprintf(stderr, "logcat: cannot open %s: %m\n", path_.c_str());
    exit(1);
  }
  written_ = 0;
}

}  // namespace corvexd::sim
