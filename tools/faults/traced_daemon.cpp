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
#include <set>
#include <vector>

#include "tests/files.h"
#include "tools/faults/device.h"

namespace corvexd::faults {
namespace {

using test::list, test::read_file;

constexpr char kTracer[] = "/usr/bin/strace";
constexpr int kLooks = 8;  // a stop for each call is over long before as many
constexpr int kLookPeriod = 10'000;

void use_null_for_standard_streams() {
  int null = open("/dev/null", O_RDWR | O_CLOEXEC);
  for (int fd : {0, 1, 2}) dup2(null, fd);
}

pid_t start_program(const std::vector<std::string>& arguments) {
  pid_t pid = fork();
  if (pid != 0) return pid;
  use_null_for_standard_streams();
  std::vector<char*> vector;
  for (const std::string& text : arguments) vector.push_back(const_cast<char*>(text.c_str()));
  vector.push_back(nullptr);
  execv(vector[0], vector.data());
  _exit(127);
}

[[noreturn]] void run(int fd) {
  setsid();
  if (chroot(kJail) != 0 || chdir("/") != 0) _exit(126);
  use_null_for_standard_streams();
  fcntl(fd, F_SETFD, 0);
  close_range(3, fd - 1, 0);
  close_range(fd + 1, ~0u, 0);
  setenv("PATH", "/system/bin:/bin", 1);
  unsetenv("TZ");
  execl(kProgram, kProgram, nullptr);
  _exit(127);
}

// Of a "stat" file: its third field, and its sixth.
void read_state(const std::string& file, char* state, pid_t* session) {
  const std::string text = read_file(file);
  *state = 'X';
  *session = -1;
  const size_t name_end = text.rfind(") ");
  if (name_end == std::string::npos) return;
  sscanf(text.c_str() + name_end + 2, "%c %*d %*d %d", state, session);
}

std::vector<std::string> tracer_arguments(const Fault* fault, const std::string& traced) {
  // Programs that the daemon executes are let go of; they are not tried out here.
  std::vector<std::string> arguments = {kTracer, "-ff",         "-b", "execve",
                                        "-e",    "signal=none", "-o", std::string(kTraces) + "/t"};
  // Unwinding each call's stack takes a while; only what fails is of interest.
  if (fault == nullptr || fault->mode == Mode::kFail) arguments.insert(arguments.end(), {"-k"});
  if (fault == nullptr) {
    arguments.insert(arguments.end(), {"-e", "trace=" + traced});
    return arguments;
  }
  std::string when = ":when=" + std::to_string(fault->when + (fault->in_main ? kShieldCalls : 0));
  if (fault->lasting) when += fault->in_main ? "+" : ".." + std::to_string(kShieldCalls);
  arguments.insert(arguments.end(),
                   {"-e", std::string("trace=") + fault->call, "-e",
                    std::string("inject=") + fault->call + ":" + fault->outcome + when});
  if (strncmp(fault->outcome, "error=", 6) == 0) {
    arguments.insert(arguments.end(), {"-e", "status=failed"});
  }
  return arguments;
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
std::string plain_name(std::string function) {
  for (const char* space : {"(anonymous namespace)::", "corvexd::"}) {
    for (size_t at; (at = function.find(space)) != std::string::npos;) {
      function.erase(at, strlen(space));
    }
  }
  return function.substr(0, function.find_first_of("(+"));
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
  // The shield's calls are nobody's.
  auto is_the_shields = [](const Call& call) { return holds(call.callers, "wait_at_gate"); };
  calls.erase(std::remove_if(calls.begin(), calls.end(), is_the_shields), calls.end());
}

}  // namespace

TracedDaemon::TracedDaemon(const Fault* fault, const std::string& traced)
    : only_disturbed_(fault != nullptr) {
  int fd = test::bound_socket(SOCK_STREAM, "/dev/socket/corvexd");
  setenv("ANDROID_SOCKET_corvexd", std::to_string(fd).c_str(), 1);
  if (fault != nullptr) setenv(kShieldVariable, std::to_string(fault->number).c_str(), 1);
  pid_ = fork();
  if (pid_ == 0) run(fd);
  unsetenv(kShieldVariable);
  close(fd);
  int status;
  waitpid(pid_, &status, WUNTRACED);
  if (fault != nullptr || !traced.empty()) attach(fault, traced);
  kill(pid_, SIGCONT);
}

void TracedDaemon::attach(const Fault* fault, const std::string& traced) {
  std::vector<std::string> arguments = tracer_arguments(fault, traced);
  arguments.insert(arguments.end(), {"-p", std::to_string(pid_)});
  tracer_ = start_program(arguments);
  const std::string status = "/proc/" + std::to_string(pid_) + "/status";
  wait_until([&] { return read_file(status).find("TracerPid:\t0") == std::string::npos; });
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

void TracedDaemon::for_each_process(const std::function<void(const std::string&)>& visit) const {
  for (const std::string& name : list("/proc")) {
    if (atoi(name.c_str()) <= 0) continue;
    char state;
    pid_t session;
    read_state("/proc/" + name + "/stat", &state, &session);
    if (session == pid_ && state != 'Z') visit("/proc/" + name);
  }
}

bool TracedDaemon::stands_still() const {
  std::set<std::string> still;
  for (int i = 0; i < kLooks; ++i) {
    std::set<std::string> stopped;
    for_each_process([&](const std::string& folder) {
      for (const std::string& task : list(folder + "/task")) {
        char state;
        pid_t session;
        read_state(folder + "/task/" + task + "/stat", &state, &session);
        if (state == 't' && (i == 0 || still.count(task) != 0)) stopped.insert(task);
      }
    });
    if (stopped.empty()) return false;
    still = stopped;
    usleep(kLookPeriod);
  }
  return true;
}

long TracedDaemon::processor_time() const {
  long total = 0;
  for_each_process([&](const std::string& folder) {
    char program[128] = {};
    if (readlink((folder + "/exe").c_str(), program, sizeof program - 1) == -1) return;
    if (program != std::string(kJail) + kProgram) return;
    for (const std::string& task : list(folder + "/task")) {
      total += atol(read_file(folder + "/task/" + task + "/schedstat").c_str());
    }
  });
  return total;
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
  for (bool any = true; any;) {
    any = false;
    for_each_process([&](const std::string& folder) {
      any = kill(atoi(folder.c_str() + strlen("/proc/")), SIGKILL) == 0 || any;
    });
    if (any) usleep(1000);
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
