// From the start of the process to the first connection, seen from outside.
#include <signal.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <unistd.h>

#include <algorithm>

#include "early/initial_log.h"
#include "tests/daemon.h"
#include "tests/device_root.h"
#include "tests/files.h"
#include "tests/property_service.h"

namespace corvexd::test {
namespace {

using Texts = std::vector<std::string>;

class Startup : public DeviceTest {
 protected:
  Startup() {
    install_probes("live");
    umask(077);
  }

  // The lines of the main thread; the children's and the other threads' come in between.
  Texts own_lines() {
    Texts lines;
    for (const std::string& text : log.texts()) {
      bool foreign = text.find("_boot_pid") != std::string::npos ||
                     text.find("executeOnBootLogcat a") != std::string::npos ||
                     text.find("executeOnBootLogcat k") != std::string::npos ||
                     text.find("executeOnBootLogcat event") != std::string::npos ||
                     text.find("delete_file") != std::string::npos ||
                     text.find("fail to chown") != std::string::npos ||
                     text.find("Failed to read") == 0;  // the platform's own
      if (!foreign) lines.push_back(text);
    }
    return lines;
  }

  static bool listens() {
    int fd = socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
    const struct sockaddr_un address = {AF_UNIX, "/dev/socket/corvexd"};
    bool connected = connect(fd, reinterpret_cast<const sockaddr*>(&address), sizeof address) == 0;
    close(fd);
    return connected;
  }

  PropertyService service;
};

Texts arguments_of(const std::vector<ProbeReport>& reports, const std::string& file) {
  for (const ProbeReport& report : reports) {
    if (report.arguments.size() > 2 && report.arguments[2] == file) return report.arguments;
  }
  return {};
}

TEST_F(Startup, GoesItsWayOnADeviceThatIsNotEncrypted) {
  run("mkdir -p /vendor/etc && echo '/dev/d /data ext4 ro encryptable=x' > /vendor/etc/fstab.qcom");
  set_property("persist.sys.lograw", "long");
  BootingDaemon daemon;
  const std::string layout_line = "corvexd: installd fs upgrade not yet complete. Waiting...\n";
  const std::string mount_line = "corvexd: Waiting for internal sd be mounted... \n";
  ASSERT_TRUE(log.has(layout_line));
  std::vector<ProbeReport> boot = probe_reports(4);
  for (const ProbeReport& report : boot) {
    EXPECT_EQ(3u, report.rest.size()) << "two lines of signals, the time, no descriptor";
  }
  write_file("/data/.layout_version", "2");
  const size_t waited = log.count(layout_line);
  EXPECT_TRUE(eventually([&] { return log.count(layout_line) > waited + 2; }));
  EXPECT_FALSE(listens());
  write_file("/data/.layout_version", "4");
  ASSERT_TRUE(log.has(mount_line));
  set_property("vold.internalSD.mount", "A");
  EXPECT_TRUE(eventually([&] { return log.count(mount_line) > 3; }));
  EXPECT_FALSE(listens());
  set_property("ro.mount.tempfs", "true");
  ASSERT_TRUE(eventually(listens));
  std::vector<ProbeReport> all = probe_reports(7);
  ASSERT_TRUE(log.has("corvexd: in function main, persist.sys.assert.panic = false\n"));

  const std::string made = "corvexd: Log Directory created successfully, path is ";
  Texts lines = own_lines();
  lines.erase(std::unique(lines.begin(), lines.end()), lines.end());
  lines.resize(std::min<size_t>(lines.size(), 11));
  EXPECT_EQ((Texts{"corvexd main start\n", "put cache logs in /cache/ \n", "corvexd firing up\n",
                   made + "/cache/boot_log \n", "corvexd: executeOnBootLogcat start \n",
                   layout_line, mount_line, "corvexd watchdogProp : false, log_path : data \n",
                   "corvexd LOG_ROOT : /data/corvex\n", made + "/cache/log_before_initial \n",
                   "corvexd: in function main, persist.sys.assert.panic = false\n"}),
            lines);
  EXPECT_EQ((Texts{"logcat", "-f", "/cache/boot_log/android_boot.log", "-r", "8192", "-n", "1",
                   "-b", "system", "-b", "main", "-b", "crash", "-v", "", "", ""}),
            arguments_of(boot, "/cache/boot_log/android_boot.log"))
      << "the settings are not read yet";
  EXPECT_EQ((Texts{"logcat", "-f", "/cache/boot_log/radio_boot.log", "-r", "4096", "-n", "1", "-b",
                   "radio", "-v", "", "", ""}),
            arguments_of(boot, "/cache/boot_log/radio_boot.log"));
  EXPECT_EQ((Texts{"logcat", "-f", "/cache/boot_log/kernel_boot.log", "-r", "4096", "-n", "1", "-b",
                   "kernel"}),
            arguments_of(boot, "/cache/boot_log/kernel_boot.log"));
  const std::string initial = "/cache/log_before_initial/";
  EXPECT_EQ((Texts{"logcat", "-f", initial + "android_initial.log", "-r", "2048", "-n", "4", "-b",
                   "system", "-b", "main", "-b", "crash", "-v", "long", "*:V", ""}),
            arguments_of(all, initial + "android_initial.log"));
  EXPECT_EQ((Texts{"logcat", "-f", initial + "event_initial.log", "-r", "1024", "-n", "4", "-b",
                   "events"}),
            arguments_of(all, initial + "event_initial.log"));
  EXPECT_EQ("false", property("oem.after.clear"));
  EXPECT_EQ(0775u, mode_of("/cache/boot_log"));
  EXPECT_EQ(0775u, mode_of("/cache/log_before_initial"));
  for (const char* line : {"corvexd: android_boot_pid", "corvexd: kernel_boot_pid \n",
                           "corvexd: executeOnBootLogcat event \n"}) {
    EXPECT_TRUE(log.has(line));
  }
}

TEST_F(Startup, WaitsForTheFrameworkOfAnEncryptedDevice) {
  run("mkdir -p /vendor/etc /kv2");
  write_file("/vendor/etc/fstab.qcom", "/dev/d /data ext4 ro wait,forceencrypt=footer\n");
  write_file("/kv2/fileAfter911", "");
  write_file("/data/.layout_version", "3");
  set_property("vold.internalSD.mount", "1");
  BootingDaemon daemon;
  ASSERT_TRUE(log.has("corvexd: Waiting for restart framework... \n"));
  set_property("vold.decrypt", "trigger_restart_min_framework");
  usleep(100'000);
  set_property("vold.internalSD.mount", "0");
  set_property("vold.decrypt", "trigger_restart_framework");
  usleep(100'000);
  EXPECT_FALSE(listens());
  set_property("vold.internalSD.mount", "1");
  EXPECT_TRUE(eventually(listens));
  EXPECT_EQ(1u, log.count("Waiting for"));
  EXPECT_TRUE(log.has("put cache logs in /kv2/ \n"));
  EXPECT_EQ(4u, probe_reports(4).size());
  EXPECT_FALSE(exists("/kv2/log_before_initial")) << "the marker says that phase is over";
  EXPECT_EQ("", property("oem.after.clear"));
  run("rm -r /kv2");
}

TEST_F(Startup, PersistentCaptureRunsBeforeTheFirstCommand) {
  make_device_ready();
  set_property("persist.sys.assert.panic", "true");
  set_property("persist.sys.qxdm", "yes");
  set_property("persist.sys.radio", "yes");
  set_property("persist.sys.radio.logsize", "5");
  write_file("/cache/boot_log_old", "");
  BootingDaemon daemon;
  const std::pair<std::string, std::string> wanted("ctl.start", "diag_mdlog_start");
  ASSERT_TRUE(eventually([&] {
    auto all = service.requests();
    return std::count(all.begin(), all.end(), wanted) == 1;
  }));
  const std::string directory = current_directory();
  EXPECT_EQ("5", arguments_of(probe_reports(5), directory + "/radio.log")[4]);
  EXPECT_TRUE(log.has("start diag_mdlog_start"));

  // The minute ends: the boot recorders with it, and their files come into the capture.
  write_file("/cache/boot_log/android_boot.log", "boot");
  write_file("/cache/boot_log/radio_boot.log.1.pre", "before");
  ASSERT_TRUE(eventually([] { return exists("/probe/pause_60"); }));
  EXPECT_EQ(0u, log.count("executeOnBootLogcat stop"));
  // Whoever pauses as long may take the sign first.
  EXPECT_TRUE(eventually([&] {
    write_file("/probe/end_pause_60", "");
    return log.count("corvexd: executeOnBootLogcat stop \n") == 1;
  }));
  EXPECT_TRUE(eventually([&] { return list(directory + "/boot_log").size() == 2; }));
  EXPECT_EQ("boot", read_file(directory + "/boot_log/android_boot.log"));
  const std::vector<ProbeReport> recorders = probe_reports(5);
  EXPECT_TRUE(eventually([&] {
    size_t alive = 0;
    for (const ProbeReport& report : recorders) {
      alive += !read_file("/proc/" + std::to_string(report.pid) + "/cmdline").empty();
    }
    return alive == 1;
  })) << "the capture's recorder goes on";
}

TEST_F(Startup, EachBootSetsTheFilesOfTheLastOneAside) {
  make_device_ready();
  run("mkdir -p /cache/boot_log");
  const std::string area = "/cache/boot_log/";
  for (const char* name :
       {"android_boot.log", "android_boot.log.1", "event_boot.log", "event_boot.log.1",
        "kernel_boot.log", "radio_boot.log", "radio_boot.log.1", "android_boot.log.pre"}) {
    write_file(area + name, name);
  }
  run("mkdir -p /cache/boot_log/kernel_boot.log.pre/full");
  BootingDaemon daemon;
  ASSERT_TRUE(eventually(listens));
  EXPECT_EQ("android_boot.log", read_file(area + "android_boot.log.pre"));
  EXPECT_EQ((Texts{"android_boot.log.1.pre", "android_boot.log.pre", "event_boot.log.1.pre",
                   "event_boot.log.pre", "kernel_boot.log", "kernel_boot.log.pre",
                   "radio_boot.log.1.pre", "radio_boot.log.pre"}),
            list("/cache/boot_log"));
  EXPECT_TRUE(
      log.has("corvexd: Rename /cache/boot_log/kernel_boot.log failed! Error: Is a directory\n"));
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
  ASSERT_TRUE(eventually([] { return exists("/probe/pause_100"); }));
  EXPECT_EQ(6u, list(area).size() + 1) << "exactly the limit is left alone";
  auto next_check = [] {
    unlink("/probe/pause_100");
    write_file("/probe/end_pause_100", "");
    EXPECT_TRUE(eventually([] { return exists("/probe/pause_100"); }));
  };
  make("below/foreign", 11);
  next_check();
  EXPECT_FALSE(exists(area + "android_initial.log.4"));
  EXPECT_TRUE(exists(area + "android_initial.log"));
  make("below/foreign", 15'000'000);
  next_check();
  EXPECT_EQ((Texts{"below", "event_initial.log"}), list(area)) << "events are never deleted";
}

}  // namespace
}  // namespace corvexd::test
