#include "storage/current_directory.h"

#include <errno.h>
#include <string.h>

#include "core/directory.h"
#include "core/state.h"

namespace corvexd {

std::mutex current_directory_mutex;

namespace {

// Whether a shell reads the name as itself.
bool is_plain_word(const char* name) {
  constexpr char kPlain[] = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789._-";
  return name[strspn(name, kPlain)] == '\0';
}

}  // namespace

bool find_current_directory(WhichMark which, Path* path) {
  const char* root_path = LOG_ROOT;
  Directory root = open_directory(root_path);
  if (!root) return false;
  bool found = false;
  while (struct dirent* entry = next_entry(root)) {
    if (strstr(entry->d_name, kCurrentMark) == nullptr || !is_directory(root, *entry)) continue;
    if (which == WhichMark::kFirstPlain && !is_plain_word(entry->d_name)) continue;
    const Path candidate = Path().append(root_path).append("/").append(entry->d_name);
    if (!candidate.fits_or_log()) continue;
    *path = candidate;
    found = true;
    if (which != WhichMark::kLast) break;
  }
  if (!found) errno = 0;
  return found;
}

}  // namespace corvexd
