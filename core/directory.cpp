#include "core/directory.h"

#include <errno.h>
#include <fcntl.h>
#include <string.h>
#include <unistd.h>

#include <utility>

#include "core/log.h"

using android::base::unique_fd;

namespace corvexd {
namespace {

// Only the system can replace these. They may be links: on some devices the cache is one. A path
// begins with the first that matches; no link is followed below it.
constexpr const char* kSystemDirectories[] = {"/data/", "/cache/", "/kv2/", "/storage/emulated/0/",
                                              "/"};

constexpr int kStepFlags = O_PATH | O_DIRECTORY | O_CLOEXEC;

// The directory that *path begins in; *path is moved past it.
unique_fd open_start(const char** path) {
  for (const char* directory : kSystemDirectories) {
    const size_t length = strlen(directory);
    if (strncmp(*path, directory, length) != 0) continue;
    *path += length;
    return unique_fd(open(directory, kStepFlags));
  }
  return unique_fd(open(".", kStepFlags));
}

Directory list_folder(unique_fd folder) {
  if (folder == -1) return nullptr;
  const int listed = folder.release();
  Directory directory(fdopendir(listed));
  if (!directory) close(listed);
  return directory;
}

// The place that the rest of a path names below `start`.
Place walk(unique_fd start, const char* path) {
  Place place = {std::move(start), "."};
  bool started = false;
  for (path += strspn(path, "/"); *path != '\0' && place.folder != -1; path += strspn(path, "/")) {
    if (started) {
      place.folder.reset(openat(place.folder, place.name, kStepFlags | O_NOFOLLOW));
    }
    const size_t length = strcspn(path, "/");
    if (length > NAME_MAX) {
      place.folder.reset();
      errno = ENAMETOOLONG;
      return place;
    }
    memcpy(place.name, path, length);
    place.name[length] = '\0';
    path += length;
    started = true;
  }
  return place;
}

}  // namespace

Place locate(const char* path) {
  unique_fd start = open_start(&path);
  return walk(std::move(start), path);
}

Place locate_from(int folder, const char* path) {
  if (*path == '/') return locate(path);
  return walk(unique_fd(openat(folder, ".", kStepFlags)), path);
}

unique_fd open_folder(const char* path) {
  const Place place = locate(path);
  return place.folder == -1 ? unique_fd() : open_folder_at(place.folder, place.name);
}

unique_fd open_folder_at(int parent, const char* name) {
  return unique_fd(openat(parent, name, O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
}

unique_fd make_folder(int parent, const char* name, mode_t mode) {
  if (mkdirat(parent, name, mode) != 0) return unique_fd();
  unique_fd folder = open_folder_at(parent, name);
  if (folder != -1) fchmod(folder, mode);
  return folder;
}

Directory open_directory(const char* path) { return list_folder(open_folder(path)); }

Directory open_directory_at(int parent, const char* name) {
  return list_folder(open_folder_at(parent, name));
}

struct dirent* next_entry(const Directory& directory) {
  errno = 0;
  while (struct dirent* entry = readdir(directory.get())) {
    if (strcmp(entry->d_name, ".") != 0 && strcmp(entry->d_name, "..") != 0) return entry;
  }
  if (errno != 0) log_error("corvexd: Error: %s\n", strerror(errno));
  return nullptr;
}

bool is_directory(const Directory& directory, const struct dirent& entry) {
  if (entry.d_type != DT_UNKNOWN) return entry.d_type == DT_DIR;
  struct stat status;
  int result = fstatat(dirfd(directory.get()), entry.d_name, &status, AT_SYMLINK_NOFOLLOW);
  return result == 0 && S_ISDIR(status.st_mode);
}

}  // namespace corvexd
