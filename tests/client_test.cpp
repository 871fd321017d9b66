// corvexctl as a program, against a daemon's end played by a thread on a real socket.

#include <fcntl.h>
#include <gtest/gtest.h>
#include <poll.h>
#include <stdint.h>
#include <string.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <functional>
#include <string>
#include <thread>
#include <vector>

namespace corvexd {
namespace {

std::string read_to_end(int fd) {
  std::string all;
  char buffer[512];
  ssize_t n;
  while ((n = read(fd, buffer, sizeof(buffer))) > 0) all.append(buffer, static_cast<size_t>(n));
  return all;
}

std::string framed(const std::string& word) {
  const uint16_t length = static_cast<uint16_t>(word.size());
  return std::string(reinterpret_cast<const char*>(&length), sizeof(length)) + word;
}

void reply(int connection, const std::string& text) {
  EXPECT_EQ(send(connection, text.data(), text.size(), MSG_NOSIGNAL), ssize_t(text.size()));
}

class ClientTest : public ::testing::Test {
 protected:
  void SetUp() override {
    listener_ = socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    strcpy(address.sun_path, path_.c_str());
    ASSERT_EQ(bind(listener_, reinterpret_cast<sockaddr*>(&address), sizeof(address)), 0);
    ASSERT_EQ(listen(listener_, 5), 0);
  }
  void TearDown() override {
    close(listener_);
    unlink(path_.c_str());
  }

  // Runs the program to its end; what it printed is in out_ and err_.
  int run(std::vector<std::string> arguments) {
    arguments.insert(arguments.begin(), {"corvexctl", "--socket", path_});
    std::vector<char*> argv;
    for (std::string& argument : arguments) argv.push_back(argument.data());
    argv.push_back(nullptr);
    int out[2], err[2];
    EXPECT_EQ(pipe2(out, O_CLOEXEC) | pipe2(err, O_CLOEXEC), 0);
    const pid_t pid = fork();
    if (pid == 0) {
      dup2(out[1], STDOUT_FILENO);
      dup2(err[1], STDERR_FILENO);
      execv(CORVEXCTL_PATH, argv.data());
      _exit(127);
    }
    close(out[1]);
    close(err[1]);
    out_ = read_to_end(out[0]);
    err_ = read_to_end(err[0]);
    close(out[0]);
    close(err[0]);
    int status = 0;
    EXPECT_EQ(waitpid(pid, &status, 0), pid);
    return WIFEXITED(status) ? WEXITSTATUS(status) : -WTERMSIG(status);
  }

  // The same, with `serve` run on the first connection, which is closed after it.
  int run_with(const std::function<void(int)>& serve, std::vector<std::string> arguments) {
    std::atomic<bool> served{false};
    std::thread peer([&] {
      const int connection = accept4(listener_, nullptr, nullptr, SOCK_CLOEXEC);
      serve(connection);
      served = true;
      close(connection);
    });
    const int status = run(std::move(arguments));
    EXPECT_TRUE(served) << "ended before the daemon had ended the connection";
    // A program that never came would leave the peer waiting.
    shutdown(listener_, SHUT_RDWR);
    peer.join();
    return status;
  }

  const std::string path_ = "/tmp/client-test." + std::to_string(getpid());
  int listener_ = -1;
  std::string out_, err_;
};

TEST_F(ClientTest, SendsTheWordsInOrderInUpperCaseAndWaitsUntilTheyAreRun) {
  std::string received;
  const auto serve = [&](int connection) {
    received = read_to_end(connection);
    usleep(200000);
  };
  EXPECT_EQ(run_with(serve, {"logBegin", "OEM_BT_DEBUG_ENABLE", "changepath"}), 0);
  EXPECT_EQ(received, framed("LOGBEGIN") + framed("OEM_BT_DEBUG_ENABLE") + framed("CHANGEPATH"));
  EXPECT_EQ(out_ + err_, "");
}

TEST_F(ClientTest, PrintsEveryReplyOnItsOwnLineHoweverItArrives) {
  const auto serve = [](int connection) {
    read_to_end(connection);
    for (const char* piece : {"CLEANSUCC", "ESSCLEANFAI", "LEDCLEANSUCCESS"}) {
      reply(connection, piece);
      usleep(20000);
    }
  };
  EXPECT_EQ(run_with(serve, {"DELETELOG", "DELETELOG", "deletelog"}), 1);
  EXPECT_EQ(out_, "CLEANSUCCESS\nCLEANFAILED\nCLEANSUCCESS\n");
}

TEST_F(ClientTest, KeepsAReplyThatAResetFollows) {
  // Closing with bytes unread resets the connection under the client.
  const auto serve = [](int connection) { reply(connection, "CLEANSUCCESS"); };
  EXPECT_EQ(run_with(serve, {"DELETELOG"}), 0) << err_;
  EXPECT_EQ(out_, "CLEANSUCCESS\n");
}

TEST_F(ClientTest, SaysWhenADueReplyDidNotCome) {
  const auto serve = [](int connection) {
    read_to_end(connection);
    reply(connection, "CLEANSUCCESSCLEANSUC");
  };
  EXPECT_EQ(run_with(serve, {"DELETELOG", "DELETELOG"}), 4);
  EXPECT_EQ(out_, "CLEANSUCCESS\n");
  EXPECT_NE(err_.find("without an answer to DELETELOG"), std::string::npos) << err_;
}

TEST_F(ClientTest, OutlivesADaemonThatGoesAwayAtOnce) {
  // More than a socket holds, so that the client is in the middle of sending.
  std::vector<std::string> words(20000, "OEM_GPS_DEBUG_DISABLE");
  words.front() = "DELETELOG";
  const auto serve = [](int connection) {
    char byte;
    EXPECT_EQ(read(connection, &byte, 1), 1);
    reply(connection, "CLEANFAILED");
  };
  EXPECT_EQ(run_with(serve, words), 4);
  EXPECT_EQ(out_, "CLEANFAILED\n");
  EXPECT_EQ(std::count(err_.begin(), err_.end(), '\n'), 1) << err_;
}

TEST_F(ClientTest, SendsNothingWhenAWordIsUnknown) {
  EXPECT_EQ(run({"LOGSTOP", "logbegn"}), 2);
  EXPECT_NE(err_.find("did you mean LOGBEGIN?"), std::string::npos) << err_;
  EXPECT_EQ(run({}), 2);
  EXPECT_EQ(run({"--loud", "LOGSTOP"}), 2);
  pollfd waiting{listener_, POLLIN, 0};
  EXPECT_EQ(poll(&waiting, 1, 0), 0) << "a client connected";
}

TEST_F(ClientTest, SaysWhenThereIsNoDaemon) {
  shutdown(listener_, SHUT_RDWR);
  EXPECT_EQ(run({"LOGSTOP"}), 3);
  EXPECT_NE(err_.find(path_), std::string::npos) << err_;
  EXPECT_EQ(run({"--socket", path_ + ".none", "LOGSTOP"}), 3);
  EXPECT_EQ(run({"--socket", std::string(108, 'x'), "LOGSTOP"}), 2);
}

}  // namespace
}  // namespace corvexd
