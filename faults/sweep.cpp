// Lives the daemon's life again and again, and each time lets another of its system calls fail.
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/mman.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <time.h>
#include <unistd.h>

#include <atomic>
#include <map>
#include <regex>
#include <set>

#include "faults/life.h"
#include "faults/verdict.h"
#include "tests/device_root.h"

namespace corvexd::faults {
namespace {

constexpr int kWorkers = 4;  // a life sleeps as much as it works
constexpr int kTries = 3;    // of a life that went wrong; twice the same is no chance

struct Row {
  const char* call;
  long number;
  std::vector<const char*> outcomes;  // of one call
  const char* lasting;                // of it and every later one; may be null
};

const std::vector<Row> kRows = {
    {"rename", SYS_rename, {"error=ENOSPC", "error=EACCES"}, "error=EROFS"},
    {"mkdir", SYS_mkdir, {"error=ENOSPC", "error=EACCES"}, "error=EROFS"},
    {"unlink", SYS_unlink, {"error=EIO"}, "error=EROFS"},
    {"unlinkat", SYS_unlinkat, {"error=EIO", "error=EACCES"}, "error=EROFS"},
    {"chown", SYS_chown, {"error=EIO"}, "error=EROFS"},
    {"fchown", SYS_fchown, {"error=EIO"}, "error=EROFS"},
    {"chmod", SYS_chmod, {"error=EIO"}, "error=EROFS"},
    {"fchmod", SYS_fchmod, {"error=EIO"}, "error=EROFS"},
    {"access", SYS_access, {"error=EACCES", "error=EIO"}, nullptr},
    {"newfstatat", SYS_newfstatat, {"error=EIO"}, nullptr},
    {"clone", SYS_clone, {"error=EAGAIN", "error=ENOMEM"}, "error=EAGAIN"},
    {"clone3", SYS_clone3, {"error=EAGAIN", "error=ENOMEM"}, "error=EAGAIN"},
    {"execve", SYS_execve, {"error=EACCES", "error=ENOMEM"}, nullptr},
    {"pipe2", SYS_pipe2, {"error=EMFILE", "error=ENFILE"}, "error=ENFILE"},
    {"inotify_init1", SYS_inotify_init1, {"error=EMFILE", "error=ENOMEM"}, nullptr},
    {"inotify_add_watch", SYS_inotify_add_watch, {"error=ENOSPC", "error=EACCES"}, "error=ENOSPC"},
    {"getsockname", SYS_getsockname, {"error=ENOBUFS"}, nullptr},
    {"listen", SYS_listen, {"error=EADDRINUSE"}, nullptr},
    {"accept4", SYS_accept4, {"error=EMFILE", "error=ENFILE", "error=EINTR"}, nullptr},
    {"wait4", SYS_wait4, {"error=EINTR", "error=ECHILD"}, nullptr},
    {"waitid", SYS_waitid, {"error=EINTR"}, nullptr},
    {"kill", SYS_kill, {"error=EPERM", "error=ESRCH"}, "error=EPERM"},
    {"write", SYS_write, {"error=EIO", "error=EINTR", "retval=1"}, "error=ENOSPC"},
    {"read", SYS_read, {"error=EIO", "error=EINTR"}, "error=EAGAIN"},
    {"openat", SYS_openat, {"error=EMFILE"}, "error=ENFILE"},
};

// Every chain of callers that makes a call in a fault-free life sees its first such call fail, for
// the main thread and for all others apart.
std::vector<Fault> make_plan(const Life& life, const std::string& only) {
  std::vector<Fault> plan;
  for (const Row& row : kRows) {
    if (!only.empty() && only != row.call) continue;
    std::set<std::string> chains;
    std::set<std::pair<bool, int>> places;
    for (const Call& call : life.calls) {
      if (call.name != row.call || call.functions.empty()) continue;
      if (chains.insert(call.site).second) places.insert({call.in_main, call.when});
    }
    for (const auto& [in_main, when] : places) {
      for (const char* outcome : row.outcomes) {
        plan.push_back({row.call, row.number, outcome, false, in_main, when});
      }
      if (row.lasting == nullptr) continue;
      plan.push_back({row.call, row.number, row.lasting, true, in_main, when});
    }
  }
  return plan;
}

std::string traced_calls() {
  std::string all;
  for (const Row& row : kRows) all += std::string(all.empty() ? "" : ",") + row.call;
  return all;
}

// Runs `body` in a process with a device root of its own; what it prints goes to `output`.
template <typename Body>
void start_worker(int output, const Body& body) {
  fflush(stdout);
  if (fork() != 0) return;
  dup2(output, STDOUT_FILENO);
  close(output);
  test::enter_device_root();
  prepare_root();
  body();
  fflush(stdout);
  _exit(0);
}

std::string without_times(const std::string& text) {
  static const std::regex time("[0-9]{4}(-[0-9]{2}){5}");
  return std::regex_replace(text, time, "TIME");
}

void say(const std::string& kind, const std::string& text) {
  static const std::regex line_end("\n");
  const std::string line = std::regex_replace(without_times(text), line_end, "\\n");
  // One write, so that the workers' lines do not mix.
  std::string bytes = kind + " " + line.substr(0, 4000) + "\n";
  ssize_t ignored = write(STDOUT_FILENO, bytes.data(), bytes.size());
  (void)ignored;
}

void tell_plan(const std::string& only) {
  Life life = live(nullptr, traced_calls());
  judge(life);
  for (const std::string& problem : life.problems) say("problem", "no fault: " + problem);
  for (const Fault& fault : make_plan(life, only)) {
    std::string text = fault.call + " " + std::to_string(fault.number) + " " + fault.outcome;
    for (int number : {int{fault.lasting}, int{fault.in_main}, fault.when}) {
      text += " " + std::to_string(number);
    }
    say("fault", text);
  }
}

Fault read_fault(const std::string& text) {
  char call[32], outcome[32];
  long number;
  int lasting, in_main, when;
  sscanf(text.c_str(), "%31s %ld %31s %d %d %d", call, &number, outcome, &lasting, &in_main, &when);
  return {call, number, outcome, lasting != 0, in_main != 0, when};
}

std::string describe(const Fault& fault) {
  return fault.call + ":" + fault.outcome + ":when=" + std::to_string(fault.when) +
         (fault.lasting ? "+" : "") + (fault.in_main ? " of the main thread" : " of the others");
}

// A life that goes wrong is repeated: what is wrong again is a finding, what is not is told apart.
void try_fault(const Fault& fault) {
  std::map<std::string, int> seen;
  std::string where;
  for (int i = 0; i < kTries; ++i) {
    Life life = live(&fault, "");
    judge(life);
    for (const Call& call : life.calls) say("hit", call.name + " " + call.site);
    if (!life.calls.empty()) where = life.calls[0].path + " in " + callers(life.calls[0]);
    std::set<std::string> problems;
    for (const std::string& problem : life.problems) problems.insert(without_times(problem));
    for (const std::string& problem : problems) ++seen[problem];
    if (seen.empty()) break;
  }
  for (const auto& [problem, times] : seen) {
    say(times > 1 ? "problem" : "chance", describe(fault) + " (" + where + "): " + problem);
  }
  say("life", "");
}

struct Result {
  size_t lives = 0;
  size_t faults = 0;
  std::set<std::string> sites;
  std::vector<std::string> problems;
  std::vector<std::string> chances;
  std::vector<Fault> plan;
};

void take_line(const std::string& line, Result& result) {
  size_t blank = line.find(' ');
  const std::string kind = line.substr(0, blank), text = line.substr(blank + 1);
  if (kind == "life") ++result.lives;
  if (kind == "hit") ++result.faults;
  if (kind == "hit") result.sites.insert(text);
  if (kind == "fault") result.plan.push_back(read_fault(text));
  if (kind == "problem") result.problems.push_back(text);
  if (kind == "chance") result.chances.push_back(text);
  if (kind == "problem") printf("  %s\n", text.c_str());
}

// Takes what the workers say, until the last of them has ended.
void listen_to_workers(int input, Result& result) {
  FILE* lines = fdopen(input, "r");
  char line[8192];
  const time_t start = time(nullptr);
  time_t told = start;
  while (fgets(line, sizeof line, lines) != nullptr) {
    line[strcspn(line, "\n")] = '\0';
    take_line(line, result);
    if (time(nullptr) - told < 10) continue;
    told = time(nullptr);
    printf("%zu of %zu lives, %lld s, %zu problems\n", result.lives, result.plan.size(),
           static_cast<long long>(told - start), result.problems.size());
    fflush(stdout);
  }
  fclose(lines);
  while (wait(nullptr) > 0) {
  }
}

int sweep(const std::string& only) {
  Result result;
  int ends[2];
  if (pipe(ends) != 0) return 1;
  start_worker(ends[1], [&] { tell_plan(only); });
  close(ends[1]);
  listen_to_workers(ends[0], result);
  if (result.plan.empty()) {
    fprintf(stderr, "no such call in a life without faults: %s\n", only.c_str());
    return 1;
  }
  printf("%zu lives to be lived\n", result.plan.size());

  void* shared = mmap(nullptr, sizeof(std::atomic<size_t>), PROT_READ | PROT_WRITE,
                      MAP_SHARED | MAP_ANONYMOUS, -1, 0);
  auto* next = new (shared) std::atomic<size_t>(0);
  if (pipe(ends) != 0) return 1;
  const time_t start = time(nullptr);
  for (int i = 0; i < kWorkers; ++i) {
    start_worker(ends[1], [&] {
      for (size_t turn; (turn = (*next)++) < result.plan.size();) try_fault(result.plan[turn]);
    });
  }
  close(ends[1]);
  listen_to_workers(ends[0], result);

  printf("\n%zu lives in %lld s, %zu faults at %zu call sites\n", result.lives,
         static_cast<long long>(time(nullptr) - start), result.faults, result.sites.size());
  for (const std::string& text : result.chances) printf("once in three: %s\n", text.c_str());
  for (const std::string& text : result.problems) printf("WRONG: %s\n", text.c_str());
  if (result.lives != result.plan.size()) printf("WRONG: a worker has ended early\n");
  return result.problems.empty() && result.lives == result.plan.size() ? 0 : 1;
}

}  // namespace
}  // namespace corvexd::faults

int main(int argc, char** argv) { return corvexd::faults::sweep(argc > 1 ? argv[1] : ""); }
