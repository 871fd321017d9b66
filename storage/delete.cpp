#include "storage/delete.h"

#include <errno.h>
#include <fcntl.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

#include <utility>

#include "core/directory.h"
#include "core/fixed_string.h"
#include "core/log.h"

namespace corvexd {
namespace {

constexpr size_t kRemovalPathSize = 1024;

int remove_entry(int parent, const char* name, const char* path);

// Removes every entry of an open directory; false when one could not be removed.
bool remove_entries(const Directory& directory, const char* path) {
  bool all = true;
  bool ends_in_slash = *path != '\0' && path[strlen(path) - 1] == '/';
  while (struct dirent* entry = next_entry(directory)) {
    FixedString<kRemovalPathSize> child;
    child.append(path).append(ends_in_slash ? "" : "/").append(entry->d_name);
    bool removed = child.fits_or_log() &&
                   remove_entry(dirfd(directory.get()), entry->d_name, child.c_str()) == 0;
    if (!removed) all = false;
  }
  return all;
}

bool close_listing(Directory directory, const char* path) {
  if (closedir(directory.release()) == 0) return true;
  log_error("corvexd: can't close '%s'", path);
  return false;
}

// Removes the entry `name` of the directory `parent`; the path is for the log. The walk goes
// down by descriptors: a directory that is swapped for a link cannot redirect it.
int remove_entry(int parent, const char* name, const char* path) {
  struct stat status;
  if (fstatat(parent, name, &status, AT_SYMLINK_NOFOLLOW) != 0) {
    int error = errno;
    log_error("corvexd: can't stat '%s' %s ", path, strerror(error));
    return error == ENOENT ? 0 : -1;
  }
  if (!S_ISDIR(status.st_mode)) {
    if (unlinkat(parent, name, 0) == 0) return 0;
    log_error("corvexd: can't remove '%s'", path);
    return -1;
  }
  if (faccessat(parent, name, W_OK, 0) != 0) {
    log_error("corvexd: descend into directory '%s'? ", path);
    return 0;
  }
  Directory directory = open_directory_at(parent, name);
  if (!directory) return -1;
  bool all_removed = remove_entries(directory, path);
  if (!close_listing(std::move(directory), path)) return -1;
  if (unlinkat(parent, name, AT_REMOVEDIR) != 0) {
    log_error("corvexd: can't remove '%s'", path);
    return -1;
  }
  return all_removed ? 0 : -1;
}

}  // namespace

int deleteLog(const char* root) {
  Directory directory = open_directory(root);
  if (!directory) {
    log_error("corvexd: opendir %s  %s \n ", root, strerror(errno));
    return -1;
  }
  remove_entries(directory, root);
  return close_listing(std::move(directory), root) ? 0 : -1;
}

int remove_file(const char* path) { return remove_entry(AT_FDCWD, path, path); }

}  // namespace corvexd
