// What is left when the daemon is killed, and when storage is full or goes away.
#include <fcntl.h>
#include <signal.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <atomic>
#include <memory>
#include <random>
#include <sstream>
#include <thread>

#include "tests/daemon.h"
#include "tests/device_root.h"
#include "tests/files.h"

namespace corvexd::test {
namespace {

class Reliability : public DeviceTest {
 protected:
  Reliability() {
    make_device_ready();
    install_probes("live");
    run("mkdir -p /data/tombstones /storage/emulated/0/corvex");
    // A kernel log of numbered lines. What nobody has read yet waits for the next reader.
    umount2("/dev/kmsg", MNT_DETACH);
    run("rm -f /dev/kmsg && mkfifo /dev/kmsg");
    kernel_ = open("/dev/kmsg", O_RDWR | O_NONBLOCK | O_CLOEXEC);
    switch_on({"kernel", "kernel.kmsg", "main"});
    producer_ = std::thread([this] { produce(); });
  }
  ~Reliability() override {
    kill(-1, SIGKILL);  // readers, to whom the end of their source is nothing
    done_ = true;
    producer_.join();
    close(kernel_);
  }

 private:
  // Kernel lines and tombstones, faster than they are looked at.
  void produce() {
    for (int number = 0, artefact = 0; !done_;) {
      char line[16];
      int length = snprintf(line, sizeof line, "%08d\n", number);
      if (write(kernel_, line, length) == length) {
        ++number;
      } else {
        usleep(1000);
      }
      if (number % 50 != 0) continue;
      const std::string stem = "/data/tombstones/tombstone_";
      write_file(stem + std::to_string(++artefact), std::string(5000, 't'));
      unlink((stem + std::to_string(artefact - 100)).c_str());
      usleep(1000);
    }
  }

  int kernel_;
  std::atomic<bool> done_{false};
  std::thread producer_;
};

// The path of the log directory with that number; empty for none.
std::string log_directory(int number) {
  for (const std::string& name : list("/data/corvex")) {
    if (name.rfind("KVBR_" + std::to_string(number) + "--", 0) == 0) return "/data/corvex/" + name;
  }
  return "";
}

// The numbers of a kernel log's lines; the first and the last may be torn.
std::vector<int> numbers_in(const std::string& path) {
  std::vector<int> numbers;
  std::istringstream file(read_file(path));
  for (std::string line; std::getline(file, line) && !file.eof();) {
    if (line.size() == 8) numbers.push_back(std::stoi(line));
  }
  return numbers;
}

TEST_F(Reliability, AKillCostsNothingThatWasWritten) {
  constexpr int kKills = 40;
  constexpr int kLinesInHand = 1024 / 9 + 2;  // one read's worth, and the torn lines at its ends
  set_property("persist.sys.assert.panic", "true");
  std::mt19937 random(static_cast<unsigned>(getpid()));
  int next = 1, last = -1;
  write_file("/probe/before", "");
  for (int killed = 1; killed <= kKills; ++killed) {
    {
      BootingDaemon daemon;
      close(connect_to_daemon());  // it listens, and its capture begins
      if (random() % 3 == 0) send_commands({"LOGSTOP", "LOGBEGIN", "CPUTHERMAL"});
      usleep(random() % 200'000);
      kill(-1, SIGKILL);  // the daemon, its children: all but the tests
    }
    while (waitpid(-1, nullptr, 0) > 0) {
    }
    for (std::string made; (made = log_directory(next)) != ""; ++next) {
      for (int number : numbers_in(made + "/kernel.log")) {
        ASSERT_GT(number, last) << made;
        ASSERT_LE(number, last + kLinesInHand) << made;
        last = number;
      }
    }
    run("cd /data/corvex && find . -type f -exec md5sum {} + | sed s/_current// | sort > "
        "/probe/now");
    run("comm -23 /probe/before /probe/now > /probe/changed && mv /probe/now /probe/before");
    EXPECT_EQ("", read_file("/probe/changed"));
    run("find /data/corvex -name 'tombstone_*' -size +5000c > /probe/doubled");
    EXPECT_EQ("", read_file("/probe/doubled"));
  }
  EXPECT_GT(next, kKills);
  EXPECT_GT(last, kKills * 100);
  run("grep -q tombstones /probe/before");
}

TEST_F(Reliability, GoesOnWhenStorageIsFullOrGone) {
  set_property("persist.sys.assert.panic", "true");
  // A capture that records: its kernel log grows.
  auto captures = [] {
    send_commands({"LOGSTOP", "LOGBEGIN"});
    return eventually([] { return read_file(current_directory() + "/kernel.log").size() > 2000; });
  };
  // Started again, it ends again, and leaves nothing behind each time. Without persistent capture
  // it serves, and makes room.
  auto find_a_way_out = [](std::unique_ptr<BootingDaemon>& daemon) {
    const Texts before = list("/data/corvex");
    for (int start = 0; start < 3; ++start) {
      daemon = std::make_unique<BootingDaemon>();
      EXPECT_EVENTUALLY(has_ended(daemon->pid()));
    }
    EXPECT_EQ(before.size(), list("/data/corvex").size());
    set_property("persist.sys.assert.panic", "false");
    daemon = std::make_unique<BootingDaemon>();
    EXPECT_EQ("CLEANSUCCESS", send_commands({"DELETELOG"}));
    set_property("persist.sys.assert.panic", "true");
  };
  for (const std::string place : {"/data/corvex", "/cache"}) {
    ASSERT_EQ(0, mount("small", place.c_str(), "tmpfs", 0, "size=4m"));
    make_device_ready();
    auto daemon = std::make_unique<BootingDaemon>();
    EXPECT_TRUE(captures()) << place;
    run("head -c 5M /dev/zero >" + place + "/filler 2>/dev/null; true");
    log.clear();
    EXPECT_EVENTUALLY(log.count("filename is tombstone_") > 50) << place;
    run("rm " + place + "/filler");
    EXPECT_TRUE(captures()) << place;

    run("head -c 5M /dev/zero >" + place + "/filler 2>/dev/null; true");
    if (place == "/cache") {
      EXPECT_TRUE(captures());
    } else {
      send_commands({"LOGBEGIN"});
      EXPECT_TRUE(
          log.has("corvexd: bytes_write is -1, versionNumber is existing now! Error: No "
                  "space left on device \n"));
      find_a_way_out(daemon);
    }
    EXPECT_EQ(0, umount2(place.c_str(), MNT_DETACH));
    if (place != "/cache") daemon = std::make_unique<BootingDaemon>();  // as init does
    EXPECT_TRUE(captures()) << place;
  }
}

}  // namespace
}  // namespace corvexd::test
