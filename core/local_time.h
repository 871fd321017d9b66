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

// The C library guards its time zone with a lock, and a fork copies that lock in the state it has.
// A thread that forks a child holds this mutex meanwhile, so that no other thread is inside the C
// library's lock. All uses of the local time go through the two functions above, which take it.
extern std::mutex local_time_mutex;

}  // namespace corvexd
