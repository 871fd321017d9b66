// The Android platform as the host layer plays it, byte for byte.
#include <android-base/logging.h>
#include <cutils/properties.h>
#include <cutils/sockets.h>
#include <fcntl.h>
#include <string.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <time.h>
#include <unistd.h>

#include <thread>

#include "core/log.h"
#include "tests/device_root.h"
#include "tests/files.h"

namespace corvexd::test {
namespace {

using Platform = DeviceTest;

int bound_socket(int type, const char* path) {
  int fd = socket(AF_UNIX, type | SOCK_CLOEXEC, 0);
  struct sockaddr_un address = {AF_UNIX, ""};
  strcpy(address.sun_path, path);
  EXPECT_EQ(0, bind(fd, reinterpret_cast<sockaddr*>(&address), sizeof address));
  return fd;
}

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
  struct timespec start, end;
  clock_gettime(CLOCK_MONOTONIC, &start);
  for (int i = 0; i < 60; ++i) log_info("queued %d", i);  // a full queue that nobody empties
  clock_gettime(CLOCK_MONOTONIC, &end);
  EXPECT_LT(end.tv_sec - start.tv_sec, 4);
  int ends[2];
  ASSERT_EQ(0, pipe(ends));
  dup2(ends[1], 2);
  for (int i = 0; i < 100; ++i) log_info("%01000d", i);  // standard error full, too
  close(ends[0]);
  log_info("and broken");
  dup2(kept_stderr, 2);
  char expected[128];
  snprintf(expected, sizeof expected, "E/corvexd (%5d): alone\nE/corvexd (%5d): and more \n",
           getpid(), getpid());
  std::string written = read_file("/data/stderr");
  EXPECT_EQ(0u, written.find(expected)) << written;
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

  int listening = bound_socket(SOCK_STREAM, "/dev/socket/property_service");
  listen(listening, 4);
  std::string received;
  std::thread service([&] {
    for (uint32_t answer : {0u, 24u}) {
      int client = accept(listening, nullptr, nullptr);
      char bytes[18];
      ASSERT_EQ(18, recv(client, bytes, sizeof bytes, MSG_WAITALL));
      received.append(bytes, sizeof bytes);
      send(client, &answer, sizeof answer, 0);
      close(client);
    }
  });
  EXPECT_EQ(0, property_set("key", "val"));
  EXPECT_LT(property_set("key", "val"), 0) << "a refusal";
  service.join();
  EXPECT_EQ(0, memcmp(received.data(), "\1\0\2\0\3\0\0\0key\3\0\0\0val", 18));
  close(listening);
}

TEST_F(Platform, OnlyTheBoundControlSocketIsTaken) {
  int right = bound_socket(SOCK_STREAM, "/dev/socket/corvexd");
  int other = bound_socket(SOCK_STREAM, "/dev/socket/other");
  struct {
    std::string text;
    int result;
  } rows[] = {{std::to_string(right), right},
              {std::to_string(other), -1},
              {"", -1},
              {"7x", -1},
              {"-3", -1},
              {"99", -1}};
  for (const auto& row : rows) {
    setenv("ANDROID_SOCKET_corvexd", row.text.c_str(), 1);
    errno = 0;
    EXPECT_EQ(row.result, android_get_control_socket("corvexd")) << row.text;
    EXPECT_EQ(row.result == -1, errno != 0);
  }
  unsetenv("ANDROID_SOCKET_corvexd");
  EXPECT_EQ(-1, android_get_control_socket("corvexd"));
  close(right);
  close(other);
}

}  // namespace
}  // namespace corvexd::test
