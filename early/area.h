// The areas of the cache log directory that the early recorders write into.
#pragma once

#include "core/fixed_string.h"

namespace corvexd {

// The path of a file or directory below the cache log directory. Any thread.
Path cache_file(const char* name);

// Makes the directory `name` below the cache log directory, with mode 0775, unless it can be read
// already; a failure is logged.
void provide_area(const char* name);

}  // namespace corvexd
