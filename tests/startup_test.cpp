// From the start of the process to the first connection, seen from outside.
#include <unistd.h>

#include <algorithm>
#include <iterator>

#include "early/boot_log.h"
#include "early/initial_log.h"
#include "tests/daemon.h"
#include "tests/property_service.h"

namespace corvexd::test {
namespace {

class Startup : public DeviceTest {
 protected:
  PropertyService service;
};

bool listens() {
  int fd = try_to_connect();
  close(fd);
  return fd != -1;
}

TEST_F(Startup, GoesItsWayOnADeviceThatIsNotEncrypted) {
  run("mkdir -p /vendor/etc && echo '/dev/d /data ext4 ro encryptable=x' > /vendor/etc/fstab.qcom");
  set_property("persist.sys.assert.panic", "1");  // which is not "true"
  BootingDaemon daemon;
  const std::string layout_line = "corvexd: installd fs upgrade not yet complete. Waiting...\n";
  const std::string mount_line = "corvexd: Waiting for internal sd be mounted... \n";
  ASSERT_TRUE(log.has(layout_line));
  for (const ProbeReport& report : probe_reports(4)) {
    EXPECT_EQ(3u, report.rest.size()) << "two lines of signals, the time, no descriptor";
  }
  write_file("/data/.layout_version", "2");
  const size_t waited = log.count(layout_line);
  EXPECT_EVENTUALLY(log.count(layout_line) > waited + 2);
  EXPECT_FALSE(listens());
  write_file("/data/.layout_version", "4");
  ASSERT_TRUE(log.has(mount_line));
  const char* others[][2] = {{"A", ""}, {"A", "false"}, {"B", "true"}, {"2", "true"}};
  for (const auto& [mount, on_tempfs] : others) {
    set_property("vold.internalSD.mount", mount);
    set_property("ro.mount.tempfs", on_tempfs);
    const size_t seen = log.count(mount_line);
    EXPECT_EVENTUALLY(log.count(mount_line) > seen + 2) << mount << on_tempfs;
    EXPECT_FALSE(listens());
  }
  EXPECT_GT(pauses(1), 2u * std::size(others));
  set_property("persist.sys.lograw", "long");  // nobody has asked for it until now
  set_property("vold.internalSD.mount", "A");
  ASSERT_TRUE(eventually(listens));
  const std::string boot = "logcat -f /cache/boot_log/";
  const std::string initial = "logcat -f /cache/log_before_initial/";
  EXPECT_EQ((Texts{boot + "android_boot.log -r 8192 -n 1 -b system -b main -b crash -v '' '' ''",
                   boot + "radio_boot.log -r 4096 -n 1 -b radio -v '' '' ''",
                   boot + "event_boot.log -r 4096 -n 1 -b events -v '' '' ''",
                   boot + "kernel_boot.log -r 4096 -n 1 -b kernel",
                   initial + "android_initial.log -r 2048 -n 4 -b system -b main -b crash "
                             "-v long *:V ''",
                   initial + "kernel_initial.log -r 1024 -n 4 -b kernel",
                   initial + "event_initial.log -r 1024 -n 4 -b events"}),
            command_lines(probe_reports(7)))
      << "the settings are read between the two phases";
  ASSERT_TRUE(log.has("corvexd: in function main, persist.sys.assert.panic = 1\n"));

  const std::string made = "I/corvexd: Log Directory created successfully, path is ";
  // The children's lines and the other threads' come in between; the last is the platform's own.
  Texts lines =
      log.lines({"_boot_pid", "executeOnBootLogcat a", "executeOnBootLogcat k",
                 "executeOnBootLogcat event", "delete_file", "fail to chown", "Failed to read"});
  lines.erase(std::unique(lines.begin(), lines.end()), lines.end());
  lines.resize(std::min<size_t>(lines.size(), 11));
  EXPECT_EQ((Texts{"I/corvexd main start\n", "I/put cache logs in /cache/ \n",
                   "I/corvexd firing up\n", made + "/cache/boot_log \n",
                   "E/corvexd: executeOnBootLogcat start \n", "E/" + layout_line, "E/" + mount_line,
                   "I/corvexd watchdogProp : false, log_path : data \n",
                   "I/corvexd LOG_ROOT : /data/corvex\n", made + "/cache/log_before_initial \n",
                   "D/corvexd: in function main, persist.sys.assert.panic = 1\n"}),
            lines);
  EXPECT_EQ("false", property("oem.after.clear"));
  EXPECT_EQ(0775u, mode_of("/cache/boot_log"));
  EXPECT_EQ(0775u, mode_of("/cache/log_before_initial"));
  EXPECT_TRUE(log.has("corvexd: kernel_boot_pid \n"));
  EXPECT_TRUE(log.has("corvexd: executeOnBootLogcat event \n"));

  write_file("/probe/end_pause_60", "");
  EXPECT_TRUE(log.has("corvexd: executeOnBootLogcat stop \n"));
  usleep(50'000);
  EXPECT_EQ("", current_directory());
  EXPECT_EQ(0u, log.count("copy folder"));
  for (const auto& [key, value] : service.requests()) EXPECT_NE("ctl.start", key) << value;
  EXPECT_EQ("", property("persist.oem.nfc.debug"));
}

TEST_F(Startup, WaitsForTheFrameworkOfAnEncryptedDevice) {
  run("mkdir -p /vendor/etc /kv2");
  write_file("/vendor/etc/fstab.qcom", "/dev/d /data ext4 ro wait,forceencrypt=footer\n");
  write_file("/kv2/fileAfter911", "");
  write_file("/data/.layout_version", "3");
  set_property("vold.internalSD.mount", "1");
  BootingDaemon daemon;
  ASSERT_TRUE(log.has("corvexd: Waiting for restart framework... \n"));
  const char* others[][2] = {{"", "1"},
                             {"trigger_restart_min_framework", "1"},
                             {"trigger_restart_framework", "0"},
                             {"trigger_restart_framework", "A"}};
  set_property("ro.mount.tempfs", "true");
  for (const auto& [decrypt, mount] : others) {
    set_property("vold.internalSD.mount", mount);
    set_property("vold.decrypt", decrypt);
    const size_t seen = pauses(1);
    EXPECT_EVENTUALLY(pauses(1) > seen + 2) << decrypt << mount;
    EXPECT_FALSE(listens());
  }
  set_property("vold.internalSD.mount", "1");
  EXPECT_TRUE(eventually(listens));
  EXPECT_EQ(1u, log.count("Waiting for"));
  EXPECT_TRUE(log.has("put cache logs in /kv2/ \n"));
  probe_reports(4);
  EXPECT_FALSE(exists("/kv2/log_before_initial")) << "the marker says that phase is over";
  EXPECT_EQ("", property("oem.after.clear"));
  run("rm -r /kv2");
}

TEST_F(Startup, PersistentCaptureRunsBeforeTheFirstCommand) {
  make_device_ready();
  set_property("persist.sys.assert.panic", "true");
  switch_on({"qxdm", "radio"});
  set_property("persist.sys.radio.logsize", "5");
  write_script("/system/bin/getprop", "/build/client/corvexctl CHANGEPATH; echo $?");
  BootingDaemon daemon;
  const std::pair<std::string, std::string> wanted("ctl.start", "diag_mdlog_start");
  ASSERT_TRUE(eventually([&] {
    auto all = service.requests();
    return std::count(all.begin(), all.end(), wanted) == 1;
  }));
  const std::string directory = current_directory();
  EXPECT_EQ("logcat -f " + directory + "/radio.log -r 5 -n 5 -b radio -v threadtime *:V ''",
            command_lines(probe_reports(5)).back());
  EXPECT_TRUE(log.has("start diag_mdlog_start"));
  EXPECT_EVENTUALLY(read_file(directory + "/getprop.txt") == "0\n")
      << "the socket listens before the capture begins";

  // The minute ends: the boot recorders with it, and their files come into the capture.
  write_file("/cache/boot_log/android_boot.log", "boot");
  write_file("/cache/boot_log/radio_boot.log.1.pre", "before");
  ASSERT_EVENTUALLY(exists("/probe/pause_60"));
  EXPECT_EQ(0u, log.count("executeOnBootLogcat stop"));
  set_property("persist.sys.assert.panic", "false");  // after it has counted
  // Whoever pauses as long may take the sign first.
  EXPECT_TRUE(eventually([&] {
    write_file("/probe/end_pause_60", "");
    return log.count("corvexd: executeOnBootLogcat stop \n") == 1;
  }));
  EXPECT_EVENTUALLY(list(directory + "/boot_log").size() == 2);
  EXPECT_EQ("boot", read_file(directory + "/boot_log/android_boot.log"));
  const std::vector<ProbeReport> recorders = probe_reports(5);
  EXPECT_EVENTUALLY(std::count_if(recorders.begin(), recorders.end(),
                                  [](const auto& report) { return has_ended(report.pid); }) == 4)
      << "the capture's recorder goes on";
}

TEST_F(Startup, EachBootSetsTheFilesOfTheLastOneAside) {
  make_device_ready();
  run("mkdir -p /cache/boot_log");
  const std::string area = "/cache/boot_log/";
  for (const char* name : {"android_boot.log", "android_boot.log.1", "event_boot.log",
                           "event_boot.log.1", "kernel_boot.log", "kernel_boot.log.1",
                           "radio_boot.log", "radio_boot.log.1", "android_boot.log.pre"}) {
    write_file(area + name, name);
  }
  run("mkdir -p /cache/boot_log/kernel_boot.log.pre/full");
  BootingDaemon daemon;
  ASSERT_TRUE(eventually(listens));
  EXPECT_EQ("android_boot.log", read_file(area + "android_boot.log.pre"));
  EXPECT_EQ((Texts{"android_boot.log.1.pre", "android_boot.log.pre", "event_boot.log.1.pre",
                   "event_boot.log.pre", "kernel_boot.log", "kernel_boot.log.1.pre",
                   "kernel_boot.log.pre", "radio_boot.log.1.pre", "radio_boot.log.pre"}),
            list("/cache/boot_log"));
  EXPECT_TRUE(
      log.has("corvexd: Rename /cache/boot_log/kernel_boot.log failed! Error: Is a directory\n"));
}

TEST_F(Startup, NoLinkStandsForAnAreaOfTheCache) {
  write_file("/probe/android_boot.log", "kept");
  write_file("/probe/android_initial.log", "kept");
  run("ln -s /probe /cache/boot_log; ln -s /probe /cache/log_before_initial");
  renameOldBootLog("/cache/boot_log/android_boot.log");
  EXPECT_TRUE(
      log.has("corvexd: Rename /cache/boot_log/android_boot.log failed! Error: Not a directory\n"));
  EXPECT_FALSE(deleteFile());
  EXPECT_TRUE(log.has("corvexd: can't remove /cache/log_before_initial/android_initial.log \n"));
  EXPECT_EQ(-1, getDirSize("/cache/log_before_initial/"));
  EXPECT_EQ("kept", read_file("/probe/android_boot.log"));
  EXPECT_EQ("kept", read_file("/probe/android_initial.log"));
}

TEST_F(Startup, TheOldestFileOfTheInitialPhaseGoesFirst) {
  const std::string area = "/cache/log_before_initial/";
  Texts names;
  for (const char* stem : {"android_initial.log", "kernel_initial.log"}) {
    for (const char* suffix : {".4", ".3", ".2", ".1", ""}) {
      names.push_back(std::string(stem) + suffix);
    }
  }
  run("mkdir " + area + " && cd " + area + " && touch event_initial.log.4");
  for (const std::string& name : names) write_file(area + name, "");
  for (const std::string& name : names) {
    EXPECT_TRUE(exists(area + name));
    EXPECT_TRUE(deleteFile());
    EXPECT_FALSE(exists(area + name)) << name;
  }
  EXPECT_FALSE(deleteFile());
  EXPECT_EQ(Texts{"event_initial.log.4"}, list(area));
}

TEST_F(Startup, TheInitialPhaseKeepsToItsSize) {
  const std::string area = "/cache/log_before_initial/";
  run("mkdir -p " + area + "below");
  auto make = [&](const std::string& name, off_t size) {
    write_file(area + name, "");
    EXPECT_EQ(0, truncate((area + name).c_str(), size));
  };
  make("android_initial.log.4", 1000);
  make("android_initial.log", 2000);
  make("kernel_initial.log.2", 3000);
  make("event_initial.log", 15'728'640 - 6000 - 10);
  make("below/foreign", 10);
  EXPECT_EQ(0, symlink("event_initial.log", (area + "0123456789").c_str()));
  EXPECT_EQ(15'728'640 + 17, getDirSize(area.c_str())) << "a link counts as itself";
  unlink((area + "0123456789").c_str());
  EXPECT_EQ(15'728'640, getDirSize(area.c_str()));
  EXPECT_EQ(-1, getDirSize("/cache/none"));

  write_file("/data/.layout_version", "3");
  set_property("vold.internalSD.mount", "1");
  BootingDaemon daemon;
  ASSERT_TRUE(log.has("corvexd: delete_file start!\n"));
  ASSERT_EVENTUALLY(exists("/probe/pause_100"));
  EXPECT_EQ(6u, list(area).size() + 1) << "exactly the limit is left alone";
  auto next_check = [] {
    unlink("/probe/pause_100");
    write_file("/probe/end_pause_100", "");
    EXPECT_EVENTUALLY(exists("/probe/pause_100"));
  };
  make("below/foreign", 11);
  next_check();
  EXPECT_FALSE(exists(area + "android_initial.log.4"));
  EXPECT_TRUE(exists(area + "android_initial.log"));
  make("below/foreign", 15'000'000);
  run("mkdir " + area + "kernel_initial.log.4");
  next_check();
  EXPECT_EQ((Texts{"below", "event_initial.log", "kernel_initial.log.2", "kernel_initial.log.4"}),
            list(area))
      << "what cannot be deleted waits for the next check";
  run("rmdir " + area + "kernel_initial.log.4");
  next_check();
  EXPECT_EQ((Texts{"below", "event_initial.log"}), list(area)) << "events are never deleted";
}

}  // namespace
}  // namespace corvexd::test
