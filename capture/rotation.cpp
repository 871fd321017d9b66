#include "capture/rotation.h"

#include <errno.h>
#include <stdio.h>

#include "core/files.h"
#include "core/log.h"
#include "core/path_buffer.h"

namespace corvexd {
namespace {

using SeriesName = PathBuffer<kPathSize + 12>;  // a path, "." and any int

SeriesName series_name(const char* path, int suffix) {
  SeriesName name;
  name.append(path);
  if (suffix > 0) name.append_format(".%d", suffix);
  return name;
}

}  // namespace

void shift_series(const char* path, int count, bool owned) {
  SeriesName new_name = series_name(path, count);
  for (int i = count; i >= 1; --i) {
    SeriesName old_name = series_name(path, i - 1);
    bool renamed = rename(old_name.c_str(), new_name.c_str()) == 0;
    if (!renamed && errno != ENOENT) log_error("while rotating log files");
    if (owned) {
      // A name that was just renamed away has no file to give.
      if (!renamed) give_to_system(old_name.c_str());
      give_to_system(new_name.c_str());
    }
    new_name = old_name;
  }
}

}  // namespace corvexd
