#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include "core/directory.h"
#include "early/initial_log.h"

namespace corvexd {
namespace {

// Walks by descriptor, so no path below the directory can be too long. Unsigned sums wrap where
// signed ones must not.
uint32_t size_below(const Directory& directory) {
  uint32_t total = 0;
  while (struct dirent* entry = next_entry(directory)) {
    if (is_directory(directory, *entry)) {
      const Directory below = open_directory_at(dirfd(directory.get()), entry->d_name);
      total += below ? size_below(below) : static_cast<uint32_t>(-1);
      continue;
    }
    struct stat status;
    if (fstatat(dirfd(directory.get()), entry->d_name, &status, AT_SYMLINK_NOFOLLOW) == 0) {
      total += static_cast<uint32_t>(status.st_size);
    }
  }
  return total;
}

}  // namespace

int32_t getDirSize(const char* path) {
  Directory directory = open_directory(path);
  return directory ? static_cast<int32_t>(size_below(directory)) : -1;
}

}  // namespace corvexd
