// The copies that the whole daemon uses.
#pragma once

#include "core/files.h"

namespace corvexd {

// One end of a copy: a file in an open directory (-1 for one that could not be reached), and what
// the log calls it.
struct CopyEnd {
  int folder;
  const char* name;
  const char* path;
};

// Appends the content of `from` to `to`, which is created with mode 0644 when missing and given to
// the system user while the log root lies in the data partition. The source is a regular file, or a
// FIFO, of which what it holds is copied; `links` says which links may lead to it. The destination
// is a regular file, and no link leads to it; neither has a second name. Any thread. Returns 1 when
// both could be opened, -1 otherwise (logged). After a read or write error in the middle, the part
// that was copied stays.
int copy_file(const CopyEnd& from, Links links, const CopyEnd& to);

// The same by paths. Links to the source are followed if the daemon's own user owns them.
int copy_file(const char* src, const char* dst);

// Copies every entry of `src_dir` that is not a directory into LOG_DIR + `sub`, which is made (one
// level) when missing. Both names end in "/". Links that the daemon's own user owns are followed.
// Any thread; LOG_DIR is read once, at the start. An entry that cannot be copied is logged and
// skipped.
void copy_folder(const char* src_dir, const char* sub);

}  // namespace corvexd
