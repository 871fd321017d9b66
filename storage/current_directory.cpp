#include "storage/current_directory.h"

#include <errno.h>
#include <string.h>

#include "core/files.h"
#include "core/state.h"

namespace corvexd {

std::mutex current_directory_mutex;

bool find_current_directory(WhichMark which, Path* path) {
  const char* root_path = LOG_ROOT;
  Directory root = open_directory(root_path);
  if (!root) return false;
  bool found = false;
  while (struct dirent* entry = next_entry(root)) {
    if (strstr(entry->d_name, "_current") == nullptr || !is_directory(root, *entry)) continue;
    Path candidate = Path().append(root_path).append("/").append(entry->d_name);
    if (!candidate.fits()) continue;
    *path = candidate;
    found = true;
    if (which == WhichMark::kFirst) break;
  }
  if (!found) errno = 0;
  return found;
}

}  // namespace corvexd
