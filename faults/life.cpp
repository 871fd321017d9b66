#include "faults/life.h"

#include <errno.h>
#include <fcntl.h>
#include <stdlib.h>
#include <sys/mount.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <time.h>
#include <unistd.h>

#include <algorithm>
#include <set>

#include "faults/outside.h"
#include "faults/places.h"
#include "tests/daemon.h"
#include "tests/device_root.h"
#include "tests/files.h"
#include "tests/log_catcher.h"
#include "tests/property_service.h"

namespace corvexd::faults {
namespace {

using namespace test;  // NOLINT(google-build-using-namespace): the device and its helpers

constexpr long kMillisecond = 1'000'000;
constexpr long kWindow = 40 * kMillisecond;  // in which the daemon is watched for being busy
constexpr int kBusyPercent = 30;

// A device on which everything that the daemon does is due.
constexpr char kDevice[] = R"sh(
rm -rf /data /cache /storage /system /vendor /probe /trace /nodes /dev/socket /dev/block \
  /dev/__properties__
mkdir -p /data/corvex/KVBR_1--2020-01-01-00-00-00_current /data/tombstones /data/anr \
  /data/system/dropbox /data/misc/display /data/media/0/Pictures/Screenshots /data/coredump \
  /data/vendor/media /storage/emulated/0/corvex/earlier /system/bin /system/xbin /vendor/bin \
  /vendor/etc /cache/boot_log /cache/log_before_initial /cache/recovery /cache/lkmsg /trace \
  /nodes /dev/socket /dev/__properties__ ${1%/*}
cd /dev/__properties__
for name in main system radio event kernel kernel.kmsg tcpdump qsee tz bootloader pre_bootloader \
  qxdm; do
  printf yes > persist.sys.$name
done
printf true > persist.sys.assert.panic
printf 1 > vold.internalSD.mount
printf 1 > persist.sys.kernel.logsize
printf 3 > /data/.layout_version
mkfifo /nodes/kmsg /nodes/qsee_log /nodes/tz_log
for name in proc_transactions proc_transaction_log proc_state bootloader_log; do
  echo $name > /nodes/$name
done
head -c 40960 /dev/zero | tr '\0' r > $1
for file in /cache/boot_log/android_boot.log /cache/boot_log/kernel_boot.log.1 \
  /cache/recovery/last_log /cache/lkmsg/lkmsg /cache/fileBefore911 /data/anr/earlier \
  /data/system/dropbox/earlier /storage/emulated/0/corvex/earlier/file; do
  echo earlier > $file
done
truncate -s 16M /cache/log_before_initial/android_initial.log.4
echo '/dev/data /data ext4 noatime wait,check' > /vendor/etc/fstab.qcom
cat > /system/bin/logcat <<'SH'
#!/bin/sh
[ "$1" = -c ] && exit 0
touch -d @1 "$2" # old enough for the watch over the log daemon to act
exec sleep 1000
SH
cat > /system/bin/getprop <<'SH'
#!/bin/sh
echo properties
SH
printf '#!/bin/sh\nexec sleep 1000\n' > /system/xbin/tcpdump
for name in /system/bin/dumpsys /system/bin/bugreport /vendor/bin/pktlogconf /vendor/bin/iwpriv; do
  cp /system/bin/getprop $name
done
chmod 755 /system/bin/* /system/xbin/* /vendor/bin/*
)sh";

bool may_be_set(const std::string& key, const std::string& value) {
  static const std::set<std::pair<std::string, std::string>> rows = {
      {"persist.oem.nfc.debug", "1"}, {"oem.after.clear", "false"},
      {"debug.sf.dump", "0"},         {"ctl.start", "diag_mdlog_start"},
      {"ctl.restart", "logd"},        {"ctl.restart", "logd-reinit"},
      {"ctl.restart", "corvexd"}};
  bool is_level = value == "VERBOSE" || value == "INFO";
  return rows.count({key, value}) != 0 || (is_level && key.rfind("log.tag.", 0) == 0);
}

// The partition's first 32 KiB are zeroed, block after block; the rest is nobody's business.
bool partition_is_sound() {
  const std::string content = read_file(kPartition);
  const size_t zeros = std::min(content.find_first_not_of('\0'), content.size());
  return content.size() == 40960 && zeros <= 32768 && zeros % 1024 == 0 &&
         content.find_first_not_of('r', zeros) == std::string::npos;
}

// The client: never waits for ever.
class Client {
 public:
  // A start may wait for ever for what can never be opened; a client who may give up then sends
  // nothing more.
  Client(TracedDaemon& daemon, std::vector<std::string>& problems, bool may_give_up)
      : daemon_(daemon), problems_(problems), may_give_up_(may_give_up) {}

  void begin_anew() { may_give_up_ = gave_up_ = false; }

  // Sends the command over a connection of its own and returns what came back until the daemon
  // ended it.
  std::string send(const std::string& command) {
    int fd = gave_up_ ? -1 : connect_while_it_lives();
    if (fd == -1) return "";
    const std::string bytes = message(command);
    ::send(fd, bytes.data(), bytes.size(), MSG_NOSIGNAL);
    shutdown(fd, SHUT_WR);
    struct timeval patience = {kPatience, 0};
    setsockopt(fd, SOL_SOCKET, SO_RCVTIMEO, &patience, sizeof patience);
    std::string reply;
    char buffer[64];
    ssize_t count;
    while ((count = recv(fd, buffer, sizeof buffer, 0)) > 0) reply.append(buffer, count);
    if (count == -1 && errno == EAGAIN) problems_.push_back("hangs at " + command);
    close(fd);
    return reply;
  }

 private:
  int connect_while_it_lives() {
    const struct sockaddr_un address = {AF_UNIX, "/dev/socket/corvexd"};
    int fd = socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
    bool connected = false;
    bool settled = wait_until([&] {
      connected =
          connect(fd, reinterpret_cast<const struct sockaddr*>(&address), sizeof address) == 0;
      return connected || daemon_.has_ended();
    });
    if (connected) return fd;
    if (!settled && may_give_up_) gave_up_ = true;
    if (!settled && !may_give_up_) problems_.push_back("does not serve");
    close(fd);
    return -1;
  }

  TracedDaemon& daemon_;
  std::vector<std::string>& problems_;
  bool may_give_up_;
  bool gave_up_ = false;
};

long now() {
  struct timespec time;
  clock_gettime(CLOCK_MONOTONIC, &time);
  return time.tv_sec * 1000 * kMillisecond + time.tv_nsec;
}

// Nanoseconds of processor time of the daemon and the children that run its code.
long processor_time() {
  long total = 0;
  for (const std::string& name : list("/proc")) {
    if (atoi(name.c_str()) <= 0) continue;
    char program[128] = {};
    const std::string folder = "/proc/" + name;
    if (readlink((folder + "/exe").c_str(), program, sizeof program - 1) == -1) continue;
    if (program != std::string(kJail) + kProgram) continue;
    for (const std::string& task : list(folder + "/task")) {
      total += atol(read_facts(folder + "/task/" + task + "/schedstat").c_str());
    }
  }
  return total;
}

// Waits until the daemon has nothing more to do. The tracer alone can make a sampler look busy.
bool settle() {
  return wait_until([] {
    long before = processor_time(), start = now();
    usleep(kWindow / 1000);
    return (processor_time() - before) * 100 < (now() - start) * kBusyPercent;
  });
}

class Story {
 public:
  Story(const Fault* fault, const std::string& traced, Life& life)
      : life_(life),
        daemon_(fault, traced),
        client_(daemon_, life.problems, fault != nullptr && fault->lasting) {}

  void tell(Outside& outside) {
    int ends[] = {open("/nodes/kmsg", O_RDWR | O_CLOEXEC),
                  open("/nodes/qsee_log", O_RDWR | O_CLOEXEC),
                  open("/nodes/tz_log", O_RDWR | O_CLOEXEC)};
    client_.send("CHANGEPATH");  // carried out once the start and its capture are behind it
    const std::string block(2500, 'k');
    for (int end : ends) write(end, block.data(), block.size());
    make_artefacts(outside);
    for (const char* command :
         {"CACHECLEAR", "BUGREPORT", "WIFI_SNIFFLOG_START", "OEM_GPS_DEBUG_ENABLE",
          "OEM_BT_DEBUG_ENABLE", "OEM_NFC_DEBUG_DISABLE", "LOGSTOP", "LOGBEGIN", "CPUTHERMAL",
          "WIFI_SNIFFLOG_STOP", "WIFI_SNIFFLOG_START", "STOPCPUTHERMAL"}) {
      client_.send(command);
    }
    for (int end : ends) write(end, block.data(), block.size());
    settle();
    for (const char* command : {"LOGSTOP", "DELETELOG"}) client_.send(command);
    settle();
    daemon_.let_go();
    if (!daemon_.has_ended()) serve_still();
    for (int end : ends) close(end);
    if (daemon_.has_ended()) life_.status = daemon_.status();
  }

  pid_t pid() const { return daemon_.pid(); }

 private:
  static void make_artefacts(Outside& outside) {
    for (const char* path :
         {"/data/tombstones/tombstone_00", "/data/anr/anr_1", "/data/anr/BATTERY_html.gz",
          "/data/media/0/Pictures/Screenshots/Screenshot_1", "/data/coredump/core.1",
          "/data/misc/display/raw_1", "/data/vendor/media/yuv_1", "/data/anr/anr_1"}) {
      write_file(path, "artefact");
      look_at(path, outside);
    }
    write_file("/data/system/entry", "artefact");
    rename("/data/system/entry", "/data/system/dropbox/entry");
    look_at("/data/system/dropbox/entry", outside);
  }

  // Untraced and undisturbed, commands are carried out.
  void serve_still() {
    client_.begin_anew();
    set_property("persist.sys.corvex.path", "elsewhere");
    client_.send("LOGBEGIN");
    const std::string root = "/storage/emulated/0/corvex";
    if (read_file(current_directory(root) + "/versionNumber").size() < 92) {
      life_.problems.emplace_back("does not begin a capture any more");
    }
    client_.send("LOGSTOP");
    if (client_.send("DELETELOG") != "CLEANSUCCESS") {
      life_.problems.emplace_back("does not delete logs any more");
    }
    if (!settle()) life_.problems.emplace_back("is busy without end");
  }

  Life& life_;
  TracedDaemon daemon_;
  Client client_;
};

}  // namespace

void prepare_root() {
  umount2("/dev/kmsg", MNT_DETACH);
  unlink("/dev/kmsg");
  run("ln -s /nodes/kmsg /dev/kmsg; mkdir -p /jail /real_proc /daemon_proc/tzdbg; cd /daemon_proc; "
      "ln -s /real_proc/self self; ln -s /nodes/qsee_log /nodes/tz_log tzdbg; ln -s "
      "/nodes/bootloader_log /nodes/proc_transactions /nodes/proc_transaction_log "
      "/nodes/proc_state .; echo quiet > cmdline");
  if (mount("proc", "/real_proc", "proc", 0, nullptr) != 0 ||
      mount("/", kJail, nullptr, MS_BIND | MS_REC, nullptr) != 0 ||
      // The tracer's unwinder looks from the daemon's root for the names that it sees from its own.
      mount("/", "/jail/jail", nullptr, MS_BIND | MS_REC, nullptr) != 0 ||
      mount("/daemon_proc", "/jail/proc", nullptr, MS_BIND, nullptr) != 0) {
    perror("mount");
    _exit(1);
  }
}

Life live(const Fault* fault, const std::string& traced) {
  Life life;
  write_file("/device.sh", kDevice);
  run(std::string("sh /device.sh ") + kPartition);
  unlink("/device.sh");
  LogCatcher log;
  log.start();
  PropertyService service;
  Outside before, after;
  look_at("/", before);
  {
    Story story(fault, traced, life);
    const std::string main_trace = kTraces + ("/t." + std::to_string(story.pid()));
    story.tell(before);
    for (const std::string& name : list(kTraces)) {
      const std::string file = std::string(kTraces) + "/" + name;
      read_trace(file, file == main_trace, fault != nullptr, life.calls);
    }
  }
  look_at("/", after);
  compare(before, after, life.problems);
  for (const auto& [key, value] : service.requests()) {
    // A request without a value was cut short by the end of the daemon.
    if (*value.c_str() != '\0' && !may_be_set(key, value))
      life.problems.push_back("sets " + key + " to " + value);
  }
  if (!partition_is_sound()) life.problems.emplace_back("the partition is neither log nor zeros");
  life.log = log.texts();
  return life;
}

}  // namespace corvexd::faults
