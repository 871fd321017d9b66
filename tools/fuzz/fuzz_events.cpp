// Any bytes as what a read of the watched directories' events gave.
#include <stdint.h>

#include <algorithm>
#include <vector>

#include "collect/file_observer.h"
#include "core/state.h"
#include "storage/log_directory.h"
#include "tests/files.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  static const bool prepared = [] {
    corvexd::test::run("mkdir -p /data/tombstones /data/anr /data/misc/display");
    corvexd::checkLogPath();
    return corvexd::createLogDirectory() == 0;
  }();
  if (!prepared) __builtin_trap();
  std::vector<char> records(data, data + size);  // a read past it shows
  // No file's name holds one.
  std::replace(records.begin(), records.end(), '/', '_');
  corvexd::ObserverState state;
  corvexd::handle_events(state, records.data(), records.size());
  return 0;
}
