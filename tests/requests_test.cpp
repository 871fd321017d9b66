// What is dumped and switched on request, and the watch over the log daemon.
#include <signal.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <map>

#include "tests/daemon.h"
#include "tests/device_root.h"
#include "tests/files.h"
#include "tests/property_service.h"

namespace corvexd::test {
namespace {

class Requests : public DeviceTest {
 protected:
  Requests() { set_property("persist.sys.assert.panic", "true"); }

  PropertyService service;
};

// A directory's name can hold what a shell would run.
TEST_F(Requests, AReportGoesWhereNoNameIsACommand) {
  write_script("/system/bin/bugreport", "echo report");
  run("cd /data/corvex && mkdir 'x;touch >pwned;_current' '$(touch pwned)_current' "
      "'`touch pwned`_current' 'a b_current' && ln -s /probe c_current && touch d_current");
  set_property("persist.sys.assert.panic", "false");
  Daemon daemon(log);
  send_commands({"BUGREPORT"});
  EXPECT_TRUE(log.has("corvexd: no current log directory for bugreport\n"));
  run("mkdir -p /data/corvex/-n_current");
  send_commands({"BUGREPORT"});
  ASSERT_EQ(1u, list("/data/corvex/-n_current").size());
  EXPECT_EQ("report\n", read_file("/data/corvex/-n_current/" + list("/data/corvex/-n_current")[0]));
  EXPECT_FALSE(exists("/pwned") || exists("/data/corvex/pwned"));
}

TEST_F(Requests, ADumpThatIsKilledIsReported) {
  set_property("persist.sys.assert.panic", "false");
  Daemon daemon(log);
  send_commands({"BUGREPORT"});
  EXPECT_TRUE(log.has("corvexd: no current log directory for bugreport\n"));
  send_commands({"LOGBEGIN", "BUGREPORT"});  // there is no such tool, which is no signal
  write_script("/system/bin/bugreport", "exec sleep 60");
  int client = connect_to_daemon();
  send_all(client, message("BUGREPORT") + message("CHANGEPATH"));
  usleep(200'000);
  run("pkill -KILL -P " + std::to_string(daemon.pid()) + " -f corvexd_fast");
  EXPECT_TRUE(log.has("print buf--CHANGEPATH \n"));
  EXPECT_EQ(1u, log.count("corvexd: Child terminated abnormally\n"));
  close(client);
}

TEST_F(Requests, TagsFollowTheirSwitchesAndCommands) {
  auto of_tags = [&](const std::string& value) {
    auto all = service.requests();
    return std::count_if(all.begin(), all.end(), [&](const auto& request) {
      return request.first.rfind("log.tag.", 0) == 0 && request.second == value;
    });
  };
  // Eight passes each, NFC at VERBOSE.
  const char* switches[][2] = {{"2", "1"}, {"1", "2"}};
  for (const auto& [gps, bluetooth] : switches) {
    set_property("persist.oem.gps.debug", gps);
    set_property("persist.oem.bt.debug", bluetooth);
    const auto info = of_tags("INFO"), verbose = of_tags("VERBOSE");
    const size_t passes = pauses(2);
    Daemon daemon(log);
    EXPECT_EVENTUALLY(pauses(2) == passes + 8);
    EXPECT_EQ(8 * (*gps == '1' ? 12 : 64), of_tags("INFO") - info) << gps << bluetooth;
    EXPECT_EQ(8 * (*gps == '1' ? 76 : 24), of_tags("VERBOSE") - verbose) << gps << bluetooth;
    EXPECT_EQ("1", property("persist.oem.nfc.debug"));
    EXPECT_EQ("VERBOSE", property("log.tag.NFC"));
  }
  const size_t passes = pauses(2);
  Daemon daemon(log);
  EXPECT_EVENTUALLY(pauses(2) == passes + 8);
  struct {
    const char* command;
    const char* tag;  // one of them
    const char* level;
    size_t tags;
  } rows[] = {{"OEM_BT_DEBUG_DISABLE", "log.tag.DockService", "INFO", 12},
              {"OEM_BT_DEBUG_ENABLE", "log.tag.DockService", "VERBOSE", 12},
              {"OEM_GPS_DEBUG_ENABLE", "log.tag.GmsNetworkLocationProvi", "VERBOSE", 64},
              {"OEM_GPS_DEBUG_DISABLE", "log.tag.GmsNetworkLocationProvi", "INFO", 64},
              {"OEM_NFC_DEBUG_DISABLE", "log.tag.SnepServer", "INFO", 12},
              {"OEM_NFC_DEBUG_ENABLE", "log.tag.SnepServer", "VERBOSE", 12}};
  for (const auto& row : rows) {
    const auto earlier = static_cast<long>(service.requests().size());
    send_commands({row.command});
    const auto requests = service.requests();
    const std::map<std::string, std::string> set(requests.begin() + earlier, requests.end());
    EXPECT_EQ(row.tags, set.size()) << row.command;
    EXPECT_EQ(1u, set.count(row.tag)) << row.command;
    for (const auto& [key, value] : set) EXPECT_EQ(row.level, value) << row.command << key;
  }
  EXPECT_EQ("1", property("persist.oem.nfc.debug"));
  // Every letter counts: the components look for exactly these names.
  run("[ $(LC_ALL=C ls /dev/__properties__ | grep ^log.tag | md5sum | cut -c 1-32) = "
      "ab2a3ddda0bdf84b2d536ffb36022232 ]");

  install_probes("die");
  send_commands({"CACHECLEAR"});
  EXPECT_EQ(Texts{"logcat -c"}, command_lines(probe_reports(1)));
}

class Minutes {
 public:
  static void pass() {
    write_file(kEnd, "");
    EXPECT_EVENTUALLY(!exists(kEnd));
  }
  // That of the boot recorders; who else pauses as long may take the sign first.
  static void end_the_first(LogCatcher& log) {
    EXPECT_TRUE(eventually([&] {
      pass();
      return log.count("corvexd: executeOnBootLogcat stop \n") == 1;
    }));
  }
  static void expect_that_nobody_waits_for_one() {
    write_file(kEnd, "");
    usleep(100'000);
    EXPECT_TRUE(exists(kEnd));
    unlink(kEnd);
  }

 private:
  static constexpr char kEnd[] = "/probe/end_pause_60";
};

TEST_F(Requests, AStaleLogHasInitRestartTheLogDaemonAndThisOne) {
  Daemon daemon(log);
  write_file(current_directory() + "/android.log", "old");
  run("touch -d '-299 seconds' " + current_directory() + "/android.log");
  auto restarts = [&] {
    Texts names;
    for (const auto& [key, value] : service.requests()) {
      if (key == "ctl.restart") names.push_back(value);
    }
    return names;
  };
  Minutes::end_the_first(log);
  for (int i = 0; i < 2; ++i) Minutes::pass();
  usleep(50'000);
  EXPECT_EQ(Texts{}, restarts());
  run("touch -d '-302 seconds' " + current_directory() + "/android.log");
  EXPECT_TRUE(eventually([&] {
    Minutes::pass();
    return restarts().size() >= 3;
  }));
  Texts first = restarts();
  first.resize(3);
  EXPECT_EQ((Texts{"logd", "logd-reinit", "corvexd"}), first);
  EXPECT_GT(log.count("/android.log last modified time : "), 0u);

  send_commands({"LOGSTOP"});
  Minutes::pass();
  const size_t asked = restarts().size();
  Minutes::expect_that_nobody_waits_for_one();
  EXPECT_EQ(asked, restarts().size()) << "nothing is recorded that could be stale";
}

TEST_F(Requests, ACaptureThatComesLaterIsNotWatched) {
  set_property("persist.sys.assert.panic", "false");
  Daemon daemon(log);
  Minutes::end_the_first(log);
  send_commands({"LOGBEGIN"});
  Minutes::expect_that_nobody_waits_for_one();
}

TEST_F(Requests, SnifferRunsTheVendorsToolsAndEndsItsEarlierOnes) {
  run("mkdir -p /vendor/bin");
  Daemon daemon(log);
  for (const char* tool : {"/vendor/bin/pktlogconf", "/system/bin/iwpriv"}) {
    ASSERT_EQ(0, symlink("/build/tests/recorder_probe", tool));
  }
  write_script("/system/bin/pktlogconf", "");
  send_commands({"WIFI_SNIFFLOG_STOP", "WIFI_SNIFFLOG_START"});
  std::vector<ProbeReport> first = probe_reports(3);
  ASSERT_EQ(3u, first.size());
  Texts lines = command_lines(first);
  std::sort(lines.begin(), lines.end());
  EXPECT_EQ(
      (Texts{"iwpriv wlan0 pktlog 0", "iwpriv wlan0 pktlog 1", "pktlogconf -s 16000000 -a cld"}),
      lines);
  EXPECT_TRUE(log.has("wifi_snifflog_stop"));
  EXPECT_TRUE(log.has("corvexd:wifi_snifflog_start...sniff_set...\n"));
  EXPECT_TRUE(log.has("corvexd:wifi_snifflog_start...sniff_start....\n"));
  run("mv /system/bin/iwpriv /vendor/bin && mv /system/bin/pktlogconf /system/bin/iwpriv");
  send_commands({"WIFI_SNIFFLOG_START"});
  EXPECT_EQ(5u, probe_reports(5).size());
  EXPECT_EQ(4u, pauses(5)) << "each time in the daemon and in the tool's process";
  EXPECT_EVENTUALLY(std::count_if(first.begin(), first.end(),
                                  [](const auto& report) { return has_ended(report.pid); }) == 2)
      << "the stop job's child lives on";
}

}  // namespace
}  // namespace corvexd::test
