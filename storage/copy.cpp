#include "storage/copy.h"

#include <android-base/unique_fd.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include "core/files.h"
#include "core/log.h"
#include "core/path_buffer.h"
#include "core/state.h"
#include "storage/current_directory.h"

using android::base::unique_fd;

namespace corvexd {
namespace {

constexpr size_t kChunkSize = 1024;
constexpr mode_t kFileMode = 0644;
constexpr mode_t kFolderMode = 0777;

void copy_content(int from, int to) {
  char chunk[kChunkSize];
  ssize_t count;
  while ((count = TEMP_FAILURE_RETRY(read(from, chunk, sizeof chunk))) > 0) {
    // A full disk loses this chunk and perhaps not the next one.
    ssize_t ignored = write(to, chunk, count);
    (void)ignored;
  }
}

// Opens the directory `path`, made when missing; false when it cannot be made. Kept open, it takes
// the copies even after a new capture has renamed what it lies in.
bool open_or_make_folder(const char* path, unique_fd* folder) {
  constexpr int kFlags = O_RDONLY | O_DIRECTORY | O_CLOEXEC;
  folder->reset(open(path, kFlags));
  if (*folder != -1) return true;
  if (make_directory(path, kFolderMode) != 0) {
    log_error("corvexd: fail to mkdir");
    return false;
  }
  give_to_system(path);
  folder->reset(open(path, kFlags));
  return true;
}

// Follows a link, as the copy will; an entry that has vanished is no file.
bool is_file(const char* path) {
  struct stat status;
  return stat(path, &status) == 0 && !S_ISDIR(status.st_mode);
}

}  // namespace

int copy_file(const char* src, const char* dst) { return copy_file_at(AT_FDCWD, dst, src, dst); }

int copy_file_at(int folder, const char* name, const char* src, const char* dst) {
  log_error("corvexd: copy_file %s '%s'", src, dst);
  // Neither end may hold up the daemon when it is a FIFO; plain files do not notice the flag.
  unique_fd from(open(src, O_RDONLY | O_NONBLOCK | O_CLOEXEC));
  unique_fd to(open_with_mode_at(folder, name, O_WRONLY | O_APPEND | O_NONBLOCK, kFileMode));
  if (from == -1 && to == -1) {
    log_error("corvexd: open file failure. %s, %s", src, dst);
    return -1;
  }
  if (from == -1 || to == -1) {
    log_error("corvexd: open file failure. %s", from == -1 ? src : dst);
    return -1;
  }
  copy_content(from, to);
  give_to_system(to);
  log_error("corvexd: copy_file '%s'", dst);
  return 1;
}

void copy_folder(const char* src_dir, const char* sub) {
  log_error("corvexd : copy folder %s : %s", src_dir, sub);
  Directory source = open_directory(src_dir);
  if (!source) return;
  std::unique_lock<std::mutex> lock(current_directory_mutex);
  Path path = LOG_DIR.get();
  // Before the first capture there is no log directory, and nothing is to be made elsewhere.
  if (*path.c_str() == '\0') {
    log_error("corvexd: fail to mkdir");
    return;
  }
  unique_fd folder;
  if (!path.append(sub).fits_or_log() || !open_or_make_folder(path.c_str(), &folder)) return;
  lock.unlock();
  while (struct dirent* entry = next_entry(source)) {
    Path from = Path().append(src_dir).append(entry->d_name);
    Path to = Path(path).append(entry->d_name);
    if (!from.fits_or_log() || !to.fits_or_log()) continue;
    if (is_file(from.c_str())) copy_file_at(folder, entry->d_name, from.c_str(), to.c_str());
  }
}

}  // namespace corvexd
