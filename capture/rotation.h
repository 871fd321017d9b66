// The shift of a rotated series of files.
#pragma once

#include "core/directory.h"

namespace corvexd {

// Renames the file at `place` to its name and ".1", that one to its name and ".2" and so on, up to
// the suffix `count`, from the oldest to the newest. A missing file is passed over; another failure
// is logged and the shift goes on. `owned`: the files are given to the system user while the log
// root lies in the data partition. No allocation.
void shift_series(const Place& place, int count, bool owned);

}  // namespace corvexd
