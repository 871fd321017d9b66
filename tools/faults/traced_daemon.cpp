#include "tools/faults/traced_daemon.h"

#include <fcntl.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/socket.h>
#include <sys/wait.h>

#include <algorithm>
#include <fstream>
#include <map>
#include <regex>

#include "tests/daemon.h"
#include "tests/files.h"
#include "tools/faults/device.h"

namespace corvexd::faults {
namespace {

using test::list, test::read_file;

constexpr int kLooks = 5;  // a stop for each call is over long before as many
constexpr int kLookPeriod = 10'000;
constexpr char kGone = 'X';

void use_null_for_standard_streams() {
  int null = open("/dev/null", O_RDWR | O_CLOEXEC);
  for (int fd : {0, 1, 2}) dup2(null, fd);
}

[[noreturn]] void run(int fd) {
  setsid();
  use_null_for_standard_streams();
  fcntl(fd, F_SETFD, 0);
  close_range(3, fd - 1, 0);
  close_range(fd + 1, ~0u, 0);
  setenv("PATH", "/system/bin:/bin", 1);
  unsetenv("TZ");
  execl(test::kDaemonWithNodes, test::kDaemonWithNodes, nullptr);
  _exit(127);
}

// The state of the process or thread that a folder of /proc tells of.
char state_of(const std::string& folder) {
  const std::string text = read_file(folder + "/stat");
  const size_t name_end = text.rfind(") ");
  return name_end == std::string::npos ? kGone : text[name_end + 2];
}

std::string tracer_command(const Fault* fault, const std::string& traced, pid_t pid) {
  // Programs that the daemon executes are let go of; they are not tried out here.
  std::string command = std::string("exec strace -ff -b execve -e signal=none -o ") + kTraces +
                        "/t -p " + std::to_string(pid);
  // Unwinding each call's stack takes a while; only what fails is of interest.
  if (fault == nullptr || fault->mode == Mode::kFail) command += " -k";
  if (fault == nullptr) return command + " -e trace=" + traced;
  std::string when = ":when=" + std::to_string(fault->when + (fault->in_main ? kReservedCalls : 0));
  if (fault->lasting) when += fault->in_main ? "+" : ".." + std::to_string(kReservedCalls);
  if (strncmp(fault->outcome, "error=", 6) == 0) command += " -e status=failed";
  return command + " -e trace=" + fault->call + " -e inject=" + fault->call + ":" + fault->outcome +
         when;
}

bool holds(const std::string& text, const char* part) {
  return text.find(part) != std::string::npos;
}

std::string between(const std::string& text, char first, char last) {
  size_t start = text.find(first) + 1;
  size_t end = text.find(last, start);
  return start == 0 || end == std::string::npos ? "" : text.substr(start, end - start);
}

// "corvexd::(anonymous namespace)::create(char const*)+0x41" is called create.
std::string plain_name(const std::string& function) {
  static const std::regex around("\\(anonymous namespace\\)::|corvexd::|[(+].*");
  return std::regex_replace(function, around, "");
}

// Adds the calls of one thread or process. A line for each call, and below it one for each caller.
void read_trace(const std::string& file, bool in_main, bool disturbed_only,
                std::vector<Call>& calls) {
  std::ifstream lines(file);
  std::map<std::string, int> counts;
  bool wanted = false;
  for (std::string line; std::getline(lines, line);) {
    if (line.rfind(" > ", 0) != 0) {
      bool disturbed = holds(line, "(INJECTED)") || holds(line, "(DELAYED)");
      wanted = holds(line, "(") && line.rfind("+++", 0) != 0 && (!disturbed_only || disturbed);
      const std::string name = line.substr(0, line.find('('));
      if (wanted) calls.push_back({in_main, ++counts[name], name, "", ""});
    } else if (wanted && holds(line, kProgram)) {
      const std::string function = line.substr(line.find('(') + 1);
      calls.back().callers = plain_name(function) + " " + calls.back().callers;
      calls.back().site += between(line, '[', ']') + " ";
    }
  }
  auto is_the_gates = [](const Call& call) { return holds(call.callers, "wait_at_gate"); };
  calls.erase(std::remove_if(calls.begin(), calls.end(), is_the_gates), calls.end());
}

}  // namespace

TracedDaemon::TracedDaemon(const Fault* fault, const std::string& traced)
    : only_disturbed_(fault != nullptr) {
  int fd = test::bound_socket(SOCK_STREAM, "/dev/socket/corvexd");
  setenv("ANDROID_SOCKET_corvexd", std::to_string(fd).c_str(), 1);
  if (fault != nullptr) setenv(kReservedVariable, std::to_string(fault->number).c_str(), 1);
  pid_ = fork();
  if (pid_ == 0) run(fd);
  unsetenv(kReservedVariable);
  close(fd);
  int status;
  waitpid(pid_, &status, WUNTRACED);
  if (fault != nullptr || !traced.empty()) attach(tracer_command(fault, traced, pid_));
  kill(pid_, SIGCONT);
}

void TracedDaemon::attach(const std::string& tracer) {
  tracer_ = fork();
  if (tracer_ == 0) {
    use_null_for_standard_streams();
    execl("/bin/sh", "sh", "-c", tracer.c_str(), nullptr);
    _exit(127);
  }
  const std::string status = "/proc/" + std::to_string(pid_) + "/status";
  wait_until([&] { return !holds(read_file(status), "TracerPid:\t0"); });
  usleep(3000);
}

bool TracedDaemon::has_ended() {
  std::lock_guard<std::mutex> lock(mutex_);
  if (!ended_ && waitpid(pid_, &status_, WNOHANG) == pid_) {
    ended_ = true;
    kill_all();
  }
  return ended_;
}

int TracedDaemon::status() const {
  return WIFEXITED(status_) ? WEXITSTATUS(status_) : 128 + WTERMSIG(status_);
}

std::vector<pid_t> TracedDaemon::processes() const {
  std::vector<pid_t> found;
  for (const std::string& name : list("/proc")) {
    const pid_t pid = atoi(name.c_str());
    if (pid > 0 && getsid(pid) == pid_ && state_of("/proc/" + name) != 'Z') found.push_back(pid);
  }
  return found;
}

std::map<std::string, char> TracedDaemon::task_states() const {
  std::map<std::string, char> states;
  for (pid_t pid : processes()) {
    const std::string folder = "/proc/" + std::to_string(pid) + "/task/";
    for (const std::string& task : list(folder)) states[task] = state_of(folder + task);
  }
  return states;
}

std::map<std::string, bool> TracedDaemon::tasks() const {
  std::map<std::string, bool> waiting;
  for (const auto& [task, state] : task_states()) {
    waiting[task] = state == 'S' || state == 'Z' || state == kGone;
  }
  return waiting;
}

bool TracedDaemon::is_held_up() const {
  std::map<std::string, int> stopped;
  for (int look = 0; look < kLooks; ++look) {
    for (const auto& [task, state] : task_states()) stopped[task] += state == 't';
    usleep(kLookPeriod);
  }
  return std::any_of(stopped.begin(), stopped.end(),
                     [](const auto& row) { return row.second == kLooks; });
}

std::vector<Call> TracedDaemon::let_go() {
  std::vector<Call> calls;
  if (tracer_ <= 0) return calls;
  kill(tracer_, SIGINT);
  if (!wait_until([&] { return waitpid(tracer_, nullptr, WNOHANG) == tracer_; })) {
    kill(tracer_, SIGKILL);
    waitpid(tracer_, nullptr, 0);
  }
  tracer_ = 0;
  for (const std::string& name : list(kTraces)) {
    bool in_main = name == "t." + std::to_string(pid_);
    read_trace(std::string(kTraces) + "/" + name, in_main, only_disturbed_, calls);
  }
  return calls;
}

void TracedDaemon::kill_all() const {
  // Whoever is forked meanwhile is found the next time round.
  for (std::vector<pid_t> left; !(left = processes()).empty(); usleep(1000)) {
    for (pid_t pid : left) kill(pid, SIGKILL);
  }
}

void TracedDaemon::end() {
  let_go();
  std::lock_guard<std::mutex> lock(mutex_);
  kill_all();
  if (!ended_) waitpid(pid_, &status_, 0);
  ended_ = true;
}

}  // namespace corvexd::faults
