#include "capture/capture.h"

#include <fcntl.h>
#include <signal.h>
#include <string.h>
#include <unistd.h>

#include <algorithm>
#include <iterator>
#include <mutex>
#include <thread>
#include <utility>

#include "storage/current_directory.h"
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
  run("mkdir /cache/recovery && echo log > /cache/recovery/last_log");
  int number = 10;
  for (const char* log : {"android", "radio", "event", "kernel", "tcpdump"}) {
    for (const char* setting : {".logsize", ".lognum"}) {
      set_property(std::string("persist.sys.") + log + setting, std::to_string(++number));
    }
  }
  set_property("persist.sys.lograw", "long format");
  set_property("persist.sys.loglevel", "*:E;reboot");
  Daemon daemon(log);
  const size_t waited = pauses(1);
  send_commands({"LOGBEGIN"});
  EXPECT_EQ(waited + 2, pauses(1)) << "for the properties, and for the recorders to settle";
  const std::string dir = current_directory();
  std::vector<ProbeReport> reports = probe_reports(5);
  const std::string format = " -v 'long format' *:E;reboot ''";
  EXPECT_EQ(
      (Texts{"logcat -f " + dir + "/android.log -r 11 -n 12 -b system -b main -b crash" + format,
             "logcat -f " + dir + "/radio.log -r 13 -n 14 -b radio" + format,
             "logcat -f " + dir + "/event.log -r 15 -n 16 -b events" + format,
             "logcat -f " + dir + "/kernel.log -r 17 -n 18 -b kernel",
             "tcpdump -i any -p -s 0 -C 19 -W 20 -w " + dir + "/tcpdump -Z system"}),
      command_lines(reports));
  for (ProbeReport& report : reports) {
    report.rest.pop_back();
    EXPECT_EQ((Texts{"SigBlk:\t0000000000000000", "SigIgn:\t0000000000000000"}), report.rest)
        << "a recorder inherits no blocked or ignored signal and no descriptor";
  }
  const std::string dump = dir + "/getprop.txt";
  for (const std::string& line :
       {std::string("corvexd: kernel_pid"), std::string("corvexd: isInDataPartition  \n"),
        std::string("corvexd: in function sig_chld_handler, and receive signal 17\n"),
        "corvexd: shell_cmd is getprop > " + dump + " ; chown system:system " + dump + "& \n"}) {
    EXPECT_TRUE(log.has(line)) << line;
  }
  EXPECT_EQ(owners_work(), is_systems(dump));
  EXPECT_EVENTUALLY(read_file(dump) == "[a]: [b]\n");
  EXPECT_EVENTUALLY(read_file(dir + "/recovery/last_log") == "log\n");
}

// The names in a log directory, and those of the files in it that programs were told to write.
Texts recorded_in(const std::string& directory) {
  Texts names = list(directory);
  for (const std::string& report : list("/probe")) {
    const std::string text = read_file("/probe/" + report), file = "arg " + directory + "/";
    const size_t at = text.find(file);
    if (report.rfind("report.", 0) != 0 || at == text.npos) continue;
    const size_t start = at + file.size();
    names.push_back(text.substr(start, text.find('\n', start) - start));
  }
  std::sort(names.begin(), names.end());
  return names;
}

TEST_F(Capture, EveryRecorderHasItsSwitchItsSourceAndItsFile) {
  const std::string partition = "/dev/block/platform/soc/624000.ufshc/by-name/";
  struct {
    const char* name;
    const char* file;
    std::string node;
  } rows[] = {{"main", "android.log", ""},
              {"radio", "radio.log", ""},
              {"event", "event.log", ""},
              {"kernel", "kernel.log", "/nodes/kmsg"},
              {"tcpdump", "tcpdump", ""},
              {"qsee", "qsee.log", "/nodes/proc/tzdbg/qsee_log"},
              {"tz", "tz.log", "/nodes/proc/tzdbg/tz_log"},
              {"bootloader", "bootloader.log", "/nodes/proc/bootloader_log"},
              {"pre_bootloader", "pre_bootloader.log", partition + "reserve1"}};
  make_nodes();
  run("mkdir -p " + partition);
  switch_on({"kernel.kmsg"});
  std::vector<int> ends;
  for (const auto& row : rows) {
    switch_on({row.name});
    if (row.node == "") continue;
    ends.push_back(open(row.node.c_str(), O_RDWR | O_CREAT | O_TRUNC | O_CLOEXEC, 0600));
    write(ends.back(), row.name, strlen(row.name));
  }
  Daemon daemon(log, kDaemonWithNodes);
  // First all of them, then all but one.
  const char* off = "";
  for (size_t round = 0; round <= std::size(rows); ++round) {
    clear_probe_reports();
    send_commands({"LOGBEGIN"});
    const std::string directory = current_directory();
    Texts expected = {"boot_log", "fileAfter911", "getprop.txt", "versionNumber"};
    for (const auto& row : rows) {
      if (row.name != off) expected.push_back(row.file);
    }
    std::sort(expected.begin(), expected.end());
    EXPECT_EVENTUALLY(recorded_in(directory) == expected) << off << " is off";
    for (const auto& row : rows) {
      if (row.node == "" || round > 0) continue;
      const std::string path = directory + "/" + row.file;
      EXPECT_EVENTUALLY(read_file(path) == row.name) << path;
      EXPECT_EQ(owners_work(), is_systems(path)) << path;
    }
    send_commands({"LOGSTOP"});
    if (round > 0) switch_on({off});
    off = rows[round % std::size(rows)].name;
    set_property(std::string("persist.sys.") + off, "no");
  }
  for (int end : ends) close(end);
  EXPECT_TRUE(eventually([&] {
    const auto all = children_of(daemon.pid());
    return std::count_if(all.begin(), all.end(), [](pid_t pid) { return !has_ended(pid); }) == 4;
  })) << "the boot recorders";
}

TEST_F(Capture, SwitchesCountOnlyWhenExactlyYes) {
  struct {
    const char* main;
    const char* system;
    std::string buffers;
  } rows[] = {{"yes", "no", " -n 30 -b main -b crash -v "},
              {"YES", "yes", " -n 30 -b system -b crash -v "},
              {"true", "yes ", ""}};
  set_property("persist.sys.kernel.kmsg", "yes");
  Daemon daemon(log);
  set_property("sys.debug.watchdog", "true");  // the shared-storage root
  size_t started = 0;
  for (const auto& row : rows) {
    set_property("persist.sys.main", row.main);
    set_property("persist.sys.system", row.system);
    send_commands({"LOGBEGIN"});
    if (row.buffers != "") ++started;
    const auto reports = probe_reports(started);
    send_commands({"LOGSTOP"});
    EXPECT_NE(std::string::npos, command_lines(reports).back().find(row.buffers));
    EXPECT_EVENTUALLY(has_ended(reports.back().pid)) << row.main;
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
  EXPECT_EVENTUALLY(has_ended(first[0].pid) && has_ended(first[1].pid));
  EXPECT_TRUE(lives(first[2])) << "switched off meanwhile";

  switch_on({"event"});
  send_commands({"LOGBEGIN"});
  std::vector<ProbeReport> second = probe_reports(6);
  send_commands({"LOGSTOP"});
  EXPECT_EVENTUALLY(has_ended(second[5].pid));
  EXPECT_TRUE(lives(first[2])) << "the slot names the second capture's recorder";
  EXPECT_TRUE(exists(first_directory.substr(0, first_directory.size() - 8)));

  install_probes("stubborn");
  send_commands({"LOGBEGIN"});
  const ProbeReport killed = probe_reports(9)[7], stubborn = probe_reports(9)[8];
  EXPECT_EVENTUALLY(exists(current_directory() + "/getprop.txt"));
  for (const auto& [stopped, recorder] : {std::pair("0", killed), std::pair("1", stubborn)}) {
    kill(recorder.pid, SIGKILL);
    EXPECT_TRUE(log.has(std::string("corvexd: stop_logcat : ") + stopped +
                        ", pid = " + std::to_string(recorder.pid) + "\n"));
    for (int times = 0; times < 2; ++times) {
      send_commands({"LOGSTOP"});
      usleep(50'000);
    }
    EXPECT_EQ(recorder.pid == killed.pid, lives(stubborn)) << "SIGTERM is sent, and only once";
  }
}

TEST_F(Capture, RecordersDoNotWaitForTheCopiesOfEarlierLogs) {
  switch_on({"main"});
  run("mkdir /data/anr");
  std::unique_lock<std::mutex> copies_wait(current_directory_mutex);
  std::thread capture(executeLogcat);
  EXPECT_EQ("main", probe_reports(1)[0].arguments[8]);
  copies_wait.unlock();
  capture.join();
}

// Ends that come together are delivered as one, which reaps one.
TEST_F(Capture, EndedRecordersAndThreadsDoNotPileUp) {
  switch_on({"main", "radio", "event", "kernel", "tcpdump", "qsee", "tz", "bootloader"});
  Daemon daemon(log);
  const auto address_space = [&] {
    const std::string status = read_file("/proc/" + std::to_string(daemon.pid()) + "/status");
    return atol(status.c_str() + status.find("VmSize:") + strlen("VmSize:"));
  };
  send_commands({"LOGBEGIN", "LOGSTOP"});
  const long kibibytes = address_space();
  for (int i = 0; i < 12; ++i) send_commands({"LOGBEGIN", "LOGSTOP"});
  EXPECT_LT(address_space(), kibibytes + 40'000) << "a stack is of eight mebibytes";
  // Those that ended late are reaped at the next start.
  EXPECT_TRUE(eventually([&] {
    send_commands({"LOGBEGIN", "LOGSTOP"});
    return children_of(daemon.pid()).size() <= 4 + 8 + 1;
  })) << "boot recorders, the last capture's, the last dump";
}

}  // namespace
}  // namespace corvexd::test
