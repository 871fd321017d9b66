#include <gtest/gtest.h>
#include <unistd.h>

#include "tests/device_root.h"

int main(int argc, char** argv) {
  testing::InitGoogleTest(&argc, argv);
  if (!testing::GTEST_FLAG(list_tests)) corvexd::test::enter_device_root();
  // The thread sanitizer prepares for a thread's signals at its first blocking call, and loses one
  // that arrives at that very moment.
  usleep(1);
  return RUN_ALL_TESTS();
}
