#include "tools/faults/traced_daemon.h"

#include <stdlib.h>
#include <string.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <fstream>
#include <regex>

#include "tests/files.h"
#include "tools/faults/device.h"

namespace corvexd::faults {
namespace {

using test::eventually, test::list, test::read_file;

constexpr int kLooks = 5;  // a stop for each call is over long before as many
constexpr int kLookPeriod = 10'000;

// The state of the process or thread that a folder of /proc tells of.
char state_of(const std::string& folder) {
  const std::string text = read_file(folder + "/stat");
  const size_t name_end = text.rfind(") ");
  return name_end == std::string::npos ? 'X' : text[name_end + 2];
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
      calls.back().site += line.substr(line.find('['));
    }
  }
  auto is_the_gates = [](const Call& call) { return holds(call.callers, "wait_at_gate"); };
  calls.erase(std::remove_if(calls.begin(), calls.end(), is_the_gates), calls.end());
}

// The daemon finds in its environment which call it is to make in vain.
const char* gated_daemon(const Fault* fault) {
  unsetenv(kReservedVariable);
  if (fault != nullptr) setenv(kReservedVariable, std::to_string(fault->number).c_str(), 1);
  return test::kDaemonWithNodes;
}

}  // namespace

bool holds(const std::string& text, const char* part) {
  return text.find(part) != std::string::npos;
}

TracedDaemon::TracedDaemon(const Fault* fault, const std::string& traced)
    : BootingDaemon(gated_daemon(fault)), only_disturbed_(fault != nullptr) {
  waitpid(pid(), nullptr, WUNTRACED);
  if (fault != nullptr || !traced.empty()) {
    const std::string tracer = tracer_command(fault, traced, pid());
    tracer_ = fork();
    if (tracer_ == 0) _exit(execl("/bin/sh", "sh", "-c", tracer.c_str(), nullptr));
    const std::string status = "/proc/" + std::to_string(pid()) + "/status";
    eventually([&] { return !holds(read_file(status), "TracerPid:\t0"); }, kPatience);
    usleep(3000);
  }
  kill(pid(), SIGCONT);
}

// It is reaped at the very end, so that its number stays its own.
int TracedDaemon::status() const {
  siginfo_t info = {};
  waitid(P_PID, pid(), &info, WEXITED | WNOHANG | WNOWAIT);
  if (info.si_pid == 0) return -1;
  for (pid_t left : processes()) kill(left, SIGKILL);
  return info.si_code == CLD_EXITED ? info.si_status : 128 + info.si_status;
}

std::vector<pid_t> TracedDaemon::processes() const {
  std::vector<pid_t> found;
  for (const std::string& name : list("/proc")) {
    const pid_t process = atoi(name.c_str());
    if (process > 0 && getsid(process) == pid() && state_of("/proc/" + name) != 'Z')
      found.push_back(process);
  }
  return found;
}

std::map<std::string, char> TracedDaemon::tasks() const {
  std::map<std::string, char> states;
  for (pid_t process : processes()) {
    const std::string folder = "/proc/" + std::to_string(process) + "/task/";
    for (const std::string& task : list(folder)) states[task] = state_of(folder + task);
  }
  return states;
}

bool TracedDaemon::is_held_up() const {
  std::map<std::string, int> stopped;
  for (int look = 0; look < kLooks; ++look) {
    for (const auto& [task, state] : tasks()) stopped[task] += state == 't';
    usleep(kLookPeriod);
  }
  return std::any_of(stopped.begin(), stopped.end(),
                     [](const auto& row) { return row.second == kLooks; });
}

std::vector<Call> TracedDaemon::let_go() {
  std::vector<Call> calls;
  if (tracer_ <= 0) return calls;
  kill(tracer_, SIGINT);
  if (!eventually([&] { return waitpid(tracer_, nullptr, WNOHANG) == tracer_; }, kPatience)) {
    kill(tracer_, SIGKILL);
    waitpid(tracer_, nullptr, 0);
  }
  tracer_ = 0;
  for (const std::string& name : list(kTraces)) {
    bool in_main = name == "t." + std::to_string(pid());
    read_trace(std::string(kTraces) + "/" + name, in_main, only_disturbed_, calls);
  }
  return calls;
}

void TracedDaemon::end() {
  let_go();
  // Whoever is forked meanwhile is found the next time round.
  for (std::vector<pid_t> left; !(left = processes()).empty(); usleep(1000)) {
    for (pid_t process : left) kill(process, SIGKILL);
  }
}

}  // namespace corvexd::faults
