#include "core/files.h"

#include <errno.h>
#include <fcntl.h>
#include <string.h>
#include <unistd.h>

#include "core/path_buffer.h"
#include "core/state.h"

using android::base::unique_fd;

namespace corvexd {
namespace {

constexpr uid_t kSystemUser = 1000;
constexpr gid_t kSystemGroup = 1000;

}  // namespace

Directory open_directory(const char* path) { return Directory(opendir(path)); }

Directory open_directory_at(int parent, const char* name) {
  int fd = openat(parent, name, O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC);
  if (fd == -1) return nullptr;
  Directory directory(fdopendir(fd));
  if (!directory) close(fd);
  return directory;
}

struct dirent* next_entry(const Directory& directory) {
  while (struct dirent* entry = readdir(directory.get())) {
    if (strcmp(entry->d_name, ".") != 0 && strcmp(entry->d_name, "..") != 0) return entry;
  }
  return nullptr;
}

bool is_directory(const Directory& directory, const struct dirent& entry) {
  if (entry.d_type != DT_UNKNOWN) return entry.d_type == DT_DIR;
  struct stat status;
  int result = fstatat(dirfd(directory.get()), entry.d_name, &status, AT_SYMLINK_NOFOLLOW);
  return result == 0 && S_ISDIR(status.st_mode);
}

int make_directory(const char* path, mode_t mode) {
  if (mkdir(path, mode) != 0) return -1;
  chmod(path, mode);
  return 0;
}

int open_with_mode(const char* path, int flags, mode_t mode) {
  return open_with_mode_at(AT_FDCWD, path, flags, mode);
}

int open_with_mode_at(int parent, const char* name, int flags, mode_t mode) {
  flags |= O_CREAT | O_CLOEXEC;
  int fd = openat(parent, name, flags | O_EXCL, mode);
  if (fd == -1) return errno == EEXIST ? openat(parent, name, flags, mode) : -1;
  fchmod(fd, mode);
  return fd;
}

unique_fd open_parent(const char* path) {
  LongPath parent;
  parent.append(path, strrchr(path, '/') + 1 - path);
  return unique_fd(open(parent.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
}

int give_to_system(const char* path) {
  return isInDataPartition ? chown(path, kSystemUser, kSystemGroup) : 0;
}

int give_to_system(int fd) { return isInDataPartition ? fchown(fd, kSystemUser, kSystemGroup) : 0; }

}  // namespace corvexd
