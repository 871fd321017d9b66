// A device root of the test's own, and the fixture of the tests that live in one.
#pragma once

#include <gtest/gtest.h>

#include <string>

#include "tests/files.h"
#include "tests/log_catcher.h"

namespace corvexd::test {

// Moves the calling process into new mount and pid namespaces (without root, a user namespace too)
// and a fresh device root on a tmpfs, with the host's /usr and the build folder at /build. Returns
// in a child whose exit status the first process ends with.
void enter_device_root();

// Makes the device in that root an empty one: its directories, no property set.
void make_empty_device();

// Whether files can be given to other users here: not without root.
bool owners_work();

// An empty device with the probe as its recorders, its log caught, under a umask that whatever is
// made must not depend on.
class DeviceTest : public testing::Test {
 protected:
  DeviceTest();

  LogCatcher log;
};

// As whoever sets properties on a device does it: replaced whole, by rename.
void set_property(const std::string& key, const std::string& value);

// Sets the recorders' switches of these names to "yes".
void switch_on(const Texts& names);

}  // namespace corvexd::test
