#include "collect/artefact_mover.h"

#include <android-base/unique_fd.h>
#include <errno.h>
#include <fcntl.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

#include "core/files.h"
#include "core/local_time.h"
#include "core/log.h"
#include "core/path_buffer.h"
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
  LongPath path;
  path.append(LOG_ROOT).append("/.nomedia");
  unique_fd existing(open(path.c_str(), O_RDONLY | O_NONBLOCK | O_CLOEXEC));
  if (existing != -1) return;
  unique_fd marker(open_with_mode(path.c_str(), O_WRONLY | O_NONBLOCK, kMarkerMode));
  if (marker != -1) give_to_system(marker);
}

void copy_to(int folder, const LongPath& destination, const char* name, const LongPath& source) {
  LongPath to(destination);
  to.append(name);
  copy_file_at(folder, strrchr(to.c_str(), '/') + 1, source.c_str(), to.c_str());
}

// `folder` is the destination's.
void copy_artefact(const char* dir, const char* name, const LongPath& destination, int folder) {
  LongPath source;
  source.append(dir).append("/").append(name);
  struct stat status;
  bool is_folder = lstat(source.c_str(), &status) == 0 && S_ISDIR(status.st_mode);
  if (!is_folder) return copy_to(folder, destination, name, source);
  Directory files = open_directory(source.c_str());
  if (!files) return;
  while (struct dirent* entry = next_entry(files)) {
    if (is_directory(files, *entry)) continue;
    LongPath file(source);
    file.append("/").append(entry->d_name);
    copy_to(folder, destination, entry->d_name, file);
  }
}

}  // namespace

int movefile(const char* dir, const char* name) {
  log_info("corvexd: notify has been triggerd! \n");
  log_error("corvexd: filepath is %s, filename is %s \n", dir, name);
  const Timestamp time = local_timestamp();
  std::unique_lock<std::mutex> lock(current_directory_mutex);
  Path current;
  if (!find_current_directory(WhichMark::kLast, &current)) {
    if (errno != 0) log_error("corvexd: Error: %s\n", strerror(errno));
    return -1;
  }
  const Destination& row = find_destination(dir, name);
  const LongPath destination = destination_path(row, current, name, time);
  if (row.replaces) {
    LongPath earlier(destination);
    earlier.append(name);
    if (access(earlier.c_str(), R_OK) == 0) unlink(earlier.c_str());
  }
  mkdirs(destination.c_str());
  const unique_fd folder = open_parent(destination.c_str());
  lock.unlock();
  log_error("corvexd: movefile: %s\n", destination.c_str());
  if (strstr(dir, "Screenshots") != nullptr) provide_media_marker();
  Directory source = open_directory(dir);
  if (!source) {
    log_error("corvexd: Error: %s\n", strerror(errno));
    return -1;
  }
  copy_artefact(dir, name, destination, folder);
  return 0;
}

}  // namespace corvexd
