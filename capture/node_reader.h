// The daemon's own readers: children that copy a log node of the kernel or the firmware into a
// capture file. One copy loop and one rotation; what differs between the readers is data.
#pragma once

#include <stdint.h>

#include "core/published_path.h"

namespace corvexd {

enum class AtEnd { kReadAgain, kStop };

struct NodeReader {
  const char* name;       // what the log calls it,
  const char* node_name;  // and what it calls its node there
  const char* source;
  const PublishedPath* output;
  int32_t* from_fd;
  int32_t* to_fd;
  AtEnd at_end;  // of the source,
  bool logs_end;
  int max_reads;               // 0: without limit
  bool erases_source;          // stops at a block that starts with NUL, and zeroes the source's
                               // first max_reads blocks when it has read
  int64_t (*rotation_size)();  // bytes; null, zero or less: no rotation
  bool is_kernel_log;          // which is an exception wherever this is asked
};

// Runs one reader in the calling child, which has no other thread and allocates nothing. Returns
// when the reading has come to its end; the child then ends with status 1, as it does from inside
// when a file cannot be opened.
void run_node_reader(const NodeReader& reader);

// The kernel log's reader and the four firmware logs'.
extern const NodeReader kKernelReader;
extern const NodeReader kQseeReader;
extern const NodeReader kTzReader;
extern const NodeReader kBootloaderReader;
extern const NodeReader kPreBootloaderReader;

// The kernel log's reader.
void cat_kernel_from_dev();

// Adds `written` bytes to the kernel log's *total and, when that has passed one more multiple of
// its size limit, shifts the series of files by one suffix, begins a fresh file and counts the
// rotation in *count. In the reader's child; the reader itself counts in 64 bits.
void rotateKernelLog(int* total, int* count, int written);

}  // namespace corvexd
