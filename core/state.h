// Where logs are written: the process-wide location state that every module reads.
#pragma once

#include <stdint.h>

#include <atomic>

#include "core/fixed_string.h"
#include "core/published_path.h"

namespace corvexd {

// The log root, the directory under which log directories are made, and the prefix of every log
// directory's path below it. Both point to constant strings and name the same root.
extern std::atomic<const char*> LOG_ROOT;
extern std::atomic<const char*> LOG_PATH;

// 1 while the log root lies in the data partition; then everything the daemon creates under it is
// given to the system user.
extern std::atomic<uint8_t> isInDataPartition;

// The cache log directory, with its trailing "/".
extern std::atomic<const char*> cache_path;

// The path of a file or directory below it. Any thread.
Path cache_file(const char* name);

// The current log directory, without a trailing "/"; empty until the first one is made.
extern PublishedPath LOG_DIR;

// Where the main thread composes paths under the cache log directory.
extern Path cache_file_path;

// Chooses the log root anew from its two properties. Main thread. Running recorders keep writing to
// the directory in which they were started.
void checkLogPath();

}  // namespace corvexd
