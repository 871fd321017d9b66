#include "collect/artefact_mover.h"

#include <android-base/unique_fd.h>
#include <errno.h>
#include <fcntl.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

#include "core/directory.h"
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

constexpr mode_t kMarkerMode = 0644;

enum class Below { kNothing, kTimestamp, kName };  // a level below the category

struct Destination {
  const char* in_dir;   // what `dir` contains, or
  const char* in_name;  // what `name` contains
  const char* category;
  Below below;
  bool replaces;  // an earlier copy of the same name
};

// The first that matches counts.
constexpr Destination kDestinations[] = {
    {"tombstones", nullptr, "tombstones", Below::kTimestamp, false},
    {"/data/vendor/media", nullptr, "media", Below::kTimestamp, false},
    {"dropbox", nullptr, "dropbox", Below::kNothing, false},
    {"display", nullptr, "rawdata", Below::kName, false},
    {"Screenshots", nullptr, "Screenshots", Below::kNothing, true},
    {"coredump", nullptr, "coredump", Below::kNothing, true},
    {nullptr, "BATTERY", "BatteryHistory", Below::kNothing, false},
};

constexpr Destination kElsewhere = {nullptr, nullptr, nullptr, Below::kNothing, false};

const Destination& find_destination(const char* dir, const char* name) {
  for (const Destination& row : kDestinations) {
    if (row.in_dir != nullptr && strstr(dir, row.in_dir) != nullptr) return row;
    if (row.in_name != nullptr && strstr(name, row.in_name) != nullptr) return row;
  }
  return kElsewhere;
}

LongPath destination_path(const Destination& row, const Path& current, const char* name,
                          const Timestamp& time) {
  LongPath path;
  path.append(current.c_str()).append("/");
  if (row.category != nullptr) path.append(row.category).append("/");
  if (row.below == Below::kTimestamp) path.append(time.c_str()).append("/");
  if (row.below == Below::kName) path.append(name).append("/");
  return path;
}

// Keeps media indexers out of the log root.
void provide_media_marker() {
  const Path path = Path().append(LOG_ROOT).append("/.nomedia");
  const Place place = locate(path.c_str());
  if (place.folder == -1) return;
  const int flags = O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC;
  const unique_fd existing(openat(place.folder, place.name, flags));
  if (existing != -1) return;
  const unique_fd marker = open_output_at(place.folder, place.name, O_WRONLY, kMarkerMode);
  if (marker != -1) give_to_system(marker);
}

// `folder` is the destination directory, open; a path that does not fit is cut.
void copy_to(int folder, const LongPath& destination, const CopyEnd& from) {
  LongPath to(destination);
  to.append(from.name);
  copy_file(from, Links::kNone, {folder, strrchr(to.c_str(), '/') + 1, to.c_str()});
}

// `source` is the directory `dir`.
void copy_artefact(int source, const char* dir, const char* name, int folder,
                   const LongPath& destination) {
  LongPath path;
  path.append(dir).append("/").append(name);
  struct stat status;
  bool is_folder =
      fstatat(source, name, &status, AT_SYMLINK_NOFOLLOW) == 0 && S_ISDIR(status.st_mode);
  if (!is_folder) return copy_to(folder, destination, {source, name, path.c_str()});
  Directory files = open_directory_at(source, name);
  if (!files) {
    log_error("corvexd: open file failure. %s", path.c_str());
    return;
  }
  while (struct dirent* entry = next_entry(files)) {
    if (is_directory(files, *entry)) continue;
    LongPath file(path);
    file.append("/").append(entry->d_name);
    copy_to(folder, destination, {dirfd(files.get()), entry->d_name, file.c_str()});
  }
}

// Makes the destination below the current log directory and finds the place of the copy in it,
// without an earlier copy where the row replaces one.
Place provide_place(const Destination& row, const LongPath& destination, const char* name) {
  LongPath copy(destination);
  copy.append(name);
  Place place = locate(copy.c_str());
  if (place.folder == -1) {
    mkdirs(destination.c_str());
    place = locate(copy.c_str());
  }
  if (row.replaces && faccessat(place.folder, place.name, R_OK, 0) == 0) {
    unlinkat(place.folder, place.name, 0);
  }
  return place;
}

}  // namespace

int movefile(const char* dir, const char* name) {
  log_info("corvexd: notify has been triggerd! \n");
  log_error("corvexd: filepath is %s, filename is %s \n", dir, name);
  const Timestamp time = local_timestamp();
  std::unique_lock<std::mutex> lock(current_directory_mutex);
  Path current;
  if (!find_current_directory(WhichMark::kLast, &current)) {
    if (errno != 0) {
      log_error("corvexd: Error: %s\n", strerror(errno));
    } else {
      log_error("corvexd: no current log directory for %s\n", name);
    }
    return -1;
  }
  const Destination& row = find_destination(dir, name);
  const LongPath destination = destination_path(row, current, name, time);
  const Place place = provide_place(row, destination, name);
  lock.unlock();
  log_error("corvexd: movefile: %s\n", destination.c_str());
  if (strstr(dir, "Screenshots") != nullptr) provide_media_marker();
  const unique_fd source = open_folder(dir);
  if (source == -1) {
    log_error("corvexd: Error: %s\n", strerror(errno));
    return -1;
  }
  copy_artefact(source, dir, name, place.folder, destination);
  return 0;
}

}  // namespace corvexd
