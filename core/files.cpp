#include "core/files.h"

#include <errno.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <utility>

#include "core/directory.h"
#include "core/state.h"

using android::base::unique_fd;

namespace corvexd {
namespace {

constexpr uid_t kSystemUser = 1000;
constexpr gid_t kSystemGroup = 1000;
constexpr mode_t kProgramOutputMode = 0666;
constexpr int kMaxLinks = 8;  // one leading to the next
constexpr int kSafely = O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC;

// A second name may be a hard link that somebody has made to another user's file.
bool has_one_name(const struct stat& status) {
  if (status.st_nlink <= 1) return true;
  errno = EMLINK;
  return false;
}

bool is_regular(const struct stat& status) {
  if (S_ISREG(status.st_mode)) return true;
  errno = ENXIO;
  return false;
}

// Returns the file if the daemon may write to it, else -1.
unique_fd checked_output(unique_fd file) {
  struct stat status;
  bool good = file != -1 && fstat(file, &status) == 0 && is_regular(status) && has_one_name(status);
  return good ? std::move(file) : unique_fd();
}

// A directory can be opened; reading from it gives nothing.
bool is_copyable(const struct stat& status) {
  if (S_ISFIFO(status.st_mode) || S_ISDIR(status.st_mode)) return true;
  return is_regular(status) && has_one_name(status);
}

// Reads the text of a link that the daemon's own user has made. It opens the link first, so that
// the owner and the text are those of the same link.
bool read_own_link(int folder, const char* name, char (&text)[PATH_MAX]) {
  unique_fd link(openat(folder, name, O_PATH | O_NOFOLLOW | O_CLOEXEC));
  struct stat status;
  if (link == -1 || fstat(link, &status) != 0) return false;
  if (!S_ISLNK(status.st_mode) || status.st_uid != geteuid()) return false;
  const ssize_t length = readlinkat(link, "", text, sizeof text - 1);
  if (length <= 0) return false;
  text[length] = '\0';
  return true;
}

}  // namespace

unique_fd open_output(const char* path, int flags, mode_t mode) {
  const Place place = locate(path);
  return place.folder == -1 ? unique_fd() : open_output_at(place.folder, place.name, flags, mode);
}

unique_fd open_output_at(int folder, const char* name, int flags, mode_t mode) {
  flags |= O_CREAT | kSafely;
  unique_fd file(openat(folder, name, flags | O_EXCL, mode));
  if (file != -1) {
    fchmod(file, mode);
    return file;
  }
  if (errno != EEXIST) return file;
  return checked_output(unique_fd(openat(folder, name, flags, mode)));
}

unique_fd open_program_output(const char* path) {
  const Place place = locate(path);
  return place.folder == -1 ? unique_fd() : open_program_output_at(place.folder, place.name);
}

unique_fd open_program_output_at(int folder, const char* name) {
  const int flags = O_WRONLY | O_CREAT | kSafely;
  unique_fd file = checked_output(unique_fd(openat(folder, name, flags, kProgramOutputMode)));
  // Only once it is known whose file it is.
  if (file != -1 && ftruncate(file, 0) != 0) return unique_fd();
  return file;
}

unique_fd open_source_at(int folder, const char* name, Links links) {
  unique_fd file(openat(folder, name, O_RDONLY | kSafely));
  Place place;
  char target[PATH_MAX];
  for (int i = 0; i < kMaxLinks && file == -1 && errno == ELOOP && links == Links::kOwn; ++i) {
    if (!read_own_link(folder, name, target)) break;
    place = locate_from(folder, target);
    folder = place.folder;
    name = place.name;
    file.reset(openat(folder, name, O_RDONLY | kSafely));
  }
  struct stat status;
  if (file == -1 || fstat(file, &status) != 0 || !is_copyable(status)) return unique_fd();
  return file;
}

int give_to_system(int fd) { return isInDataPartition ? fchown(fd, kSystemUser, kSystemGroup) : 0; }

int give_to_system_at(int folder, const char* name) {
  if (!isInDataPartition) return 0;
  unique_fd file(openat(folder, name, O_PATH | O_NOFOLLOW | O_CLOEXEC));
  struct stat status;
  if (file == -1 || fstat(file, &status) != 0) return -1;
  if (!is_regular(status) || !has_one_name(status)) return -1;
  return fchownat(file, "", kSystemUser, kSystemGroup, AT_EMPTY_PATH);
}

}  // namespace corvexd
