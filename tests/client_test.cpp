// corvexctl as a program, against a daemon's end played by a thread on a real socket.
#include <errno.h>
#include <poll.h>
#include <sys/resource.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <thread>

#include "tests/daemon.h"

namespace corvexd::test {
namespace {

const struct sockaddr_un kAddress = {AF_UNIX, "/dev/socket/corvexd"};

class Client : public DeviceTest {
 protected:
  Client() { listen(listener_, 5); }
  ~Client() override { close(listener_); }

  // Runs the program to its end; what it printed is in out_ and err_.
  int call(const std::string& arguments) {
    int status = system(("/build/client/corvexctl --socket " + path_ + arguments + " >" +
                         out_path_ + " 2>/data/err")
                            .c_str());
    out_ = out_path_ == "/dev/full" ? "" : read_file(out_path_);
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
    EXPECT_TRUE(served || status == 4) << "ended before the daemon had ended the connection";
    // A program that never came would leave the peer waiting.
    shutdown(listener_, SHUT_RDWR);
    peer.join();
    return status;
  }

  const std::string path_ = "/dev/socket/corvexd";
  int listener_ = bound_socket(SOCK_STREAM, path_.c_str());
  std::string out_path_ = "/data/out", out_, err_;
};

// What the programs that have ended used, in seconds.
double processor_time() {
  struct rusage usage = {};
  getrusage(RUSAGE_CHILDREN, &usage);
  const struct timeval &user = usage.ru_utime, &system = usage.ru_stime;
  return static_cast<double>(user.tv_sec + system.tv_sec) +
         static_cast<double>(user.tv_usec + system.tv_usec) / 1e6;
}

TEST_F(Client, WaitsItsTurnAndTheRunAtNoProcessorTime) {
  double before = processor_time();
  EXPECT_EQ(0, call(" --list"));
  const double start = processor_time() - before;
  std::vector<int> queue;
  while (queue.empty() || queue.back() != -1) {
    queue.push_back(socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
    if (connect(queue.back(), reinterpret_cast<const sockaddr*>(&kAddress), sizeof kAddress) != 0) {
      EXPECT_EQ(EAGAIN, errno);
      close(queue.back());
      queue.back() = -1;
    }
  }
  std::string received;
  std::thread peer([&] {
    usleep(500'000);  // in which the queue stays full
    for (size_t i = 1; i < queue.size(); ++i) {
      close(accept4(listener_, nullptr, nullptr, SOCK_CLOEXEC));
    }
    const int connection = accept4(listener_, nullptr, nullptr, SOCK_CLOEXEC);
    received = read_to_end(connection);
    usleep(500'000);
    close(connection);
  });
  before = processor_time();
  EXPECT_EQ(0, call(" LOGSTOP")) << err_;
  EXPECT_LT(processor_time() - before, 2 * start + 0.1);
  shutdown(listener_, SHUT_RDWR);
  peer.join();
  EXPECT_EQ(message("LOGSTOP"), received);
  for (int fd : queue) close(fd);
}

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

TEST_F(Client, SaysWhenAnAnswerIsNone) {
  // The program need not wait for more.
  std::thread peer([this] {
    const int connection = accept4(listener_, nullptr, nullptr, SOCK_CLOEXEC);
    read_to_end(connection);
    send_all(connection, "CLEANSUCCESSCLEANED");
    close(connection);
  });
  EXPECT_EQ(4, call(" DELETELOG DELETELOG"));
  peer.join();
  EXPECT_EQ("CLEANSUCCESS\n", out_);
  EXPECT_NE(std::string::npos, err_.find("no reply of the daemon")) << err_;
}

TEST_F(Client, TellsWhatBecameOfItsWordsThoughNobodyCanReadTheAnswer) {
  const auto serve = [](int connection) {
    read_to_end(connection);
    send_all(connection, "CLEANFAILED");
  };
  out_path_ = "/dev/full";
  EXPECT_EQ(1, call_with(serve, " DELETELOG"));
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

TEST_F(Client, SaysWhenTheDaemonHasHeardEnough) {
  const auto serve = [](int connection) {
    shutdown(connection, SHUT_WR);
    usleep(300'000);
  };
  EXPECT_EQ(4, call_with(serve, " $(yes OEM_GPS_DEBUG_DISABLE | head -n 20000)"));
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
