// corvexctl as a program, against a daemon's end played by a thread on a real socket.
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <thread>

#include "tests/daemon.h"

namespace corvexd::test {
namespace {

class Client : public DeviceTest {
 protected:
  Client() { listen(listener_, 5); }
  ~Client() override { close(listener_); }

  // Runs the program to its end; what it printed is in out_ and err_.
  int call(const std::string& arguments) {
    int status =
        system(("/build/client/corvexctl --socket " + path_ + arguments + " >/data/out 2>/data/err")
                   .c_str());
    out_ = read_file("/data/out");
    err_ = read_file("/data/err");
    return WEXITSTATUS(status);
  }

  // The same, with `serve` run on the first connection, which is closed after it.
  int call_with(const std::function<void(int)>& serve, const std::string& arguments) {
    std::atomic<bool> served{false};
    std::thread peer([&] {
      const int connection = accept4(listener_, nullptr, nullptr, SOCK_CLOEXEC);
      serve(connection);
      served = true;
      close(connection);
    });
    const int status = call(arguments);
    EXPECT_TRUE(served) << "ended before the daemon had ended the connection";
    // A program that never came would leave the peer waiting.
    shutdown(listener_, SHUT_RDWR);
    peer.join();
    return status;
  }

  const std::string path_ = "/dev/socket/corvexd";
  int listener_ = bound_socket(SOCK_STREAM, path_.c_str());
  std::string out_, err_;
};

TEST_F(Client, SendsTheWordsInOrderInUpperCaseAndWaitsUntilTheyAreRun) {
  std::string received;
  const auto serve = [&](int connection) {
    received = read_to_end(connection);
    usleep(200'000);
  };
  EXPECT_EQ(0, call_with(serve, " logBegin OEM_BT_DEBUG_ENABLE changepath"));
  EXPECT_EQ(message("LOGBEGIN") + message("OEM_BT_DEBUG_ENABLE") + message("CHANGEPATH"), received);
  EXPECT_EQ("", out_ + err_);
}

TEST_F(Client, PrintsEveryReplyOnItsOwnLineHoweverItArrives) {
  const auto serve = [](int connection) {
    read_to_end(connection);
    for (const char* piece : {"CLEANSUCC", "ESSCLEANFAI", "LEDCLEANSUCCESS"}) {
      send_all(connection, piece);
      usleep(20'000);
    }
  };
  EXPECT_EQ(1, call_with(serve, " DELETELOG DELETELOG deletelog"));
  EXPECT_EQ("CLEANSUCCESS\nCLEANFAILED\nCLEANSUCCESS\n", out_);
}

TEST_F(Client, KeepsAReplyThatAResetFollows) {
  // Closing with bytes unread resets the connection under the client.
  const auto serve = [](int connection) { send_all(connection, "CLEANSUCCESS"); };
  EXPECT_EQ(0, call_with(serve, " DELETELOG")) << err_;
  EXPECT_EQ("CLEANSUCCESS\n", out_);
}

TEST_F(Client, SaysWhenADueReplyDidNotCome) {
  const auto serve = [](int connection) {
    read_to_end(connection);
    send_all(connection, "CLEANSUCCESSCLEANSUC");
  };
  EXPECT_EQ(4, call_with(serve, " DELETELOG DELETELOG"));
  EXPECT_EQ("CLEANSUCCESS\n", out_);
  EXPECT_NE(std::string::npos, err_.find("without an answer to DELETELOG")) << err_;
}

TEST_F(Client, OutlivesADaemonThatGoesAwayAtOnce) {
  const auto serve = [](int connection) {
    char byte;
    EXPECT_EQ(1, read(connection, &byte, 1));
    send_all(connection, "CLEANFAILED");
  };
  // More than a socket holds, so that the client is in the middle of sending.
  EXPECT_EQ(4, call_with(serve, " DELETELOG $(yes OEM_GPS_DEBUG_DISABLE | head -n 20000)"));
  EXPECT_EQ("CLEANFAILED\n", out_);
  EXPECT_EQ(1, std::count(err_.begin(), err_.end(), '\n')) << err_;
}

TEST_F(Client, SendsNothingWhenItIsUsedWrongly) {
  EXPECT_EQ(2, call(" LOGSTOP logbegn"));
  EXPECT_NE(std::string::npos, err_.find("did you mean LOGBEGIN?")) << err_;
  EXPECT_EQ(2, call(""));
  EXPECT_EQ(2, call(" --loud LOGSTOP"));
  pollfd waiting{listener_, POLLIN, 0};
  EXPECT_EQ(0, poll(&waiting, 1, 0)) << "a client connected";
}

TEST_F(Client, SaysWhenThereIsNoDaemon) {
  shutdown(listener_, SHUT_RDWR);
  EXPECT_EQ(3, call(" LOGSTOP"));
  EXPECT_NE(std::string::npos, err_.find(path_)) << err_;
  EXPECT_EQ(3, call(".none LOGSTOP"));
  EXPECT_EQ(2, call(std::string(108, 'x') + " LOGSTOP"));
}

}  // namespace
}  // namespace corvexd::test
