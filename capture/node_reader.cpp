#include "capture/node_reader.h"

#include <android-base/unique_fd.h>
#include <errno.h>
#include <fcntl.h>
#include <string.h>
#include <unistd.h>

#include "capture/rotation.h"
#include "core/directory.h"
#include "core/files.h"
#include "core/log.h"

using android::base::unique_fd;

namespace corvexd {
namespace {

constexpr size_t kBlockSize = 1024;
constexpr mode_t kOutputMode = 0600;

struct Counters {
  int64_t total = 0;
  int count = 0;
};

[[noreturn]] void fail_to_open(const NodeReader& reader, const char* path) {
  log_error("corvexd: Open %s Error%s%s\n", path, reader.is_kernel_log ? "：" : " ",
            strerror(errno));
  _exit(1);
}

void begin_file(const NodeReader& reader, const char* path) {
  *reader.to_fd = open_output(path, O_WRONLY, kOutputMode).release();
  if (*reader.to_fd == -1) fail_to_open(reader, path);
}

void open_both(const NodeReader& reader, const char* output) {
  if (access(reader.source, R_OK) != 0) {
    log_error("corvexd: %s log node can not be read: %s \n", reader.node_name, strerror(errno));
    if (reader.is_kernel_log) _exit(1);
  }
  int access_mode = reader.erases_source ? O_RDWR : O_RDONLY;
  *reader.from_fd = open(reader.source, access_mode | O_CLOEXEC);
  if (*reader.from_fd == -1) fail_to_open(reader, reader.source);
  begin_file(reader, output);
  give_to_system(*reader.to_fd);
}

void log_lost_output(const NodeReader& reader, const char* path, int error) {
  if (reader.is_kernel_log) {
    log_error("corvexd: %s log node can not access: %s, errno: %d, %s\n", reader.node_name, path,
              error, strerror(error));
  } else {
    log_error("corvexd: %s log node can not access: %s \n", reader.node_name, path);
  }
}

// If the output file has been removed, the bytes of the last write are lost with it.
void replace_lost_output(const NodeReader& reader, const char* path) {
  if (access(path, reader.is_kernel_log ? F_OK : R_OK) == 0) return;
  log_lost_output(reader, path, errno);
  close(*reader.to_fd);
  begin_file(reader, path);
  if (reader.is_kernel_log && lseek(*reader.to_fd, 0, SEEK_END) == -1) {
    log_error("corvexd: lseek failed! %s\n", strerror(errno));
    _exit(1);
  }
}

void log_failed_write(const NodeReader& reader, int error) {
  log_error("corvexd: bytes_write is -1, write %s log fail! Error: %s \n", reader.name,
            strerror(error));
}

void rotate_when_due(const NodeReader& reader, const char* path, Counters* counters, int written) {
  counters->total += written;
  if (reader.rotation_size == nullptr) return;
  int64_t size = reader.rotation_size();
  if (size <= 0 || counters->total / size <= counters->count) return;
  ++counters->count;
  close(*reader.to_fd);
  const Place place = locate(path);
  shift_series(place, counters->count, /*owned=*/reader.is_kernel_log);
  unique_fd output;
  if (place.folder != -1) output = open_output_at(place.folder, place.name, O_WRONLY, kOutputMode);
  *reader.to_fd = output.release();
  if (*reader.to_fd == -1) {
    log_error("corvexd: Open %s Error %s\n", path, strerror(errno));
    _exit(1);
  }
  log_debug("total %s bytes write %lld,offset %d", reader.name,
            static_cast<long long>(counters->total), counters->count);
}

void copy_block(const NodeReader& reader, const char* path, const char* block, size_t size,
                Counters* counters) {
  while (size > 0) {
    ssize_t written = write(*reader.to_fd, block, size);
    int error = errno;
    replace_lost_output(reader, path);
    if (written == -1) {
      log_failed_write(reader, error);
      return;
    }
    if (written == 0) continue;
    block += written;
    size -= written;
    rotate_when_due(reader, path, counters, static_cast<int>(written));
  }
}

void copy_source(const NodeReader& reader, const char* path) {
  Counters counters;
  // Not NUL: when the first read fails, the log must say that, and not that the area is empty.
  char block[kBlockSize] = {'\xff'};
  // An int would overflow: a source that stays empty is read again and again.
  for (int64_t reads = 0; reader.max_reads == 0 || reads < reader.max_reads; ++reads) {
    ssize_t size = read(*reader.from_fd, block, sizeof block);
    if (reader.erases_source && block[0] == '\0') {
      log_error("reserve1 is null\n");
      return;
    }
    if (size == 0) {
      if (reader.logs_end) log_error("corvexd: eof, %s log process continue \n", reader.name);
      if (reader.at_end == AtEnd::kStop) return;
      continue;
    }
    if (size == -1) {
      log_error("corvexd: bytes_read is -1, read %s log fail! Error: %s \n", reader.name,
                strerror(errno));
      return;
    }
    copy_block(reader, path, block, size, &counters);
  }
}

// Each block goes to its own place: nothing beyond the area is erased, whatever fails.
void erase_source(const NodeReader& reader) {
  const char zeros[kBlockSize] = {};
  for (int i = 0; i < reader.max_reads; ++i) {
    const auto offset = static_cast<off_t>(i * kBlockSize);
    if (pwrite(*reader.from_fd, zeros, sizeof zeros, offset) == -1) {
      log_failed_write(reader, errno);
      return;
    }
  }
}

}  // namespace

void run_node_reader(const NodeReader& reader) {
  const Path output = reader.output->get();
  open_both(reader, output.c_str());
  copy_source(reader, output.c_str());
  if (reader.erases_source) erase_source(reader);
}

void cat_kernel_from_dev() { run_node_reader(kKernelReader); }

void rotateKernelLog(int* total, int* count, int written) {
  Counters counters = {*total, *count};
  rotate_when_due(kKernelReader, kKernelReader.output->get().c_str(), &counters, written);
  *total = static_cast<int>(counters.total);
  *count = counters.count;
}

}  // namespace corvexd
