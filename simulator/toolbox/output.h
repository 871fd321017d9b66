// Where logcat writes: standard output, or a file that is rotated.
#pragma once

#include <android-base/unique_fd.h>
#include <log/logprint.h>
#include <stdint.h>
#include <unistd.h>

#include <string>

namespace corvexd::sim {

class Output {
 public:
  // Goes on at the end of the file if there is one. From `limit` bytes (0: no limit) it becomes
  // FILE.1, and so on up to FILE.`count`, each number as wide as the last. False on failure (errno
  // says why).
  bool open_file(const char* path, uint64_t limit, int count);

  void write_entry(AndroidLogFormat* format, const AndroidLogEntry& entry);
  void write_text(const std::string& text);

 private:
  void add(uint64_t bytes);
  void rotate();

  int fd_ = STDOUT_FILENO;
  android::base::unique_fd file_;
  std::string path_;
  uint64_t limit_ = 0;
  uint64_t written_ = 0;
  int count_ = 0;
};

}  // namespace corvexd::sim
