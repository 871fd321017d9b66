// The simulated device that every target runs in: what an input has the daemon make, rename or
// delete, it does there.
#include <android/log.h>

#include "tests/device_root.h"

extern "C" int LLVMFuzzerInitialize(int*, char***) {
  corvexd::test::enter_device_root();
  corvexd::test::make_empty_device();
  __android_log_set_logger([](auto...) {});  // nobody reads what it says
  return 0;
}
