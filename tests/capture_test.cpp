#include "capture/capture.h"

#include <signal.h>
#include <sys/stat.h>
#include <time.h>
#include <unistd.h>

#include "tests/daemon.h"
#include "tests/device_root.h"
#include "tests/files.h"

namespace corvexd::test {
namespace {

using Texts = std::vector<std::string>;

class Capture : public DeviceTest {
 protected:
  Capture() {
    write_file("/system/bin/getprop", "#!/bin/sh\nsleep 0.05\necho '[a]: [b]'\n");
    chmod("/system/bin/getprop", 0755);
  }

  void switch_on(const Texts& names) {
    for (const std::string& name : names) set_property("persist.sys." + name, "yes");
  }
};

bool alive(pid_t pid) { return kill(pid, 0) == 0; }

// A zombie has an empty command line; a recorder that was ended may stay one for a while.
bool ended(pid_t pid) { return read_file("/proc/" + std::to_string(pid) + "/cmdline").empty(); }

TEST_F(Capture, EveryRecorderGetsItsVector) {
  switch_on({"main", "system", "radio", "event", "kernel", "tcpdump"});
  set_property("persist.sys.radio.logsize", "77");
  set_property("persist.sys.lograw", "long format");
  set_property("persist.sys.loglevel", "*:E;reboot");
  Daemon daemon(log);
  send_commands({"LOGBEGIN"});
  const std::string dir = current_directory();
  std::vector<ProbeReport> reports = probe_reports(5);
  const Texts common = {"-v", "long format", "*:E;reboot", ""};
  std::vector<Texts> expected = {
      {"logcat", "-f", dir + "/android.log", "-r", "20480", "-n", "30", "-b", "system", "-b",
       "main", "-b", "crash"},
      {"logcat", "-f", dir + "/radio.log", "-r", "77", "-n", "5", "-b", "radio"},
      {"logcat", "-f", dir + "/event.log", "-r", "20480", "-n", "5", "-b", "events"},
      {"logcat", "-f", dir + "/kernel.log", "-r", "20480", "-n", "5", "-b", "kernel"},
      {"tcpdump", "-i", "any", "-p", "-s", "0", "-C", "100", "-W", "3", "-w", dir + "/tcpdump",
       "-Z", "system"}};
  for (int i = 0; i < 3; ++i) expected[i].insert(expected[i].end(), common.begin(), common.end());
  for (size_t i = 0; i < reports.size(); ++i) {
    EXPECT_EQ(expected[i], reports[i].arguments);
    reports[i].rest.pop_back();
    EXPECT_EQ((Texts{"SigBlk:\t0000000000000000", "SigIgn:\t0000000000000000"}), reports[i].rest)
        << "a recorder inherits no blocked or ignored signal and no descriptor";
  }
  EXPECT_TRUE(log.has("corvexd: kernel_pid"));
  EXPECT_TRUE(eventually([&] { return read_file(dir + "/getprop.txt") == "[a]: [b]\n"; }));
}

TEST_F(Capture, SwitchesCountOnlyWhenExactlyYes) {
  struct {
    const char* main;
    const char* system;
    Texts buffers;
  } rows[] = {{"yes", "no", {"-b", "main", "-b", "crash"}},
              {"YES", "yes", {"-b", "system", "-b", "crash"}},
              {"true", "yes ", {}}};
  set_property("sys.debug.watchdog", "true");  // the shared-storage root
  set_property("persist.sys.kernel.kmsg", "yes");
  Daemon daemon(log);
  size_t started = 0;
  for (const auto& row : rows) {
    set_property("persist.sys.main", row.main);
    set_property("persist.sys.system", row.system);
    send_commands({"LOGBEGIN"});
    started += row.buffers.empty() ? 0 : 1;
    std::vector<ProbeReport> reports = probe_reports(started);
    send_commands({"LOGSTOP"});
    ASSERT_EQ(started, reports.size());
    if (row.buffers.empty()) continue;
    const Texts& arguments = reports.back().arguments;
    EXPECT_EQ(row.buffers, Texts(arguments.begin() + 7, arguments.end() - 4));
  }
  switch_on({"tcpdump"});
  send_commands({"LOGBEGIN"});
  std::vector<ProbeReport> reports = probe_reports(started + 1);
  ASSERT_EQ(started + 1, reports.size());
  EXPECT_EQ("root", reports.back().arguments.back());
  EXPECT_EQ(
      0u,
      current_directory("/storage/emulated/0/corvex").find("/storage/emulated/0/corvex/KVBR_4--"));
  EXPECT_TRUE(log.has("corvexd: shell_cmd is getprop > " +
                      current_directory("/storage/emulated/0/corvex") + "/getprop.txt& \n"));
  EXPECT_EQ(0u, log.count("isInDataPartition"));
}

TEST_F(Capture, LogstopEndsWhatIsSwitchedOnThen) {
  switch_on({"main", "radio", "event"});
  Daemon daemon(log);
  send_commands({"LOGSTOP", "LOGBEGIN"});
  std::vector<ProbeReport> first = probe_reports(3);
  ASSERT_EQ(3u, first.size());
  const std::string first_directory = current_directory();
  set_property("persist.sys.main", "no");
  switch_on({"system"});
  set_property("persist.sys.event", "no");
  send_commands({"LOGSTOP", "LOGSTOP"});
  EXPECT_TRUE(eventually([&] { return ended(first[0].pid) && ended(first[1].pid); }));
  EXPECT_TRUE(alive(first[2].pid)) << "switched off meanwhile";

  switch_on({"event"});
  send_commands({"LOGBEGIN"});
  std::vector<ProbeReport> second = probe_reports(6);
  ASSERT_EQ(6u, second.size());
  send_commands({"LOGSTOP"});
  EXPECT_TRUE(eventually([&] { return ended(second[5].pid); }));
  EXPECT_TRUE(alive(first[2].pid)) << "the slot names the second capture's recorder";
  EXPECT_FALSE(ended(first[2].pid));
  EXPECT_TRUE(exists(first_directory.substr(0, first_directory.size() - 8)));
}

TEST_F(Capture, TakesItsTwoSecondsThoughRecordersEndMeanwhile) {
  switch_on({"main", "radio", "event", "kernel"});
  Daemon daemon(log, "/build/corvexd");
  install_probes("die");
  struct timespec start, end;
  clock_gettime(CLOCK_MONOTONIC, &start);
  send_commands({"LOGBEGIN"});
  clock_gettime(CLOCK_MONOTONIC, &end);
  EXPECT_GE((end.tv_sec - start.tv_sec) * 1000 + (end.tv_nsec - start.tv_nsec) / 1'000'000, 2000);
  const std::string dir = current_directory();
  EXPECT_TRUE(log.has("corvexd: isInDataPartition  \n"));
  EXPECT_TRUE(log.has("corvexd: shell_cmd is getprop > " + dir +
                      "/getprop.txt ; chown system:system " + dir + "/getprop.txt& \n"));
  EXPECT_TRUE(log.has("corvexd: in function sig_chld_handler, and receive signal 17\n"));
  if (!owners_work()) GTEST_SKIP() << "owners cannot be set without root";
  EXPECT_TRUE(eventually([&] { return is_systems(dir + "/getprop.txt"); }));
}

}  // namespace
}  // namespace corvexd::test
