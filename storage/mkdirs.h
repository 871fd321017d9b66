// Creation of directory trees.
#pragma once

namespace corvexd {

// Creates every missing component of an absolute path (at most 511 characters) with mode 0755, each
// given to the system user while the log root lies in the data partition. Any thread. Returns 0
// when the whole path exists at the end, -1 when a directory could not be created (logged; the ones
// made before stay).
int mkdirs(const char* path);

}  // namespace corvexd
