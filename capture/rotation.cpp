#include "capture/rotation.h"

#include <errno.h>
#include <stdio.h>

#include "core/files.h"
#include "core/fixed_string.h"
#include "core/log.h"

namespace corvexd {
namespace {

using SeriesName = FixedString<kPathSize + 12>;  // a name, "." and any int

SeriesName series_name(const char* name, int suffix) {
  SeriesName text;
  text.append(name);
  if (suffix > 0) text.append_format(".%d", suffix);
  return text;
}

// A file that is not there is nothing to complain of.
void complain() {
  if (errno != ENOENT) log_error("while rotating log files");
}

}  // namespace

void shift_series(const Place& place, int count, bool owned) {
  if (place.folder == -1) return complain();
  SeriesName new_name = series_name(place.name, count);
  for (int i = count; i >= 1; --i) {
    const SeriesName old_name = series_name(place.name, i - 1);
    const bool renamed =
        renameat(place.folder, old_name.c_str(), place.folder, new_name.c_str()) == 0;
    if (!renamed) complain();
    if (owned) {
      // A name that was just renamed has no file any more.
      if (!renamed) give_to_system_at(place.folder, old_name.c_str());
      give_to_system_at(place.folder, new_name.c_str());
    }
    new_name = old_name;
  }
}

}  // namespace corvexd
