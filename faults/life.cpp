#include "faults/life.h"

#include <dirent.h>
#include <fcntl.h>
#include <signal.h>
#include <stdlib.h>
#include <string.h>
#include <sys/mount.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/un.h>
#include <sys/wait.h>
#include <time.h>
#include <unistd.h>

#include <algorithm>
#include <fstream>
#include <map>
#include <memory>
#include <set>

#include "tests/daemon.h"
#include "tests/device_root.h"
#include "tests/files.h"
#include "tests/log_catcher.h"
#include "tests/property_service.h"

namespace corvexd::faults {
namespace {

using namespace test;  // NOLINT(google-build-using-namespace): the device and its helpers

constexpr char kProgram[] = "/build/faults/corvexd_gated";
// The daemon's root is the device's once more, but with firmware nodes in its /proc. The tracer,
// which needs the true one, sees the daemon's files below this.
constexpr char kJail[] = "/jail";
constexpr char kTracer[] = "/usr/bin/strace";
constexpr char kTraces[] = "/trace";
constexpr char kPartition[] = "/dev/block/platform/soc/624000.ufshc/by-name/reserve1";
constexpr int kPatience = 15;  // seconds, for what takes milliseconds
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

long now() {
  struct timespec time;
  clock_gettime(CLOCK_MONOTONIC, &time);
  return time.tv_sec * 1000 * kMillisecond + time.tv_nsec;
}

// Asks until it is so, or patience ends.
template <typename Done>
bool wait_until(const Done& done) {
  const long end = now() + kPatience * 1000 * kMillisecond;
  while (!done()) {
    if (now() > end) return false;
    usleep(1000);
  }
  return true;
}

// A file of /proc, whose process may end at any moment.
std::string read_facts(const std::string& path) {
  char text[4096];
  int fd = open(path.c_str(), O_RDONLY | O_CLOEXEC);
  ssize_t size = fd == -1 ? -1 : read(fd, text, sizeof text);
  if (fd != -1) close(fd);
  return {text, static_cast<size_t>(std::max<ssize_t>(size, 0))};
}

bool ends_with(const std::string& text, const std::string& end) {
  return text.size() >= end.size() && text.compare(text.size() - end.size(), end.size(), end) == 0;
}

// What stands outside the places that the daemon writes to: each path with all there is to it.
using Outside = std::map<std::string, std::string>;

bool is_ours_or_the_daemons(const std::string& path) {
  static const std::set<std::string> paths = {"/usr",
                                              "/build",
                                              "/proc",
                                              "/daemon_proc",
                                              "/real_proc",
                                              kJail,
                                              "/trace",
                                              "/probe",
                                              "/nodes",
                                              "/dev/socket",
                                              "/data/corvex",
                                              "/storage/emulated/0/corvex",
                                              "/dev/__properties__",
                                              "/cache/boot_log",
                                              "/cache/log_before_initial",
                                              kPartition};
  return paths.count(path) != 0;
}

void look_at(const std::string& path, Outside& outside) {
  // What sets properties leaves a draft behind when the daemon ends in the middle of a request.
  if (is_ours_or_the_daemons(path) || path.rfind("/dev/draft.", 0) == 0) return;
  struct stat status;
  if (lstat(path.c_str(), &status) != 0) return;
  std::string facts = "mode " + std::to_string(status.st_mode) + " owner " +
                      std::to_string(status.st_uid) + ":" + std::to_string(status.st_gid);
  if (S_ISREG(status.st_mode)) facts += " content " + read_file(path);
  outside[path] = facts;
  if (!S_ISDIR(status.st_mode)) return;
  for (const std::string& name : list(path)) {
    look_at((path == "/" ? "" : path) + "/" + name, outside);
  }
}

void compare(const Outside& before, const Outside& after, std::vector<std::string>& problems) {
  for (const auto& [path, facts] : before) {
    auto found = after.find(path);
    if (found == after.end()) {
      problems.push_back("removed: " + path);
    } else if (found->second != facts) {
      problems.push_back("changed: " + path);
    }
  }
  for (const auto& [path, facts] : after) {
    if (before.count(path) != 0) continue;
    problems.push_back("made: " + path);
    run("rm -rf '" + path + "'");  // for the next life
  }
}

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

std::vector<std::string> words(const std::string& text, char separator) {
  std::vector<std::string> parts;
  size_t start = 0;
  for (size_t end; (end = text.find(separator, start)) != std::string::npos; start = end + 1) {
    parts.push_back(text.substr(start, end - start));
  }
  parts.push_back(text.substr(start));
  return parts;
}

pid_t start_program(const std::vector<std::string>& arguments) {
  pid_t pid = fork();
  if (pid != 0) return pid;
  int null = open("/dev/null", O_RDWR | O_CLOEXEC);
  for (int fd : {0, 1, 2}) dup2(null, fd);
  std::vector<char*> vector;
  for (const std::string& text : arguments) vector.push_back(const_cast<char*>(text.c_str()));
  vector.push_back(nullptr);
  execv(vector[0], vector.data());
  _exit(127);
}

// The daemon at its gate, started as init does it, and in a session by which all its descendants
// are found.
class TracedDaemon {
 public:
  TracedDaemon(const Fault* fault, const std::string& traced) {
    const struct sockaddr_un address = {AF_UNIX, "/dev/socket/corvexd"};
    int fd = socket(AF_UNIX, SOCK_STREAM, 0);
    (void)bind(fd, reinterpret_cast<const struct sockaddr*>(&address), sizeof address);
    setenv("ANDROID_SOCKET_corvexd", std::to_string(fd).c_str(), 1);
    if (fault != nullptr) setenv(kShieldVariable, std::to_string(fault->number).c_str(), 1);
    pid_ = fork();
    if (pid_ == 0) run(fd);
    unsetenv(kShieldVariable);
    close(fd);
    int status;
    waitpid(pid_, &status, WUNTRACED);
    attach(fault, traced);
    kill(pid_, SIGCONT);
  }

  ~TracedDaemon() {
    let_go();
    // Whoever is forked meanwhile is found the next time round.
    while (kill_session()) usleep(1000);
    if (!ended_) waitpid(pid_, nullptr, 0);
  }

  TracedDaemon(const TracedDaemon&) = delete;
  TracedDaemon& operator=(const TracedDaemon&) = delete;

  pid_t pid() const { return pid_; }

  bool has_ended() {
    if (!ended_ && waitpid(pid_, &status_, WNOHANG) == pid_) ended_ = true;
    return ended_;
  }

  // As a shell shows it.
  int status() const { return WIFEXITED(status_) ? WEXITSTATUS(status_) : 128 + WTERMSIG(status_); }

  // Takes the tracer away; the daemon goes on.
  void let_go() {
    if (tracer_ <= 0) return;
    kill(tracer_, SIGINT);
    if (!wait_until([&] { return waitpid(tracer_, nullptr, WNOHANG) == tracer_; })) {
      kill(tracer_, SIGKILL);
      waitpid(tracer_, nullptr, 0);
    }
    tracer_ = 0;
  }

 private:
  [[noreturn]] static void run(int fd) {
    setsid();
    if (chroot(kJail) != 0 || chdir("/") != 0) _exit(126);
    int null = open("/dev/null", O_RDWR | O_CLOEXEC);
    for (int standard : {0, 1, 2}) dup2(null, standard);
    close_range(3, fd - 1, 0);
    close_range(fd + 1, ~0u, 0);
    setenv("PATH", "/system/bin:/bin", 1);
    execl(kProgram, kProgram, nullptr);
    _exit(127);
  }

  void attach(const Fault* fault, const std::string& traced) {
    // Programs that the daemon executes are let go of; they are not tried out here.
    std::vector<std::string> arguments = {kTracer, "-ff",
                                          "-y",    "-k",
                                          "-b",    "execve",
                                          "-e",    "signal=none",
                                          "-o",    std::string(kTraces) + "/t",
                                          "-p",    std::to_string(pid_)};
    if (fault == nullptr) {
      arguments.insert(arguments.end(), {"-e", "trace=" + traced});
    } else {
      int when = fault->when + (fault->in_main ? kShieldCalls : 0);
      std::string lasting;
      if (fault->lasting) lasting = fault->in_main ? "+" : ".." + std::to_string(kShieldCalls);
      arguments.insert(arguments.end(), {"-e", "trace=" + fault->call, "-e",
                                         "inject=" + fault->call + ":" + fault->outcome +
                                             ":when=" + std::to_string(when) + lasting});
      // Unwinding each call's stack takes a while; only what fails is of interest.
      if (fault->outcome.rfind("error=", 0) == 0) {
        arguments.insert(arguments.end(), {"-e", "status=failed"});
      }
    }
    tracer_ = start_program(arguments);
    const std::string status = "/proc/" + std::to_string(pid_) + "/status";
    wait_until([&] { return read_facts(status).find("TracerPid:\t0") == std::string::npos; });
    usleep(3000);
  }

  bool kill_session() const {
    bool any = false;
    for (const std::string& name : list("/proc")) {
      pid_t pid = atoi(name.c_str());
      if (pid <= 0) continue;
      const std::string status = read_facts("/proc/" + name + "/stat");
      size_t end = status.rfind(") ");
      if (end == std::string::npos || status[end + 2] == 'Z') continue;
      // Behind the name: state, parent, group, session.
      if (atoi(words(status.substr(end + 2), ' ')[3].c_str()) != pid_) continue;
      kill(pid, SIGKILL);
      any = true;
    }
    return any;
  }

  pid_t pid_ = 0, tracer_ = 0;
  bool ended_ = false;
  int status_ = 0;
};

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

// Waits until the daemon has nothing more to do.
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
    wait_for_copies();
    for (const char* command : {"LOGSTOP", "DELETELOG"}) client_.send(command);
    wait_for_copies();
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

  void wait_for_copies() {
    if (!daemon_.has_ended() && !settle() && !daemon_.has_ended()) {
      life_.problems.emplace_back("is busy without end");
    }
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

std::string between(const std::string& text, char first, char last) {
  size_t start = text.find(first);
  size_t end = text.find(last, start + 1);
  return start == std::string::npos || end == std::string::npos
             ? ""
             : text.substr(start + 1, end - start - 1);
}

std::string path_of(const std::string& name, const std::string& line) {
  static const std::set<std::string> on_descriptors = {"read", "write", "fchown", "fchmod"};
  std::string folder = between(line, '<', '>');
  if (folder.rfind(kJail, 0) == 0) folder.erase(0, strlen(kJail));
  if (on_descriptors.count(name) != 0) return folder;
  const std::string path = between(line, '"', '"');
  bool is_relative = !path.empty() && path[0] != '/';
  return is_relative ? folder + "/" + path : path;
}

Call read_call(const std::string& line) {
  Call call;
  call.name = line.substr(0, line.find('('));
  call.injected = ends_with(line, "(INJECTED)");
  call.path = path_of(call.name, line);
  size_t result = line.rfind(" = -1 E");
  if (result != std::string::npos) call.error = between(line.substr(result), '(', ')');
  return call;
}

// A line for each call, and below it one for each caller.
void read_trace(const std::string& file, bool in_main, bool injected_only, Life& life) {
  std::ifstream lines(file);
  std::map<std::string, int> counts;
  bool wanted = false;
  for (std::string line; std::getline(lines, line);) {
    if (line.rfind(" > ", 0) != 0) {
      wanted = line.find('(') != std::string::npos && line.rfind("+++", 0) != 0 &&
               (!injected_only || ends_with(line, "(INJECTED)"));
      if (!wanted) continue;
      life.calls.push_back(read_call(line));
      life.calls.back().in_main = in_main;
      life.calls.back().when = ++counts[life.calls.back().name];
    } else if (wanted && line.find(kProgram) != std::string::npos) {
      life.calls.back().functions.push_back(between(line, '(', '+'));
      life.calls.back().site += between(line, '[', ']') + " ";
    }
  }
  // The shield's calls are nobody's.
  life.calls.erase(std::remove_if(life.calls.begin(), life.calls.end(),
                                  [](const Call& call) {
                                    return std::any_of(call.functions.begin(), call.functions.end(),
                                                       [](const std::string& function) {
                                                         return function.find("wait_at_gate") !=
                                                                std::string::npos;
                                                       });
                                  }),
                   life.calls.end());
}

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
      read_trace(file, file == main_trace, fault != nullptr, life);
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

std::string describe(const Fault& fault) {
  return fault.call + ":" + fault.outcome + ":when=" + std::to_string(fault.when) +
         (fault.lasting ? "+" : "") + (fault.in_main ? " of the main thread" : " of the others");
}

}  // namespace corvexd::faults
