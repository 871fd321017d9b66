// Directories, files and owners: what the rooms share of the file system.
#pragma once

#include <android-base/unique_fd.h>
#include <dirent.h>
#include <sys/stat.h>

#include <memory>

namespace corvexd {

struct CloseDirectory {
  void operator()(DIR* directory) const { closedir(directory); }
};
using Directory = std::unique_ptr<DIR, CloseDirectory>;

// Opens a directory for listing, close-on-exec; null with errno set on failure. The second one
// opens an entry of the directory `parent`, and never what a link names.
Directory open_directory(const char* path);
Directory open_directory_at(int parent, const char* name);

// The next entry that is neither "." nor ".."; null at the end. Valid until the next call.
struct dirent* next_entry(const Directory& directory);

// Whether the entry itself (not what a link names) is a directory.
bool is_directory(const Directory& directory, const struct dirent& entry);

// mkdir(2) and open(2), but a directory or file that they create has exactly `mode`, whatever umask
// the daemon was started with. The umask stays as it is: children inherit it. open_with_mode adds
// O_CREAT and O_CLOEXEC to `flags`; the caller owns the descriptor. -1 with errno set on failure.
int make_directory(const char* path, mode_t mode);
int open_with_mode(const char* path, int flags, mode_t mode);
int open_with_mode_at(int parent, const char* name, int flags, mode_t mode);

// Opens the directory in which the last name of `path` stands (`path` itself when it ends in "/"),
// to make files there by name even after it was renamed. Close-on-exec; -1 with errno set on
// failure.
android::base::unique_fd open_parent(const char* path);

// Give a path or an open file to the system user while the log root lies in the data partition;
// elsewhere do nothing. 0, or -1 with errno set.
int give_to_system(const char* path);
int give_to_system(int fd);

}  // namespace corvexd
