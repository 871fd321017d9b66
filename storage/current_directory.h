// The current log directory as the log root shows it.
#pragma once

#include <mutex>

#include "core/fixed_string.h"

namespace corvexd {

// The end of the current log directory's name, until the next one is made.
constexpr char kCurrentMark[] = "_current";

// Normally one directory bears the mark; when there are more, jobs differ in which one they take,
// in the order of the listing. A name that will stand in a shell line must have no meaning to the
// shell: other users can make directories, too.
enum class WhichMark { kFirst, kFirstPlain, kLast };

// Sets *path to the directory under LOG_ROOT whose name holds the mark. Any thread. False, with
// *path untouched, when the root cannot be opened (errno says why) or holds none to be taken
// (errno is 0). A marked directory whose path does not fit is logged and passed over.
bool find_current_directory(WhichMark which, Path* path);

// Held while the mark passes to a new directory, and by a worker from looking up the current
// directory until it has made and opened its own below it. Otherwise the worker could make the old
// directory again, after it has been renamed.
extern std::mutex current_directory_mutex;

}  // namespace corvexd
