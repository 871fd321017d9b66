#include <gtest/gtest.h>

#include "tests/device_root.h"

int main(int argc, char** argv) {
  testing::InitGoogleTest(&argc, argv);
  if (!testing::GTEST_FLAG(list_tests)) corvexd::test::enter_device_root();
  return RUN_ALL_TESTS();
}
