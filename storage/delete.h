// Deletion of logs.
#pragma once

namespace corvexd {

// Removes everything under a log root, but not the root itself. Main thread. Returns 0 when the
// root could be listed, whatever became of its entries; -1 (logged) otherwise.
int deleteLog(const char* root);

// Removes a file or a directory tree (paths of at most 1023 characters); a symbolic link is removed
// itself. Any thread. Returns 0 when it is gone, or is a directory that the daemon may not write
// to, which is left in place (logged); -1 (logged) when something of it could not be removed.
int remove_file(const char* path);

}  // namespace corvexd
