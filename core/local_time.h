// Local time for the names of directories and files.
#pragma once

#include <time.h>

#include <mutex>

#include "core/fixed_string.h"

namespace corvexd {

using Timestamp = FixedString<100>;

// The current local time, and the same as "%Y-%m-%d-%H-%M-%S". Any thread; in a child started by
// start_child too.
struct tm local_time();
Timestamp local_timestamp();

// The C library keeps its time zone under a lock that a fork copies as it stands. Whoever forks a
// child that reads the local time holds this mutex meanwhile, so that no other thread is inside.
// Every use of the local time goes through these two, which take it.
extern std::mutex local_time_mutex;

}  // namespace corvexd
