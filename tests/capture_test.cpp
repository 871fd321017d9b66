#include "capture/capture.h"

#include <signal.h>

#include <algorithm>
#include <chrono>

#include "tests/daemon.h"

namespace corvexd::test {
namespace {

class Capture : public DeviceTest {
 protected:
  Capture() { write_script("/system/bin/getprop", "sleep 0.05; echo '[a]: [b]'"); }
};

bool lives(const ProbeReport& report) { return kill(report.pid, 0) == 0 && !has_ended(report.pid); }

TEST_F(Capture, EveryRecorderGetsItsVector) {
  switch_on({"main", "system", "radio", "event", "kernel", "tcpdump"});
  set_property("persist.sys.radio.logsize", "77");
  set_property("persist.sys.lograw", "long format");
  set_property("persist.sys.loglevel", "*:E;reboot");
  Daemon daemon(log);
  send_commands({"LOGBEGIN"});
  const std::string dir = current_directory();
  std::vector<ProbeReport> reports = probe_reports(5);
  const std::string format = " -v 'long format' *:E;reboot ''";
  EXPECT_EQ(
      (Texts{"logcat -f " + dir + "/android.log -r 20480 -n 30 -b system -b main -b crash" + format,
             "logcat -f " + dir + "/radio.log -r 77 -n 5 -b radio" + format,
             "logcat -f " + dir + "/event.log -r 20480 -n 5 -b events" + format,
             "logcat -f " + dir + "/kernel.log -r 20480 -n 5 -b kernel",
             "tcpdump -i any -p -s 0 -C 100 -W 3 -w " + dir + "/tcpdump -Z system"}),
      command_lines(reports));
  for (ProbeReport& report : reports) {
    report.rest.pop_back();
    EXPECT_EQ((Texts{"SigBlk:\t0000000000000000", "SigIgn:\t0000000000000000"}), report.rest)
        << "a recorder inherits no blocked or ignored signal and no descriptor";
  }
  EXPECT_TRUE(log.has("corvexd: kernel_pid"));
  EXPECT_TRUE(eventually([&] { return read_file(dir + "/getprop.txt") == "[a]: [b]\n"; }));
}

TEST_F(Capture, SwitchesCountOnlyWhenExactlyYes) {
  struct {
    const char* main;
    const char* system;
    std::string buffers;
  } rows[] = {{"yes", "no", " -n 30 -b main -b crash -v "},
              {"YES", "yes", " -n 30 -b system -b crash -v "},
              {"true", "yes ", ""}};
  set_property("sys.debug.watchdog", "true");  // the shared-storage root
  set_property("persist.sys.kernel.kmsg", "yes");
  Daemon daemon(log);
  size_t started = 0;
  for (const auto& row : rows) {
    set_property("persist.sys.main", row.main);
    set_property("persist.sys.system", row.system);
    send_commands({"LOGBEGIN"});
    if (row.buffers != "") ++started;
    Texts lines = command_lines(probe_reports(started));
    send_commands({"LOGSTOP"});
    EXPECT_NE(std::string::npos, lines.back().find(row.buffers));
  }
  switch_on({"tcpdump"});
  send_commands({"LOGBEGIN"});
  const std::string dir = current_directory("/storage/emulated/0/corvex");
  EXPECT_EQ(0u, dir.find("/storage/emulated/0/corvex/KVBR_4--"));
  EXPECT_EQ("tcpdump -i any -p -s 0 -C 100 -W 3 -w " + dir + "/tcpdump -Z root",
            command_lines(probe_reports(started + 1)).back());
  EXPECT_TRUE(log.has("corvexd: shell_cmd is getprop > " + dir + "/getprop.txt& \n"));
  EXPECT_EQ(0u, log.count("isInDataPartition"));
}

TEST_F(Capture, LogstopEndsWhatIsSwitchedOnThen) {
  switch_on({"main", "radio", "event"});
  Daemon daemon(log);
  send_commands({"LOGSTOP", "LOGBEGIN"});
  std::vector<ProbeReport> first = probe_reports(3);
  const std::string first_directory = current_directory();
  set_property("persist.sys.main", "no");
  switch_on({"system"});
  set_property("persist.sys.event", "no");
  send_commands({"LOGSTOP", "LOGSTOP"});
  EXPECT_TRUE(eventually([&] { return has_ended(first[0].pid) && has_ended(first[1].pid); }));
  EXPECT_TRUE(lives(first[2])) << "switched off meanwhile";

  switch_on({"event"});
  send_commands({"LOGBEGIN"});
  std::vector<ProbeReport> second = probe_reports(6);
  send_commands({"LOGSTOP"});
  EXPECT_TRUE(eventually([&] { return has_ended(second[5].pid); }));
  EXPECT_TRUE(lives(first[2])) << "the slot names the second capture's recorder";
  EXPECT_TRUE(exists(first_directory.substr(0, first_directory.size() - 8)));
}

// Ends that come together are delivered as one, which reaps one.
TEST_F(Capture, EndedRecordersDoNotPileUp) {
  switch_on({"main", "radio", "event", "kernel", "tcpdump", "qsee", "tz", "bootloader"});
  Daemon daemon(log);
  const std::string children = "/proc/" + std::to_string(daemon.pid()) + "/task/" +
                               std::to_string(daemon.pid()) + "/children";
  const auto count = [&] {
    const std::string all = read_file(children);
    return std::count(all.begin(), all.end(), ' ');
  };
  for (int i = 0; i < 12; ++i) send_commands({"LOGBEGIN", "LOGSTOP"});
  EXPECT_LE(count(), 4 + 8 + 1) << "boot recorders, the last capture's, the last dump";
}

TEST_F(Capture, TakesItsTwoSecondsThoughRecordersEndMeanwhile) {
  switch_on({"main", "radio", "event", "kernel"});
  Daemon daemon(log, "/build/corvexd");
  install_probes("die");
  const auto start = std::chrono::steady_clock::now();
  send_commands({"LOGBEGIN"});
  EXPECT_GE(std::chrono::steady_clock::now() - start, std::chrono::seconds(2));
  const std::string file = current_directory() + "/getprop.txt";
  EXPECT_TRUE(log.has("corvexd: isInDataPartition  \n"));
  EXPECT_TRUE(log.has("corvexd: shell_cmd is getprop > " + file + " ; chown system:system " + file +
                      "& \n"));
  EXPECT_TRUE(log.has("corvexd: in function sig_chld_handler, and receive signal 17\n"));
  EXPECT_TRUE(eventually([&] { return is_systems(file) == owners_work(); }));
}

}  // namespace
}  // namespace corvexd::test
