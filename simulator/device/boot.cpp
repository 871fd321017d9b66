#include <android-base/unique_fd.h>
#include <fcntl.h>
#include <limits.h>
#include <poll.h>
#include <sched.h>
#include <signal.h>
#include <stdio.h>
#include <sys/prctl.h>
#include <sys/signalfd.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include "simulator/device/commands.h"
#include "simulator/device/device_lock.h"
#include "simulator/device/root_files.h"
#include "simulator/device/root_mounts.h"
#include "simulator/device/user_map.h"

using android::base::unique_fd;

namespace corvexd::sim {

const char* const kDeviceEnvironment[] = {
    "PATH=/system/bin:/system/xbin:/vendor/bin:/usr/bin:/bin:/usr/sbin:/sbin",
    "ANDROID_ROOT=/system",
    "ANDROID_DATA=/data",
    "HOME=/data",
    "TMPDIR=/data/local/tmp",
    nullptr,
};

namespace {

constexpr int kReadyFd = 3;      // as init knows it
constexpr int kPatience = 5000;  // milliseconds that init gets to shut down

// The build folder that this program stands in; where it is installed, a folder laid out the same.
std::string build_folder() {
  char path[PATH_MAX];
  ssize_t length = readlink("/proc/self/exe", path, sizeof path - 1);
  std::string folder(path, length > 0 ? length : 0);
  for (int i = 0; i < 2; ++i) folder.resize(folder.find_last_of('/'));
  return folder;
}

// The first process in the device's namespaces: makes its root and becomes its init.
[[noreturn]] void become_init(const std::string& root, const BootOptions& options, int mapped,
                              int ready) {
  char go;
  if (read(mapped, &go, 1) != 1) _exit(1);
  // The device does not outlive its keeper, whatever ends that.
  prctl(PR_SET_PDEATHSIG, SIGKILL);
  setsid();
  umask(022);
  std::string build = build_folder();
  if (!mount_root(root) || !make_root_files(options.encrypted) || !copy_programs(build) ||
      !mount_rest_and_enter()) {
    _exit(1);
  }
  int nothing = open("/dev/null", O_RDWR | O_CLOEXEC);
  dup2(nothing, STDIN_FILENO);
  if (options.quiet) dup2(nothing, STDERR_FILENO);
  dup2(STDERR_FILENO, STDOUT_FILENO);
  if (ready == kReadyFd) fcntl(ready, F_SETFD, 0);
  if (ready != kReadyFd) dup2(ready, kReadyFd);
  close_range(kReadyFd + 1, ~0u, 0);
  // The nodes are there before the first program that looks for them.
  const char* const arguments[] = {"/system/bin/make_nodes", "/init", nullptr};
  execve(arguments[0], const_cast<char**>(arguments), const_cast<char**>(kDeviceEnvironment));
  report_failure(arguments[0]);
  _exit(1);
}

// What the host does not let this device have.
void tell_limits(bool all_users) {
  if (geteuid() != 0) {
    fprintf(stderr, "corvex-device: without root the device sees no packets%s\n",
            unique_fd(open("/dev/kmsg", O_RDONLY | O_NONBLOCK)) == -1 ? " and no kernel log" : "");
  } else if (unique_fd(open("/dev/kmsg", O_RDONLY | O_NONBLOCK)) == -1) {
    fprintf(stderr, "corvex-device: this machine shows its kernel log to nobody here\n");
  }
  if (!all_users) {
    fprintf(stderr,
            "corvex-device: /etc/subuid and /etc/subgid give you no further users: "
            "everything in the device is root's\n");
  }
}

unique_fd take_stop_signals() {
  sigset_t stop;
  sigemptyset(&stop);
  for (int number : {SIGINT, SIGTERM, SIGHUP}) {
    signal(number, SIG_DFL);
    sigaddset(&stop, number);
  }
  sigprocmask(SIG_BLOCK, &stop, nullptr);
  return unique_fd(signalfd(-1, &stop, SFD_CLOEXEC));
}

// Which of the two is readable, or at its end, first; -1 when neither was in time.
int wait_for_one_of(int first, int second, int milliseconds) {
  struct pollfd polls[] = {{first, POLLIN, 0}, {second, POLLIN, 0}};
  int count = poll(polls, 2, milliseconds);
  if (count <= 0) return -1;
  return polls[0].revents != 0 ? first : second;
}

void end_device(pid_t init, int init_end) {
  kill(init, SIGTERM);
  if (wait_for_one_of(init_end, -1, kPatience) == -1) kill(init, SIGKILL);
  waitpid(init, nullptr, 0);
}

// Starts the device's init in its namespaces, as `*init`. Answers the pipe that brings a byte when
// the device is ready, holding none on failure.
unique_fd start_init(const std::string& root, const BootOptions& options, pid_t* init) {
  unique_fd mapped_read, mapped, ready, ready_write;
  if (!android::base::Pipe(&mapped_read, &mapped) || !android::base::Pipe(&ready, &ready_write)) {
    return unique_fd();
  }
  bool needs_users = geteuid() != 0;
  unsigned long namespaces = CLONE_NEWNS | CLONE_NEWPID | (needs_users ? CLONE_NEWUSER : 0);
  *init = static_cast<pid_t>(syscall(SYS_clone, namespaces | SIGCHLD, 0, 0, 0, 0));
  if (*init == 0) {
    mapped.reset();
    become_init(root, options, mapped_read, ready_write);
  }
  if (*init < 0) {
    fprintf(stderr, "corvex-device: this machine allows no namespaces here: %m\n");
    return unique_fd();
  }
  bool failed = false;
  tell_limits(!needs_users || map_users(*init, &failed));
  if (!failed && write(mapped, "+", 1) != 1) failed = true;
  return failed ? unique_fd() : std::move(ready);
}

}  // namespace

int boot_device(const std::string& root, const BootOptions& options) {
  unique_fd lock = lock_device(root);
  if (lock == -1) return 1;
  unique_fd signals = take_stop_signals();
  pid_t init = -1;
  unique_fd ready = start_init(root, options, &init);
  if (init < 0) return 1;
  unique_fd init_end(static_cast<int>(syscall(SYS_pidfd_open, init, 0)));
  char byte;
  bool started = ready != -1 && wait_for_one_of(signals, ready, -1) == ready &&
                 read(ready, &byte, 1) == 1 && publish_init(lock, init);
  if (started) {
    printf("device ready\n");
    fflush(stdout);
  }
  bool stopped = started && wait_for_one_of(signals, init_end, -1) == signals;
  end_device(init, init_end);
  if (started && !stopped) fprintf(stderr, "corvex-device: the device's init has ended\n");
  return stopped ? 0 : 1;
}

}  // namespace corvexd::sim
