#include "storage/log_directory.h"

#include <android-base/unique_fd.h>
#include <cutils/properties.h>
#include <errno.h>
#include <fcntl.h>
#include <stdio.h>
#include <string.h>
#include <unistd.h>

#include "core/directory.h"
#include "core/exit.h"
#include "core/files.h"
#include "core/fixed_string.h"
#include "core/local_time.h"
#include "core/log.h"
#include "core/state.h"
#include "storage/copy.h"
#include "storage/current_directory.h"
#include "storage/mkdirs.h"

using android::base::unique_fd;

namespace corvexd {
namespace {

constexpr char kDirectoryMark[] = "KVBR_";
constexpr char kVersionFile[] = "versionNumber";
constexpr mode_t kVersionFileMode = 0600;

void remove_mark(const Directory& root, const char* name) {
  const Path old_path = Path().append(LOG_ROOT).append("/").append(name);
  if (!old_path.fits_or_log()) return;
  const Path new_name = Path().append(name, strlen(name) - strlen(kCurrentMark));
  const Path new_path = Path().append(LOG_ROOT).append("/").append(new_name.c_str());
  log_info("corvexd: NEW IS %s \n", new_path.c_str());
  log_info("corvexd: OLD IS %s \n", old_path.c_str());
  if (renameat(dirfd(root.get()), name, dirfd(root.get()), new_name.c_str()) == 0) {
    log_info("corvexd: RENAME SUCCESSFULL!");
  } else {
    log_error("corvexd: Rename failed! Error: %s\n", strerror(errno));
  }
  log_info("corvexd: NEW PATH IS %s\n", new_path.c_str());
}

int count_log_directories(const Directory& root) {
  int count = 0;
  while (struct dirent* entry = next_entry(root)) {
    if (strstr(entry->d_name, kDirectoryMark) != nullptr && is_directory(root, *entry)) ++count;
  }
  return count;
}

// The path of the log directory to be made now.
Path next_log_directory() {
  Timestamp time = local_timestamp();
  Path path = Path().append(LOG_PATH);
  Directory root = open_directory(LOG_ROOT);
  if (root) {
    int number = count_log_directories(root) + 1;
    log_error("corvexd: dir count is %d \n", number);
    path.append_format("%d--", number);
  } else {
    path.append("1--");
    log_error("corvexd: pdir is null! \n");
  }
  return path.append(time.c_str()).append(kCurrentMark);
}

// Ends the daemon, and leaves no directory behind: started again on storage that is full, it would
// fill that with directories.
[[noreturn]] void give_up(const Path& directory) {
  const Place place = locate(directory.c_str());
  const unique_fd folder = open_folder_at(place.folder, place.name);
  unlinkat(folder, kVersionFile, 0);
  unlinkat(place.folder, place.name, AT_REMOVEDIR);
  exit_daemon();
}

// Opens the version file of the log directory and writes the build's name, a property value with
// the rest of its buffer. The file stays open until the markers are copied.
unique_fd write_version(const Path& directory) {
  Path path = Path(directory).append("/").append(kVersionFile);
  log_info("corvexd: vn is %s \n", path.c_str());
  char version[PROPERTY_VALUE_MAX] = {};
  property_get("ro.build.ota.versionname", version, "");
  unique_fd fd = open_output(path.c_str(), O_WRONLY, kVersionFileMode);
  if (fd == -1) {
    log_error("corvexd: Open %s Error：%s\n", path.c_str(), strerror(errno));
    give_up(directory);
  }
  give_to_system(fd);
  for (size_t done = 0; done < sizeof version;) {
    ssize_t count = TEMP_FAILURE_RETRY(write(fd, version + done, sizeof version - done));
    if (count == 0) break;
    if (count == -1) {
      log_error("corvexd: bytes_write is -1, versionNumber is existing now! Error: %s \n",
                strerror(errno));
      give_up(directory);
    }
    done += count;
  }
  return fd;
}

void copy_marker(const Path& source, const Path& destination) {
  if (access(source.c_str(), R_OK) == 0) copy_file(source.c_str(), destination.c_str());
}

void remove_marks() {
  Directory root = open_directory(LOG_ROOT);
  if (!root) {
    log_error("corvexd: Error: %s\n", strerror(errno));
    return;
  }
  while (struct dirent* entry = next_entry(root)) {
    if (!is_directory(root, *entry)) continue;
    log_info("corvexd: DIR NAME : %s \n", entry->d_name);
    if (strstr(entry->d_name, kCurrentMark) != nullptr) remove_mark(root, entry->d_name);
  }
}

int make_log_directory() {
  const Path after_source = cache_file_path = cache_file("fileAfter911");
  const Path before_source = cache_file_path = cache_file("fileBefore911");

  const Path directory = next_log_directory();
  LOG_DIR.set(directory);
  log_info("corvexd: log dir is %s \n", directory.c_str());
  mkdirs(directory.c_str());

  unique_fd version_file = write_version(directory);
  copy_marker(after_source, Path(directory).append("/fileAfter911"));
  copy_marker(before_source, Path(directory).append("/fileBefore911"));
  version_file.reset();
  return mkdirs(Path(directory).append("/boot_log").c_str());
}

}  // namespace

void renameLastDirectoryName() {
  std::lock_guard<std::mutex> lock(current_directory_mutex);
  remove_marks();
}

int createLogDirectory() {
  std::lock_guard<std::mutex> lock(current_directory_mutex);
  return make_log_directory();
}

void begin_log_directory() {
  std::lock_guard<std::mutex> lock(current_directory_mutex);
  remove_marks();
  make_log_directory();
}

Path provide_current_directory() {
  std::lock_guard<std::mutex> lock(current_directory_mutex);
  Path path;
  if (find_current_directory(WhichMark::kFirst, &path)) return path;
  if (errno != 0 && errno != ENOENT) log_error("corvexd: Error: %s\n", strerror(errno));
  make_log_directory();
  return LOG_DIR.get();
}

}  // namespace corvexd
