#include <android-base/unique_fd.h>
#include <sched.h>
#include <signal.h>
#include <stdio.h>
#include <stdlib.h>
#include <sys/prctl.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include "simulator/device/commands.h"
#include "simulator/device/device_lock.h"

using android::base::unique_fd;

namespace corvexd::sim {
namespace {

constexpr int kNotRun = 125;
constexpr int kNotFound = 127;

bool shares_our_users(pid_t init) {
  struct stat ours, theirs;
  std::string path = "/proc/" + std::to_string(init) + "/ns/user";
  return stat("/proc/self/ns/user", &ours) == 0 && stat(path.c_str(), &theirs) == 0 &&
         ours.st_ino == theirs.st_ino;
}

[[noreturn]] void become_command(char** command) {
  prctl(PR_SET_PDEATHSIG, SIGKILL);
  const char* terminal = getenv("TERM");
  std::string terminal_entry = std::string("TERM=") + (terminal != nullptr ? terminal : "dumb");
  clearenv();
  for (const char* const* entry = kDeviceEnvironment; *entry != nullptr; ++entry) {
    putenv(const_cast<char*>(*entry));
  }
  putenv(terminal_entry.data());
  execvp(command[0], command);
  fprintf(stderr, "corvex-device: %s: %m\n", command[0]);
  _exit(kNotFound);
}

}  // namespace

int run_in_device(const std::string& root, char** command) {
  pid_t init = find_init(root);
  if (init == 0) {
    fprintf(stderr, "corvex-device: no device runs on %s\n", root.c_str());
    return kNotRun;
  }
  int namespaces = CLONE_NEWNS | CLONE_NEWPID | (shares_our_users(init) ? 0 : CLONE_NEWUSER);
  unique_fd process(static_cast<int>(syscall(SYS_pidfd_open, init, 0)));
  if (process == -1 || setns(process, namespaces) != 0) {
    fprintf(stderr, "corvex-device: cannot enter the device: %m\n");
    return kNotRun;
  }
  pid_t child = fork();
  if (child == 0) become_command(command);
  // An interrupt from the terminal is the command's to act on.
  signal(SIGINT, SIG_IGN);
  signal(SIGQUIT, SIG_IGN);
  int status;
  if (child < 0 || waitpid(child, &status, 0) != child) _exit(kNotRun);
  // At once: its children are born into another process namespace than its own, which the leak
  // check that a sanitizer makes at a usual end cannot cope with.
  _exit(WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status));
}

}  // namespace corvexd::sim
