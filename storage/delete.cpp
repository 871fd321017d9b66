#include "storage/delete.h"

#include <errno.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

#include <utility>

#include "core/files.h"
#include "core/log.h"
#include "core/path_buffer.h"

namespace corvexd {
namespace {

constexpr size_t kRemovalPathSize = 1024;

// Removes every entry of an open directory; false when one could not be removed.
bool remove_entries(const Directory& directory, const char* path) {
  bool all = true;
  bool ends_in_slash = *path != '\0' && path[strlen(path) - 1] == '/';
  while (struct dirent* entry = next_entry(directory)) {
    PathBuffer<kRemovalPathSize> child;
    child.append(path).append(ends_in_slash ? "" : "/").append(entry->d_name);
    if (!child.fits_or_log() || remove_file(child.c_str()) != 0) all = false;
  }
  return all;
}

bool close_listing(Directory directory, const char* path) {
  if (closedir(directory.release()) == 0) return true;
  log_error("corvexd: can't close '%s'", path);
  return false;
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

int remove_file(const char* path) {
  struct stat status;
  if (lstat(path, &status) != 0) {
    int error = errno;
    log_error("corvexd: can't stat '%s' %s ", path, strerror(error));
    return error == ENOENT ? 0 : -1;
  }
  if (!S_ISDIR(status.st_mode)) {
    if (unlink(path) == 0) return 0;
    log_error("corvexd: can't remove '%s'", path);
    return -1;
  }
  if (access(path, W_OK) != 0) {
    log_error("corvexd: descend into directory '%s'? ", path);
    return 0;
  }
  Directory directory = open_directory(path);
  if (!directory) return -1;
  bool all_removed = remove_entries(directory, path);
  if (!close_listing(std::move(directory), path)) return -1;
  if (rmdir(path) != 0) {
    log_error("corvexd: can't remove '%s'", path);
    return -1;
  }
  return all_removed ? 0 : -1;
}

}  // namespace corvexd
