#include "tests/device_root.h"

#include <fcntl.h>
#include <sched.h>
#include <signal.h>
#include <sys/mount.h>
#include <sys/prctl.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>

#include "tests/daemon.h"

namespace corvexd::test {
namespace {

bool entered_as_root;

void check(bool good, const char* what) {
  if (good) return;
  perror(what);
  _exit(1);
}

void map_to_root(uid_t uid, gid_t gid) {
  write_file("/proc/self/setgroups", "deny");
  write_file("/proc/self/uid_map", "0 " + std::to_string(uid) + " 1");
  write_file("/proc/self/gid_map", "0 " + std::to_string(gid) + " 1");
}

void bind_mount(const std::string& source, const std::string& target) {
  check(mount(source.c_str(), target.c_str(), nullptr, MS_BIND | MS_REC, nullptr) == 0,
        target.c_str());
}

void make_root(const std::string& root) {
  check(mount(nullptr, "/", nullptr, MS_REC | MS_PRIVATE, nullptr) == 0, "private mounts");
  check(mount("root", root.c_str(), "tmpfs", 0, "mode=0755") == 0, "tmpfs");
  for (const char* directory : {"/usr", "/build", "/proc", "/dev", "/etc", "/tmp"}) {
    mkdir((root + directory).c_str(), 0755);
  }
  for (const char* link : {"bin", "lib", "lib64", "sbin"}) {
    check(symlink((std::string("usr/") + link).c_str(), (root + "/" + link).c_str()) == 0, link);
  }
  bind_mount("/usr", root + "/usr");
  bind_mount(CORVEX_BUILD_DIR, root + "/build");
  check(mount("proc", (root + "/proc").c_str(), "proc", 0, nullptr) == 0, "proc");
  for (const char* device : {"null", "zero", "full", "urandom", "kmsg"}) {
    write_file(root + "/dev/" + device, "");
    bind_mount(std::string("/dev/") + device, root + "/dev/" + device);
  }
  write_file(root + "/etc/passwd", "root:x:0:0::/:/bin/sh\nsystem:x:1000:1000::/:/bin/sh\n");
  write_file(root + "/etc/group", "root:x:0:\nsystem:x:1000:\n");
  // The root of all mounts, so that a path reads the same from every mount namespace made in it.
  check(chdir(root.c_str()) == 0 && syscall(SYS_pivot_root, ".", ".") == 0 &&
            umount2(".", MNT_DETACH) == 0 && chdir("/") == 0,
        "pivot_root");
}

// Waits for every child that is left to this process; returns the status of `pid`.
int wait_for_all(pid_t pid) {
  int status;
  for (pid_t ended; (ended = wait(&status)) != pid;) check(ended > 0, "wait");
  return WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
}

}  // namespace

void enter_device_root() {
  uid_t uid = getuid();
  gid_t gid = getgid();
  entered_as_root = uid == 0;
  char root[] = "/tmp/corvex-test-XXXXXX";
  check(mkdtemp(root) != nullptr, root);
  const int old_root = open("/", O_PATH | O_CLOEXEC);
  check(unshare(CLONE_NEWNS | CLONE_NEWPID | (entered_as_root ? 0 : CLONE_NEWUSER)) == 0,
        "unshare");
  if (!entered_as_root) map_to_root(uid, gid);
  if (pid_t init = fork(); init != 0) {
    int status = wait_for_all(init);
    unlinkat(old_root, root + 1, AT_REMOVEDIR);
    _exit(status);
  }
  prctl(PR_SET_PDEATHSIG, SIGKILL);
  make_root(root);
  if (pid_t tests = fork(); tests != 0) _exit(wait_for_all(tests));
}

bool owners_work() { return entered_as_root; }

void make_empty_device() {
  run("rm -rf /data /cache /storage /system /vendor /probe /dev/socket /dev/__properties__");
  run("mkdir -p /data/corvex /cache /storage/emulated/0 /system/bin /system/xbin /vendor /probe "
      "/dev/socket /dev/__properties__");
}

DeviceTest::DeviceTest() {
  umask(077);
  signal(SIGCHLD, SIG_DFL);  // an earlier test's handler would reap what is waited for here
  make_empty_device();
  install_probes("live");
  log.start();
}

void set_property(const std::string& key, const std::string& value) {
  const std::string draft = "/dev/draft." + key;
  write_file(draft, value);
  rename(draft.c_str(), ("/dev/__properties__/" + key).c_str());
}

void switch_on(const Texts& names) {
  for (const std::string& name : names) set_property("persist.sys." + name, "yes");
}

}  // namespace corvexd::test
