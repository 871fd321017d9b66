// Where each artefact goes in the current log directory.
#pragma once

namespace corvexd {

// Copies the entry `name` of the system directory `dir` (a file, or the files of a directory) into
// its place in the current log directory; the source stays. Observer thread. Returns 0 when the
// copy was attempted, -1 when there is no log root, no current log directory or no `dir`.
int movefile(const char* dir, const char* name);

}  // namespace corvexd
