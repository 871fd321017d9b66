#include "faults/traced_daemon.h"

#include <fcntl.h>
#include <signal.h>
#include <stdio.h>
#include <stdlib.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <sys/wait.h>

#include <algorithm>
#include <vector>

#include "faults/places.h"
#include "tests/files.h"

namespace corvexd::faults {
namespace {

constexpr char kTracer[] = "/usr/bin/strace";

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

[[noreturn]] void run(int fd) {
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

}  // namespace

// A file of /proc, whose process may end at any moment.
std::string read_facts(const std::string& path) {
  char text[4096];
  int fd = open(path.c_str(), O_RDONLY | O_CLOEXEC);
  ssize_t size = fd == -1 ? -1 : read(fd, text, sizeof text);
  if (fd != -1) close(fd);
  return {text, static_cast<size_t>(std::max<ssize_t>(size, 0))};
}

TracedDaemon::TracedDaemon(const Fault* fault, const std::string& traced) {
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

TracedDaemon::~TracedDaemon() {
  let_go();
  // Whoever is forked meanwhile is found the next time round.
  while (kill_session()) usleep(1000);
  if (!ended_) waitpid(pid_, nullptr, 0);
}

bool TracedDaemon::has_ended() {
  if (!ended_ && waitpid(pid_, &status_, WNOHANG) == pid_) ended_ = true;
  return ended_;
}

int TracedDaemon::status() const {
  return WIFEXITED(status_) ? WEXITSTATUS(status_) : 128 + WTERMSIG(status_);
}

void TracedDaemon::let_go() {
  if (tracer_ <= 0) return;
  kill(tracer_, SIGINT);
  if (!wait_until([&] { return waitpid(tracer_, nullptr, WNOHANG) == tracer_; })) {
    kill(tracer_, SIGKILL);
    waitpid(tracer_, nullptr, 0);
  }
  tracer_ = 0;
}

void TracedDaemon::attach(const Fault* fault, const std::string& traced) {
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

bool TracedDaemon::kill_session() const {
  bool any = false;
  for (const std::string& name : test::list("/proc")) {
    pid_t pid = atoi(name.c_str());
    if (pid <= 0) continue;
    const std::string status = read_facts("/proc/" + name + "/stat");
    const size_t name_end = status.rfind(") ");
    if (name_end == std::string::npos) continue;
    char state;
    pid_t session;
    // State, parent, group, session.
    sscanf(status.c_str() + name_end + 2, "%c %*d %*d %d", &state, &session);
    if (state == 'Z' || session != pid_) continue;
    kill(pid, SIGKILL);
    any = true;
  }
  return any;
}

}  // namespace corvexd::faults
