// The daemon is root among files that others can write. Here one of them does what they can to them
// while it works: nothing outside may change, nothing secret come to light, nothing hang.
#include <dirent.h>
#include <fcntl.h>
#include <grp.h>
#include <signal.h>
#include <string.h>
#include <sys/mman.h>
#include <sys/mount.h>
#include <sys/resource.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <time.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <iterator>
#include <random>
#include <sstream>

#include "tests/daemon.h"
#include "tests/device_root.h"
#include "tests/files.h"
#include "tests/property_service.h"

namespace corvexd::test {
namespace {

constexpr char kSecret[] = "what root alone may read";
constexpr off_t kEndless = 4 << 20;  // bytes: nothing here grows to that unless it never ends
constexpr rlim_t kLargest = 4 * kEndless;
constexpr int kDeadline = 20;  // seconds
constexpr int kCommandsPerLife = 30;
constexpr uid_t kSystemUser = 1000;

Texts words(const std::string& text) {
  std::istringstream all(text);
  return {std::istream_iterator<std::string>(all), {}};
}

const Texts kWords = words(
    "LOGBEGIN LOGBEGIN LOGSTOP BUGREPORT CPUTHERMAL CHANGEPATH STOPCPUTHERMAL DELETELOG "
    "CACHECLEAR");
const Texts kInside = words("/data /storage /cache /proc /dev /sys /probe /tmp /usr /build");

// Where artefacts arrive, and a name that counts there.
const Texts kWatched = words(
    "/data/tombstones /data/anr /data/system/dropbox /data/misc/display /data/media/0/Pictures "
    "/data/media/0/Pictures/Screenshots /data/coredump /data/vendor/media");
const Texts kArtefacts =
    words("tombstone_00 anr_1 x_html.gz raw_1 Screenshots Screenshot_1.png core.1 x.yuv");

// What the daemon makes and looks for.
const Texts kNames = words(
    "corvex versionNumber getprop.txt kernel.log kernel.log.1 kernel.log.2 qsee.log boot_log anr "
    "dropbox tombstones Screenshots coredump rawdata media BatteryHistory kv_tsen_data .nomedia "
    "dumpsys_input transactions fileAfter911 recovery kmsg tombstone_00 anr_1 anr_trace core.1 "
    "raw_1 x.yuv x_html.gz entry");
// The same as strftime(3) takes it, but that "?" is a digit and "!" a line end; and what a shell
// would run.
const Texts kMadeNames = words(
    "%Y-%m-%d-%H-%M-%S %Y-%m-%d-%H-%M-%S-BUGREPORT.log %Y%-m%-d_%-H%-M%-S a_current "
    "KVBR_?--%Y-%m-%d-%H-%M-%S_current KVBR_?--%Y-%m-%d-%H-%M-%S x;>pwned1;_current "
    "$(>pwned2)_current `>pwned3`_current !>pwned4!_current ';>pwned5;'_current "
    "\";>pwned6;\"_current "
    "a&>pwned7&_current");

const Texts kTargets = words(
    "/outside/secret /outside/canary /outside/dir /outside/new /dev/zero /dev/full /dev/null / ..");

using Act = int (*)(const char* one, const char* other);
constexpr Act kActs[] = {[](const char* one, const char*) { return mkdir(one, 0777); },
                         [](const char* one, const char*) { return mkfifo(one, 0666); },
                         [](const char* one, const char*) { return truncate(one, 500); },
                         [](const char* one, const char*) { return unlink(one); },
                         [](const char* one, const char*) { return rmdir(one); },
                         [](const char* one, const char* other) { return rename(one, other); },
                         [](const char* one, const char* other) { return link(one, other); },
                         [](const char* one, const char*) {
                           const int fd = open(one, O_WRONLY | O_CREAT | O_NONBLOCK, 0666);
                           const ssize_t written = write(fd, one, strlen(one));
                           return close(fd) == 0 && written > 0 ? 0 : -1;
                         },
                         // Back and forth: what was looked at is not what is opened.
                         [](const char* one, const char* other) {
                           int failed = 0;
                           for (int times = 0; times < 9 && failed == 0; ++times) {
                             failed = renameat2(AT_FDCWD, one, AT_FDCWD, other, RENAME_EXCHANGE);
                           }
                           return failed;
                         }};

struct World {
  const char* name;
  uid_t user;
  const char* log_root;  // as the property names it
  Texts places;          // that the user can write to, besides the watched directories
};

const World kWorlds[] = {{"AnApplicationOnSharedStorage", 10001, "shared",
                          words("/storage/emulated/0 /storage/emulated/0/corvex")},
                         {"TheSystemUser", kSystemUser, "data",
                          words("/data /data/corvex /cache/boot_log /cache/recovery /cache/lkmsg "
                                "/cache/log_before_initial")}};

void PrintTo(const World& world, std::ostream* out) { *out << world.name; }

using Visit = std::function<bool(int parent, const char* name, const struct stat&, std::string)>;

// Visits an entry and, while the visitor agrees, what is below. Nobody can lead the walk elsewhere.
void walk(int parent, const char* name, const std::string& path, const Visit& visit) {
  struct stat status;
  if (fstatat(parent, name, &status, AT_SYMLINK_NOFOLLOW) != 0) return;
  if (!visit(parent, name, status, path) || !S_ISDIR(status.st_mode)) return;
  const int fd = openat(parent, name, O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC);
  DIR* directory = fd == -1 ? nullptr : fdopendir(fd);
  if (directory == nullptr) return;
  while (struct dirent* entry = readdir(directory)) {
    const std::string below = entry->d_name;
    if (below != "." && below != "..") walk(fd, entry->d_name, path + "/" + below, visit);
  }
  closedir(directory);
}

// A line for everything that only root may change.
Texts outside() {
  Texts lines;
  walk(AT_FDCWD, "/", "", [&](int, const char*, const struct stat& status, const auto& path) {
    if (std::count(kInside.begin(), kInside.end(), path) > 0) return false;
    char line[128];
    snprintf(line, sizeof line, " mode %o owner %u:%u modified %lld.%09ld ", status.st_mode,
             status.st_uid, status.st_gid, static_cast<long long>(status.st_mtim.tv_sec),
             status.st_mtim.tv_nsec);
    lines.push_back(path + line + (S_ISREG(status.st_mode) ? read_file(path) : ""));
    return true;
  });
  std::sort(lines.begin(), lines.end());
  return lines;
}

Texts changed(const Texts& before, const Texts& after) {
  Texts lines;
  std::set_symmetric_difference(before.begin(), before.end(), after.begin(), after.end(),
                                std::back_inserter(lines));
  return lines;
}

// The files, where others can read, that hold the secret or grow without end.
Texts exposed() {
  Texts found;
  for (const char* top : {"/data", "/storage", "/cache"}) {
    walk(AT_FDCWD, top, top, [&](int parent, const char* name, const auto& status, auto path) {
      // Nothing else is opened: who waits for a FIFO is to be found waiting.
      if (!S_ISREG(status.st_mode)) return true;
      if (status.st_size > kEndless) found.push_back(path + " grows without end");
      const int fd = openat(parent, name, O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC);
      if (read_to_end(fd).find(kSecret) != std::string::npos) found.push_back(path + " tells it");
      close(fd);
      return true;
    });
  }
  return found;
}

// Whether the daemon has ended. With status 1 it may: init starts it again.
bool has_given_up(pid_t daemon) {
  siginfo_t info = {};
  waitid(P_PID, daemon, &info, WEXITED | WNOHANG | WNOWAIT);
  if (info.si_pid == 0) return false;
  EXPECT_TRUE(info.si_code == CLD_EXITED && info.si_status == 1)
      << "the daemon ended with status or signal " << info.si_status;
  return true;
}

// Whether the daemon runs the command to its end, or itself ends, in time.
bool returns(const std::string& word, pid_t daemon) {
  const int connection = try_to_connect();
  const struct timeval second = {1, 0};
  setsockopt(connection, SOL_SOCKET, SO_RCVTIMEO, &second, sizeof second);
  const std::string bytes = message(word);
  send(connection, bytes.data(), bytes.size(), MSG_NOSIGNAL);
  shutdown(connection, SHUT_WR);
  bool done = false;
  for (int i = 0; i < kDeadline && !done; ++i) {
    char answer[64];
    ssize_t size;
    while ((size = recv(connection, answer, sizeof answer, 0)) > 0) {
    }
    done = size == 0 || errno != EAGAIN || has_given_up(daemon);
  }
  close(connection);
  return done;
}

class HostileUser {
 public:
  HostileUser(const World& world, unsigned seed) : places_(world.places), random_(seed) {
    places_.insert(places_.end(), kWatched.begin(), kWatched.end());
    longest_rest_ = 1u << below(13);  // microseconds
  }

  // Does something at random; whether it worked.
  bool act() {
    usleep(below(longest_rest_));
    const std::string one = path(), other = path();
    const size_t which = below(std::size(kActs) + 3);
    if (which < std::size(kActs)) return kActs[which](one.c_str(), other.c_str()) == 0;
    const std::string target = below(3) == 0 ? other : any_of(kTargets);
    return symlink(target.c_str(), one.c_str()) == 0;
  }

 private:
  size_t below(size_t end) { return random_() % end; }
  const std::string& any_of(const Texts& texts) { return texts[below(texts.size())]; }

  // A place or, more often, a directory a level or two below.
  std::string directory() {
    std::string path = any_of(places_);
    for (int level = 0; level < 2 && below(4) != 0; ++level) {
      const Texts names = list(path);
      if (names.empty()) break;
      const std::string deeper = path + "/" + any_of(names);
      struct stat status;
      if (lstat(deeper.c_str(), &status) == 0 && S_ISDIR(status.st_mode)) path = deeper;
    }
    return path;
  }

  // What is there, or what may be looked for in this second or the next ones. The daemon waits for
  // the layout's version at its start, so nothing could be seen without.
  std::string path() {
    const std::string parent = directory();
    const Texts names = list(parent);
    if (!names.empty() && below(2) == 0) {
      const std::string& name = any_of(names);
      if (name != ".layout_version") return parent + "/" + name;
    }
    char name[128];
    const time_t when = time(nullptr) + static_cast<time_t>(below(3));
    struct tm parts;
    strftime(name, sizeof name, any_of(below(2) == 0 ? kNames : kMadeNames).c_str(),
             localtime_r(&when, &parts));
    std::replace(name, name + strlen(name), '?', static_cast<char>('1' + below(6)));
    std::replace(name, name + strlen(name), '!', '\n');
    return parent + "/" + name;
  }

  Texts places_;
  std::mt19937 random_;
  size_t longest_rest_;
};

class Hostile : public DeviceTest, public testing::WithParamInterface<World> {
 protected:
  void SetUp() override {
    if (!owners_work()) GTEST_SKIP() << "Without root there is no other user to be hostile.";
    // The host's own: a daemon that is led astray would change it.
    for (const char* lent : {"/usr", "/build", "/dev/null", "/dev/zero", "/dev/full"}) {
      ASSERT_EQ(0, mount(nullptr, lent, nullptr, MS_REMOUNT | MS_BIND | MS_RDONLY, nullptr));
    }
    setenv("ASAN_OPTIONS", "exitcode=70", 0);  // not the 1 that the daemon may end with
    getrlimit(RLIMIT_FSIZE, &file_size_);
    const struct rlimit small = {kLargest, file_size_.rlim_max};
    setrlimit(RLIMIT_FSIZE, &small);
    install_probes("brief");
    for (const char* tool : {"getprop", "dumpsys", "bugreport"}) {
      write_script(std::string("/system/bin/") + tool, "echo told by $0");
    }
    umount2("/dev/kmsg", MNT_DETACH);
    run("rm -f /dev/kmsg && mkfifo /dev/kmsg");
    kernel_ = open("/dev/kmsg", O_RDWR | O_NONBLOCK | O_CLOEXEC);
    set_property("persist.sys.assert.panic", "true");
    set_property("persist.sys.kernel.logsize", "1");
    set_property("persist.sys.corvex.path", GetParam().log_root);
    switch_on({"kernel", "kernel.kmsg", "main"});
    run("umask 022 && rm -rf /outside && mkdir -p /outside/dir && cd /outside && "
        "echo kept | tee canary >dir/kept && (umask 077 && echo '" +
        std::string(kSecret) + "' >secret)");
    void* shared =
        mmap(nullptr, sizeof *acts_, PROT_READ | PROT_WRITE, MAP_SHARED | MAP_ANONYMOUS, -1, 0);
    acts_ = new (shared) std::atomic<long>(0);
  }

  void TearDown() override {
    if (acts_ == nullptr) return;
    munmap(acts_, sizeof *acts_);
    close(kernel_);
    setrlimit(RLIMIT_FSIZE, &file_size_);
    run("rm -rf /outside");
  }

  // One life of the daemon, with all that others can write made anew.
  void live(unsigned seed, time_t end) {
    const std::vector<int> watched = provide_places();
    const Texts before = outside();
    become_hostile(seed);
    BootingDaemon daemon;
    ++lives_;
    EXPECT_TRUE(eventually([&] {
      const int connection = try_to_connect();
      close(connection);
      return connection != -1 || has_given_up(daemon.pid());
    }));
    std::mt19937 random(seed);
    for (int i = 0; i < kCommandsPerLife && time(nullptr) < end && !HasFailure(); ++i) {
      feed(watched, random() % watched.size(), random() % 3 == 0);
      const std::string& word = kWords[random() % kWords.size()];
      if (word == "DELETELOG") check(before);  // it takes the evidence away
      if (has_given_up(daemon.pid())) break;
      EXPECT_TRUE(returns(word, daemon.pid())) << word << " does not return";
      ++commands_;
    }
    check(before);
    for (int directory : watched) close(directory);
    copies_ += log.count("corvexd: copy_file '");
    end_everybody();
  }

  std::atomic<long>* acts_ = nullptr;  // shared with whoever is hostile
  int commands_ = 0, lives_ = 0;
  size_t copies_ = 0;

 private:
  // The descriptors of the watched directories.
  std::vector<int> provide_places() {
    std::string all;
    for (const Texts& paths : {GetParam().places, kWatched}) {
      for (const std::string& path : paths) all += " " + path;
    }
    run("umask 022 && rm -rf /data /cache /storage && mkdir -p /data/corvex /cache" + all +
        " && chmod 777" + all + " && chown " + std::to_string(GetParam().user) + all);
    make_device_ready();
    clear_probe_reports();
    log.clear();
    std::vector<int> watched;
    for (const std::string& path : kWatched) {
      watched.push_back(open(path.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    }
    return watched;
  }

  void become_hostile(unsigned seed) {
    const uid_t user = GetParam().user;
    // Shared storage shows all that is in it as the application's own.
    if (user != kSystemUser && fork() == 0) {
      for (;; usleep(500)) {
        walk(AT_FDCWD, "/storage", "", [&](int parent, const char* name, auto& status, auto) {
          if (status.st_uid == user) return true;
          return fchownat(parent, name, user, user, AT_SYMLINK_NOFOLLOW) == 0;
        });
      }
    }
    if (fork() != 0) return;
    close_range(3, ~0u, 0);
    umask(0);
    if (setgroups(0, nullptr) != 0 || setgid(user) != 0 || setuid(user) != 0) _exit(1);
    for (HostileUser self(GetParam(), seed);;) *acts_ += self.act();
  }

  // What the system adds: an artefact, perhaps one that is moved, and lines of the kernel's; and
  // the end of a long pause. By descriptor, for the path may lead elsewhere by now.
  void feed(const std::vector<int>& watched, size_t which, bool moved) {
    const char* name = kArtefacts[which].c_str();
    const std::string content(3000, 'a');
    unlinkat(watched[which], name, 0);
    const int fd = openat(watched[which], name, O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0644);
    for (int to : {fd, kernel_}) {
      if (write(to, content.data(), content.size()) == -1) continue;  // they were faster
    }
    close(fd);
    if (moved) renameat(watched[which], name, watched[which], "entry");
    if (which == 0) write_file("/probe/end_pause_60", "");
  }

  void check(const Texts& before) {
    EXPECT_EQ(Texts{}, exposed());
    EXPECT_EQ(Texts{}, changed(before, outside()));
  }

  void end_everybody() {
    EXPECT_TRUE(eventually([] {
      const bool nobody = kill(-1, SIGKILL) != 0;
      while (waitpid(-1, nullptr, WNOHANG) > 0) {
      }
      return nobody;
    }));
  }

  PropertyService service_;
  struct rlimit file_size_ = {};
  int kernel_ = -1;
};

TEST_P(Hostile, UserGainsAndBreaksNothing) {
  const char* given = getenv("CORVEX_HOSTILE_SECONDS");
  const time_t begin = time(nullptr), end = begin + (given == nullptr ? 3 : atoi(given));
  unsigned seed = static_cast<unsigned>(begin) * 1000;
  while (time(nullptr) < end && !HasFailure()) {
    SCOPED_TRACE("seed " + std::to_string(++seed));
    live(seed, end);
  }
  printf("%4ld s: %ld hostile acts, %d commands in %d lives of the daemon, %zu copies\n",
         static_cast<long>(time(nullptr) - begin), acts_->load(), commands_, lives_, copies_);
  if (HasFailure()) return;
  // Else the user was idle, or the daemon was.
  EXPECT_GT(acts_->load(), 100);
  EXPECT_GT(commands_, 5);
  EXPECT_GT(copies_, 0u);
}

INSTANTIATE_TEST_SUITE_P(Worlds, Hostile, testing::ValuesIn(kWorlds),
                         testing::PrintToStringParamName());

}  // namespace
}  // namespace corvexd::test
