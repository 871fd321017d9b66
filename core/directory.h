// Safe access to directories that other users can write to: none of them can redirect the daemon.
#pragma once

#include <android-base/unique_fd.h>
#include <dirent.h>
#include <limits.h>
#include <sys/stat.h>

#include <memory>

namespace corvexd {

// A name in an open directory. The daemon makes, changes and deletes everything through one.
struct Place {
  android::base::unique_fd folder;  // for names in it only; -1 with errno set: not reached
  char name[NAME_MAX + 1];
};

// The place that `path` names; there need not be anything. A "/" at the end changes nothing.
// Follows no link below the directories that only the system can replace.
// The second one takes a path that does not begin with "/" from the open directory `folder`.
Place locate(const char* path);
Place locate_from(int folder, const char* path);

// Open a directory without following a link: by its path, as locate() finds it, or as an entry of
// the directory `parent`. Close-on-exec; -1 with errno set on failure.
android::base::unique_fd open_folder(const char* path);
android::base::unique_fd open_folder_at(int parent, const char* name);

// Makes a directory with exactly `mode` and opens it. The umask neither counts nor changes:
// children inherit it. -1 with errno set on failure.
android::base::unique_fd make_folder(int parent, const char* name, mode_t mode);

struct CloseDirectory {
  void operator()(DIR* directory) const { closedir(directory); }
};
using Directory = std::unique_ptr<DIR, CloseDirectory>;

// Open a directory for listing, as above; null with errno set on failure.
Directory open_directory(const char* path);
Directory open_directory_at(int parent, const char* name);

// The next entry that is neither "." nor ".."; null at the end, or when the listing fails (logged).
// Valid until the next call.
struct dirent* next_entry(const Directory& directory);

// Whether the entry itself (not what a link names) is a directory.
bool is_directory(const Directory& directory, const struct dirent& entry);

}  // namespace corvexd
