// The areas of the cache log directory that the early recorders write into.
#pragma once

namespace corvexd {

// Makes the directory `name` below the cache log directory, with mode 0775, unless it can be read
// already; a failure is logged.
void provide_area(const char* name);

}  // namespace corvexd
