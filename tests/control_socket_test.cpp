#include "core/control_socket.h"

#include <fcntl.h>
#include <signal.h>
#include <sys/socket.h>
#include <sys/wait.h>
#include <unistd.h>

#include "tests/daemon.h"
#include "tests/device_root.h"
#include "tests/files.h"

namespace corvexd::test {
namespace {

using ControlSocket = DeviceTest;
using Texts = std::vector<std::string>;

TEST_F(ControlSocket, ReadxReadsExactlyWhatWasAskedFor) {
  int ends[2];
  ASSERT_EQ(0, socketpair(AF_UNIX, SOCK_STREAM, 0, ends));
  char buffer[8] = {};
  ASSERT_EQ(5, write(ends[1], "abcde", 5));
  EXPECT_EQ(-1, readx(ends[0], buffer, -1));
  EXPECT_EQ(0, readx(ends[0], buffer, 0));
  EXPECT_EQ(0, readx(ends[0], buffer, 4));
  EXPECT_STREQ("abcd", buffer);
  close(ends[1]);
  EXPECT_EQ(-1, readx(ends[0], buffer, 4));
  close(ends[0]);
  EXPECT_EQ(-1, readx(ends[0], buffer, 1));
  EXPECT_TRUE(log.has("corvexd: read error: Bad file descriptor\n"));
  EXPECT_EQ((Texts{"corvexd: eof\n", "corvexd: read error: Bad file descriptor\n"}), log.texts());
}

TEST_F(ControlSocket, MessagesRunInOrderHoweverTheyArrive) {
  Daemon daemon(log);
  int fd = connect_to_daemon();
  std::string bytes = message("CHANGEPATH") + message(std::string("CHANGEPATH\0abc", 14)) +
                      message("changepath") + message("CHANGEPATH\n") +
                      message(std::string(1023, 'x'));
  for (char byte : bytes) ASSERT_EQ(1, write(fd, &byte, 1));
  close(fd);
  ASSERT_TRUE(log.has("closing connection\n"));
  Texts texts = log.texts();
  Texts path = {"corvexd watchdogProp : false, log_path : data \n",
                "corvexd LOG_ROOT : /data/corvex\n"};
  Texts expected = {"new connection\n", "print buf--CHANGEPATH \n"};
  expected.insert(expected.end(), path.begin(), path.end());
  expected.push_back("print buf--CHANGEPATH \n");
  expected.insert(expected.end(), path.begin(), path.end());
  expected.insert(expected.end(), {"print buf--changepath \n", "print buf--CHANGEPATH\n \n",
                                   "print buf--" + std::string(1023, 'x') + " \n", "corvexd: eof\n",
                                   "failed to read size\n", "closing connection\n"});
  EXPECT_EQ(expected, texts);
}

TEST_F(ControlSocket, BadFramingClosesTheConnectionOnly) {
  struct {
    std::string bytes;
    Texts lines;
  } rows[] = {
      {"", {"corvexd: eof\n", "failed to read size\n"}},
      {"\1", {"corvexd: eof\n", "failed to read size\n"}},
      {std::string("\0\0", 2) + message("CHANGEPATH"), {"invalid size 0\n"}},
      {std::string("\0\4", 2) + message("CHANGEPATH"), {"invalid size 1024\n"}},
      {"\xff\xff", {"invalid size 65535\n"}},
      {message("CHANGEPATH").substr(0, 7), {"corvexd: eof\n", "failed to read command\n"}},
  };
  Daemon daemon(log);
  for (const auto& row : rows) {
    log.clear();
    send_bytes(row.bytes);
    ASSERT_TRUE(log.has("closing connection\n"));
    Texts expected = row.lines;
    expected.insert(expected.begin(), "new connection\n");
    expected.push_back("closing connection\n");
    EXPECT_EQ(expected, log.texts());
  }
}

TEST_F(ControlSocket, DeletelogAnswersAndSurvivesAClientThatHasGone) {
  Daemon daemon(log);
  EXPECT_EQ("CLEANFAILED", send_commands({"DELETELOG"})) << "no shared-storage root";
  run("mkdir -p /storage/emulated/0/corvex/x /data/corvex/y");
  EXPECT_EQ("CLEANSUCCESS", send_commands({"DELETELOG"}));
  EXPECT_TRUE(log.has("clean log CLEANSUCCESS \n"));
  EXPECT_TRUE(list("/storage/emulated/0/corvex").empty());
  EXPECT_TRUE(list("/data/corvex").empty());

  int fd = connect_to_daemon();
  kill(daemon.pid(), SIGSTOP);
  std::string bytes = message("DELETELOG") + message("CHANGEPATH");
  ASSERT_EQ(static_cast<ssize_t>(bytes.size()), write(fd, bytes.data(), bytes.size()));
  close(fd);
  log.clear();
  kill(daemon.pid(), SIGCONT);
  EXPECT_TRUE(log.has("corvexd: write error: Broken pipe\n"));
  EXPECT_TRUE(log.has("print buf--CHANGEPATH \n")) << "the next message is still read";

  run("rm -r /data/corvex && mkdir -p /storage/emulated/0/corvex/x");
  EXPECT_EQ("CLEANFAILED", send_commands({"DELETELOG"}));
  EXPECT_TRUE(exists("/storage/emulated/0/corvex/x")) << "the second root waits for the first";
}

TEST_F(ControlSocket, ClientsSeeTheEndOfTheDaemonThoughItsReadersLiveOn) {
  Daemon daemon(log);
  run("mkdir -p /sys && rm -rf /data/corvex");
  send_commands({"CPUTHERMAL"});
  int second = connect_to_daemon();
  const std::string begin = message("CPUTHERMAL");
  ASSERT_EQ(static_cast<ssize_t>(begin.size()), write(second, begin.data(), begin.size()));
  ASSERT_TRUE(eventually([&] { return log.count("cpu&thermal log path") == 2; }));
  int waiting = connect_to_daemon();
  run("rm -rf /data/corvex && touch /data/corvex");
  const std::string fatal = message("LOGBEGIN");
  ASSERT_EQ(static_cast<ssize_t>(fatal.size()), write(second, fatal.data(), fatal.size()));
  char byte;
  EXPECT_LE(read(second, &byte, 1), 0);
  EXPECT_LE(read(waiting, &byte, 1), 0);
  close(second);
  close(waiting);
}

TEST_F(ControlSocket, WithoutASocketTheProcessEnds) {
  make_device_ready();
  install_probes("live");
  for (const char* number : {"", "77", "0"}) {
    pid_t child = fork();
    if (child == 0) {
      setenv("ANDROID_SOCKET_corvexd", number, 1);
      execl("/build/corvexd", "corvexd", nullptr);
      _exit(127);
    }
    int status;
    waitpid(child, &status, 0);
    EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 1) << number;
  }
  EXPECT_EQ(3u, log.count("Failed to get socket from environment: "));
}

}  // namespace
}  // namespace corvexd::test
