// The shift of a rotated series of files.
#pragma once

namespace corvexd {

// Renames `path` to `path`.1, `path`.1 to `path`.2 and so on, up to the suffix `count`, from the
// oldest to the newest. A missing file is passed over; another failure is logged and the shift goes
// on. `owned`: the files are given to the system user while the log root lies in the data
// partition. No allocation.
void shift_series(const char* path, int count, bool owned);

}  // namespace corvexd
