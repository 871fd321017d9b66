// The Android platform as the host layer plays it, byte for byte.
#include <android-base/logging.h>
#include <android/log.h>
#include <cutils/properties.h>
#include <fcntl.h>
#include <string.h>
#include <sys/socket.h>
#include <unistd.h>

#include <chrono>
#include <thread>

#include "core/log.h"
#include "tests/device_root.h"
#include "tests/property_service.h"

namespace corvexd::test {
namespace {

using Platform = DeviceTest;

TEST_F(Platform, LogRecordsHaveTheirBytes) {
  log.stop();
  int socket = bound_socket(SOCK_DGRAM, "/dev/socket/logdw");
  unsigned char record[8192];
  errno = EDOM;
  log_error("two\nlines \n");
  EXPECT_EQ(EDOM, errno);
  ASSERT_EQ(11 + 1 + 8 + 12, recv(socket, record, sizeof record, 0));
  uint32_t seconds;
  memcpy(&seconds, record + 3, sizeof seconds);
  EXPECT_NEAR(static_cast<double>(time(nullptr)), seconds, 2);
  EXPECT_EQ(0, memcmp(record + 11, "\6corvexd\0two\nlines \n\0", 21));
  uint16_t thread = record[1] | record[2] << 8;
  EXPECT_EQ(static_cast<uint16_t>(gettid()), thread);
  LOG(ERROR) << std::string(5000, 'x');
  ASSERT_EQ(11 + 4068, recv(socket, record, sizeof record, 0));
  EXPECT_EQ(0, memcmp(record + 11, "\6corvexd\0xxx", 12)) << "the base library's lines, too";
  EXPECT_EQ('\0', record[11 + 4067]);
  close(socket);
}

TEST_F(Platform, ALineLeavesErrnoAsItWas) {
  EXPECT_EQ(
      0, status_in_child([] {
        __android_log_set_logger([](const __android_logger_data*, const char*) { errno = EBADF; });
        errno = EDOM;
        log_info("line");
        _exit(errno == EDOM ? 0 : 1);
      }));
}

TEST_F(Platform, NoLineIsLostWhileTheLogDaemonReadsSlowly) {
  log.stop();
  int socket = bound_socket(SOCK_DGRAM, "/dev/socket/logdw");
  std::thread reader([socket] {
    char record[8192];
    for (int i = 0; i < 120; ++i) {
      usleep(2000);
      ASSERT_GT(recv(socket, record, sizeof record, 0), 0);
      EXPECT_EQ(std::to_string(i), record + 11 + 1 + 8);
    }
  });
  for (int i = 0; i < 120; ++i) log_info("%d", i);
  reader.join();
  close(socket);
}

TEST_F(Platform, LinesThatNobodyReadsGoToStandardError) {
  log.stop();
  int kept_stderr = dup(2);
  int file = open("/data/stderr", O_RDWR | O_CREAT | O_TRUNC, 0600);
  dup2(file, 2);
  log_error("alone\nand more \n");  // no socket at all
  int socket = bound_socket(SOCK_DGRAM, "/dev/socket/logdw");
  const auto start = std::chrono::steady_clock::now();
  for (int i = 0; i < 60; ++i) log_info("queued %d", i);  // a full queue that nobody empties
  EXPECT_LT(std::chrono::steady_clock::now() - start, std::chrono::seconds(4));
  int ends[2];
  ASSERT_EQ(0, pipe(ends));
  dup2(ends[1], 2);
  for (int i = 0; i < 30; ++i) log_info("%03000d", i);  // standard error full, too
  close(ends[0]);
  log_info("and broken");
  dup2(kept_stderr, 2);
  char head[32];
  snprintf(head, sizeof head, "E/corvexd (%5d): ", getpid());
  const std::string written = read_file("/data/stderr"), start_of_line = head;
  EXPECT_EQ(0u, written.find(start_of_line + "alone\n" + head + "and more \n")) << written;
  EXPECT_NE(std::string::npos, written.find("queued 59\n"));
  close(socket);
}

TEST_F(Platform, PropertiesAreFilesSetThroughTheService) {
  char value[PROPERTY_VALUE_MAX];
  set_property("a.b", std::string(91, 'v'));
  set_property("empty", "");
  EXPECT_EQ(91, property_get("a.b", value, "default"));
  EXPECT_EQ(std::string(91, 'v'), value);
  EXPECT_EQ(7, property_get("empty", value, "default"));
  EXPECT_STREQ("default", value);
  EXPECT_EQ(0, property_get("unset", value, nullptr));
  EXPECT_STREQ("", value);
  EXPECT_LT(property_set("a.b", "x"), 0) << "no service";

  PropertyService service;
  EXPECT_EQ(0, property_set("key", "val"));
  EXPECT_EQ("val", property("key"));
  EXPECT_LT(property_set("ro.key", "val"), 0) << "a refusal";
}

}  // namespace
}  // namespace corvexd::test
