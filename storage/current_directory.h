// The current log directory as the log root shows it.
#pragma once

#include <mutex>

#include "core/path_buffer.h"

namespace corvexd {

// Normally one directory bears the mark; when there are more, jobs differ in which one they take.
enum class WhichMark { kFirst, kLast };  // in the order of the listing

// Sets *path to the directory under LOG_ROOT whose name holds "_current". Any thread. False, with
// *path untouched, when the root cannot be opened (errno says why) or holds none whose path fits
// (errno is 0).
bool find_current_directory(WhichMark which, Path* path);

// Held for the moment in which the mark passes to a new directory, and by a worker from looking up
// the current directory until it has made and opened its own below it: otherwise it could make the
// old one anew, beside the one that had just lost the mark.
extern std::mutex current_directory_mutex;

}  // namespace corvexd
