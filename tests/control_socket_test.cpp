#include <poll.h>
#include <signal.h>
#include <sys/socket.h>
#include <unistd.h>

#include "tests/daemon.h"

namespace corvexd::test {
namespace {

using ControlSocket = DeviceTest;

TEST_F(ControlSocket, MessagesRunInOrderUpToTheFirstBadOne) {
  const std::string longest(1023, 'x'), change = message("CHANGEPATH");
  const std::string printed = "I/print buf--", eof = "E/corvexd: eof\n";
  const std::string reads = "I/corvexd watchdogProp : false, log_path : data \n";
  const std::string chooses = "I/corvexd LOG_ROOT : /data/corvex\n";
  const struct {
    std::string bytes;
    Texts lines;
  } rows[] = {
      {change + message(std::string("CHANGEPATH\0abc", 14)) + message("changepath") +
           message("CHANGEPATH\n") + message(longest),
       {printed + "CHANGEPATH \n", reads, chooses, printed + "CHANGEPATH \n", reads, chooses,
        printed + "changepath \n", printed + "CHANGEPATH\n \n", printed + longest + " \n", eof,
        "E/failed to read size\n"}},
      {"\1", {eof, "E/failed to read size\n"}},
      {std::string("\0\0", 2) + change, {"E/invalid size 0\n"}},
      {std::string("\0\4", 2) + change, {"E/invalid size 1024\n"}},
      {"\xff\xff", {"E/invalid size 65535\n"}},
      {change.substr(0, 7), {eof, "E/failed to read command\n"}},
  };
  Daemon daemon(log);
  for (const auto& row : rows) {
    log.clear();
    int fd = connect_to_daemon();
    for (char byte : row.bytes) send(fd, &byte, 1, MSG_NOSIGNAL);
    close(fd);
    ASSERT_TRUE(log.has("closing connection\n"));
    Texts lines = {"I/new connection\n"};
    lines.insert(lines.end(), row.lines.begin(), row.lines.end());
    lines.push_back("I/closing connection\n");
    EXPECT_EQ(lines, log.lines());
  }
}

TEST_F(ControlSocket, DeletelogAnswersAndSurvivesAClientThatHasGone) {
  Daemon daemon(log);
  EXPECT_EQ("CLEANFAILED", send_commands({"DELETELOG"})) << "no shared-storage root";
  run("mkdir -p /storage/emulated/0/corvex/x /data/corvex/y");
  EXPECT_EQ("CLEANSUCCESS", send_commands({"DELETELOG"}));
  EXPECT_TRUE(log.has("clean log CLEANSUCCESS \n"));
  EXPECT_EQ(Texts{}, list("/storage/emulated/0/corvex"));
  EXPECT_EQ(Texts{}, list("/data/corvex"));

  int fd = connect_to_daemon();
  kill(daemon.pid(), SIGSTOP);
  send_all(fd, message("DELETELOG") + message("CHANGEPATH"));
  close(fd);
  log.clear();
  kill(daemon.pid(), SIGCONT);
  EXPECT_TRUE(log.has("corvexd: write error: Broken pipe\n"));
  EXPECT_TRUE(log.has("print buf--CHANGEPATH \n")) << "the next message is still read";

  run("rm -r /data/corvex && mkdir -p /storage/emulated/0/corvex/x");
  EXPECT_EQ("CLEANFAILED", send_commands({"DELETELOG"}));
  EXPECT_TRUE(exists("/storage/emulated/0/corvex/x")) << "the second root waits for the first";
}

TEST_F(ControlSocket, AnIllBehavedClientCostsItsOwnConnection) {
  run("mkdir -p /storage/emulated/0/corvex");
  Daemon daemon(log);
  const std::string descriptors = "/proc/" + std::to_string(daemon.pid()) + "/fd";
  send_commands({"CHANGEPATH"});
  const size_t idle = list(descriptors).size();

  // Silent ones, as many as the queue takes beside the one that is served.
  std::vector<int> clients;
  for (int i = 0; i < 6; ++i) clients.push_back(connect_to_daemon());
  for (int fd : clients) close(fd);
  EXPECT_EQ("CLEANSUCCESS", send_commands({"DELETELOG"}));

  // One that goes away with the answer unread.
  int rude = connect_to_daemon();
  log.clear();
  send_all(rude, message("DELETELOG"));
  struct pollfd answer = {rude, POLLIN, 0};
  ASSERT_EQ(1, poll(&answer, 1, 10'000));
  close(rude);
  EXPECT_TRUE(log.has("corvexd: read error: Connection reset by peer\n"));

  // One that sends more than it ever reads answers of, until both stand still.
  struct pollfd flooding = {connect_to_daemon(), POLLOUT, 0};
  const std::string flood = message("DELETELOG");
  while (poll(&flooding, 1, 1000) == 1) {
    ASSERT_EQ(flood.size(), send(flooding.fd, flood.data(), flood.size(), MSG_NOSIGNAL));
  }
  close(flooding.fd);
  EXPECT_EQ("CLEANSUCCESS", send_commands({"DELETELOG"}));
  EXPECT_EVENTUALLY(list(descriptors).size() <= idle);
}

TEST_F(ControlSocket, ClientsSeeTheEndOfTheDaemonThoughItsReadersLiveOn) {
  Daemon daemon(log);
  run("mkdir -p /sys && rm -rf /data/corvex");
  send_commands({"CPUTHERMAL"});
  int second = connect_to_daemon();
  send_all(second, message("CPUTHERMAL") + message("CHANGEPATH"));
  ASSERT_TRUE(log.has("print buf--CHANGEPATH \n"));
  int waiting = connect_to_daemon();
  run("mv /data/corvex /data/moved && touch /data/corvex");  // samplers still write below it
  send_all(second, message("LOGBEGIN"));
  EXPECT_EQ("", read_to_end(second));
  EXPECT_EQ("", read_to_end(waiting));
  close(second);
  close(waiting);
}

TEST_F(ControlSocket, WithoutItsSocketTheProcessEnds) {
  make_device_ready();
  const int other = dup(bound_socket(SOCK_STREAM, "/dev/socket/other"));
  for (const std::string& number : Texts{"", "7x", "-3", "77", "0", std::to_string(other)}) {
    EXPECT_EQ(1, status_in_child([&] {
                alarm(10);  // for one that serves
                setenv("ANDROID_SOCKET_corvexd", number.c_str(), 1);
                execl("/build/corvexd", "corvexd", nullptr);
              }))
        << number;
  }
  EXPECT_EQ(6u, log.count("Failed to get socket from environment: "));
}

}  // namespace
}  // namespace corvexd::test
