#include "early/area.h"

#include <sys/stat.h>
#include <unistd.h>

#include "core/directory.h"
#include "core/state.h"
#include "storage/mkdirs.h"

using android::base::unique_fd;

namespace corvexd {
namespace {

constexpr mode_t kAreaMode = 0775;

}  // namespace

void provide_area(const char* name) {
  const Path area = cache_file(name);
  if (access(area.c_str(), R_OK) == 0) return;
  mkdirs(area.c_str());
  const unique_fd made = open_folder(area.c_str());
  if (made != -1) fchmod(made, kAreaMode);
}

}  // namespace corvexd
