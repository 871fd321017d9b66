// The current log directory as the log root shows it.
#pragma once

#include <mutex>

#include "core/fixed_string.h"

namespace corvexd {

// What the name of the current log directory ends with until the next one is made.
constexpr char kCurrentMark[] = "_current";

// Normally one directory bears the mark; when there are more, jobs differ in which one they take,
// in the order of the listing. A name that is to stand in a shell line must mean itself there:
// others than the daemon can make directories, too.
enum class WhichMark { kFirst, kFirstPlain, kLast };

// Sets *path to the directory under LOG_ROOT whose name holds the mark. Any thread. False, with
// *path untouched, when the root cannot be opened (errno says why) or holds none to be taken
// (errno is 0). A marked directory whose path does not fit is logged and passed over.
bool find_current_directory(WhichMark which, Path* path);

// Held for the moment in which the mark passes to a new directory, and by a worker from looking up
// the current directory until it has made and opened its own below it: otherwise it could make the
// old one anew, beside the one that had just lost the mark.
extern std::mutex current_directory_mutex;

}  // namespace corvexd
