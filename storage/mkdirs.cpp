#include "storage/mkdirs.h"

#include <errno.h>
#include <string.h>
#include <unistd.h>

#include "core/directory.h"
#include "core/files.h"
#include "core/log.h"

using android::base::unique_fd;

namespace corvexd {
namespace {

constexpr int kWorkingSize = 512;
constexpr mode_t kMode = 0755;

// access() may fail for a directory that can be opened all the same.
bool exists(const char* path) { return access(path, F_OK) == 0 || open_directory(path); }

// -1 (logged) on failure.
unique_fd create(const char* path) {
  const Place place = locate(path);
  unique_fd made;
  if (place.folder != -1) made = make_folder(place.folder, place.name, kMode);
  if (made == -1) {
    log_error("corvexd: Directory create failed! Error: %s\n", strerror(errno));
  } else {
    log_info("corvexd: Log Directory created successfully, path is %s \n", path);
  }
  return made;
}

}  // namespace

int mkdirs(const char* path) {
  char working[kWorkingSize];
  if (strlen(path) >= sizeof working) {
    log_error("corvexd: too long, skipped: %s\n", path);
    return -1;
  }
  strcpy(working, path);

  // The first "/" is the root of an absolute path.
  char* slash = strchr(working, '/');
  if (slash != nullptr) slash = strchr(slash + 1, '/');
  for (; slash != nullptr; slash = strchr(slash + 1, '/')) {
    *slash = '\0';
    if (!exists(working)) {
      const unique_fd made = create(working);
      if (made == -1) return -1;
      if (give_to_system(made) != 0) log_info("corvexd: fail to chown, path is %s \n", working);
    }
    *slash = '/';
  }
  if (working[0] == '\0' || access(working, F_OK) == 0) return 0;
  const unique_fd made = create(working);
  if (made == -1) return -1;
  give_to_system(made);
  return 0;
}

}  // namespace corvexd
