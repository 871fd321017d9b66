#include "storage/copy.h"

#include <android-base/unique_fd.h>
#include <errno.h>
#include <fcntl.h>
#include <stdint.h>
#include <sys/stat.h>
#include <unistd.h>

#include "core/directory.h"
#include "core/files.h"
#include "core/fixed_string.h"
#include "core/log.h"
#include "core/state.h"
#include "storage/current_directory.h"

using android::base::unique_fd;

namespace corvexd {
namespace {

constexpr size_t kChunkSize = 1024;
constexpr mode_t kFileMode = 0644;
constexpr mode_t kFolderMode = 0777;

void copy_content(int from, int to) {
  // Of a FIFO, read only as much as it can hold: its writer may fill it up again without end.
  const int capacity = fcntl(from, F_GETPIPE_SZ);
  int64_t left = capacity == -1 ? INT64_MAX : capacity;
  char chunk[kChunkSize];
  for (ssize_t count; left > 0; left -= count) {
    count = TEMP_FAILURE_RETRY(read(from, chunk, sizeof chunk));
    if (count <= 0) return;
    // A full disk loses this chunk and perhaps not the next one.
    ssize_t ignored = write(to, chunk, count);
    (void)ignored;
  }
}

// Opens the directory `path`, and makes it when it is missing; -1 on failure. Copies go through the
// open directory, so they arrive even after a new capture has renamed the directory above it.
unique_fd open_or_make_folder(const char* path) {
  const Place place = locate(path);
  unique_fd folder;
  if (place.folder != -1) folder = open_folder_at(place.folder, place.name);
  if (place.folder == -1 || folder != -1) return folder;
  folder = make_folder(place.folder, place.name, kFolderMode);
  if (folder != -1) give_to_system(folder);
  return folder;
}

// Follows a link; an entry that has vanished is no file.
bool is_file(int folder, const char* name) {
  struct stat status;
  return fstatat(folder, name, &status, 0) == 0 && !S_ISDIR(status.st_mode);
}

}  // namespace

int copy_file(const CopyEnd& from, Links links, const CopyEnd& to) {
  log_error("corvexd: copy_file %s '%s'", from.path, to.path);
  const unique_fd source = open_source_at(from.folder, from.name, links);
  const unique_fd target = open_output_at(to.folder, to.name, O_WRONLY | O_APPEND, kFileMode);
  if (source == -1 && target == -1) {
    log_error("corvexd: open file failure. %s, %s", from.path, to.path);
    return -1;
  }
  if (source == -1 || target == -1) {
    log_error("corvexd: open file failure. %s", source == -1 ? from.path : to.path);
    return -1;
  }
  copy_content(source, target);
  give_to_system(target);
  log_error("corvexd: copy_file '%s'", to.path);
  return 1;
}

int copy_file(const char* src, const char* dst) {
  const Place from = locate(src);
  const Place to = locate(dst);
  return copy_file({from.folder, from.name, src}, Links::kOwn, {to.folder, to.name, dst});
}

void copy_folder(const char* src_dir, const char* sub) {
  log_error("corvexd : copy folder %s : %s", src_dir, sub);
  Directory source = open_directory(src_dir);
  if (!source) return;
  std::unique_lock<std::mutex> lock(current_directory_mutex);
  Path path = LOG_DIR.get();
  // Before the first capture there is no log directory, and nothing may be made elsewhere.
  const bool is_known = !path.empty();
  if (!path.append(sub).fits_or_log()) return;
  const unique_fd folder = is_known ? open_or_make_folder(path.c_str()) : unique_fd();
  lock.unlock();
  if (folder == -1) {
    log_error("corvexd: fail to mkdir");
    return;
  }
  const int from_folder = dirfd(source.get());
  while (struct dirent* entry = next_entry(source)) {
    const Path from = Path().append(src_dir).append(entry->d_name);
    const Path to = Path(path).append(entry->d_name);
    if (!from.fits_or_log() || !to.fits_or_log()) continue;
    if (!is_file(from_folder, entry->d_name)) continue;
    copy_file({from_folder, entry->d_name, from.c_str()}, Links::kOwn,
              {folder, entry->d_name, to.c_str()});
  }
}

}  // namespace corvexd
