// Runs the daemon again and again, and each time another of its system calls fails, is its last, or
// takes long.
#include <fcntl.h>
#include <stdio.h>
#include <stdlib.h>
#include <sys/mman.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <time.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <map>
#include <regex>
#include <set>

#include "tests/device_root.h"
#include "tools/faults/oracle.h"
#include "tools/faults/scenario.h"

namespace corvexd::faults {
namespace {

constexpr size_t kWorkers = 4;  // a run sleeps as much as it works
constexpr int kTries = 3;       // of a run that went wrong; twice the same is no chance
constexpr int kNormalRuns = 3;  // tell what all runs without faults have in common
constexpr const char* kModes[] = {"fail", "kill", "delay"};  // as the enumeration has them

struct Row {
  const char* call;
  long number;
  std::vector<const char*> errors;  // of one call
  const char* lasting;              // of it and every later one; may be null
};

const std::vector<Row> kRows = {
    {"renameat", SYS_renameat, {"error=ENOSPC", "error=EACCES"}, "error=EROFS"},
    {"mkdirat", SYS_mkdirat, {"error=ENOSPC", "error=EACCES"}, "error=EROFS"},
    {"unlinkat", SYS_unlinkat, {"error=EIO", "error=EACCES"}, "error=EROFS"},
    {"fchown", SYS_fchown, {"error=EIO"}, "error=EROFS"},
    {"fchownat", SYS_fchownat, {"error=EIO"}, "error=EROFS"},
    {"fchmod", SYS_fchmod, {"error=EIO"}, "error=EROFS"},
    {"ftruncate", SYS_ftruncate, {"error=EIO"}, nullptr},
    {"access", SYS_access, {"error=EACCES", "error=EIO"}, nullptr},
    {"faccessat2", SYS_faccessat2, {"error=EACCES", "error=EIO"}, nullptr},
    {"newfstatat", SYS_newfstatat, {"error=EIO"}, nullptr},
    {"readlinkat", SYS_readlinkat, {"error=EIO"}, nullptr},
    {"getdents64", SYS_getdents64, {"error=EIO"}, nullptr},
    {"clone", SYS_clone, {"error=EAGAIN", "error=ENOMEM"}, "error=EAGAIN"},
    {"clone3", SYS_clone3, {"error=EAGAIN", "error=ENOMEM"}, "error=EAGAIN"},
    {"execve", SYS_execve, {"error=EACCES", "error=ENOMEM"}, nullptr},
    {"mmap", SYS_mmap, {"error=ENOMEM"}, nullptr},
    {"inotify_init1", SYS_inotify_init1, {"error=EMFILE", "error=ENOMEM"}, nullptr},
    {"inotify_add_watch", SYS_inotify_add_watch, {"error=ENOSPC", "error=EACCES"}, "error=ENOSPC"},
    {"getsockname", SYS_getsockname, {"error=ENOBUFS"}, nullptr},
    {"listen", SYS_listen, {"error=EADDRINUSE"}, nullptr},
    {"accept4", SYS_accept4, {"error=EMFILE", "error=ENFILE", "error=EINTR"}, nullptr},
    {"connect", SYS_connect, {"error=ECONNREFUSED", "error=EINTR"}, "error=ECONNREFUSED"},
    {"sendmsg", SYS_sendmsg, {"error=EAGAIN", "error=EINTR"}, nullptr},
    {"sendto", SYS_sendto, {"error=EPIPE", "error=EINTR"}, "error=EPIPE"},
    {"shutdown", SYS_shutdown, {}, nullptr},  // fails only when nobody waits for it
    {"wait4", SYS_wait4, {"error=EINTR", "error=ECHILD"}, nullptr},
    {"waitid", SYS_waitid, {"error=EINTR"}, nullptr},
    {"kill", SYS_kill, {"error=EPERM", "error=ESRCH"}, "error=EPERM"},
    {"write", SYS_write, {"error=EIO", "error=EINTR", "retval=1"}, "error=ENOSPC"},
    {"read", SYS_read, {"error=EIO", "error=EINTR"}, "error=EAGAIN"},
    {"pwrite64", SYS_pwrite64, {"error=EIO"}, "error=ENOSPC"},
    {"lseek", SYS_lseek, {"error=EIO"}, nullptr},
    {"openat", SYS_openat, {"error=EMFILE"}, "error=ENFILE"},
    {"close", SYS_close, {"error=EIO"}, nullptr},
};

// What is to be done: all, unless the command line says less.
struct Options {
  bool modes[3] = {true, true, true};
  std::string call;
  size_t first = 1, step = 1;  // of every `step` faults, this one
};

// What the workers share.
struct Counters {
  std::atomic<size_t> planned, runs, disturbed, problems;
};

std::string describe(const Fault& fault) {
  return std::string(fault.call) + ":" + fault.outcome + (fault.lasting ? "+" : "") + " call " +
         std::to_string(fault.when) + " of " + (fault.in_main ? "the main thread" : "the others");
}

std::vector<Fault> faults_at(const Row& row, const Call& call) {
  std::vector<Fault> faults;
  auto add = [&](Mode mode, const char* outcome, bool lasting = false) {
    faults.push_back(
        {mode, row.call, row.number, outcome, lasting, call.in_main, call.when, call.callers});
  };
  for (const char* error : row.errors) add(Mode::kFail, error);
  if (row.lasting != nullptr) add(Mode::kFail, row.lasting, true);
  add(Mode::kKill, "signal=USR2");  // kKillingSignal
  add(Mode::kDelay, "delay_enter=300000");
  return faults;
}

// Which worker's a fault is does not depend on the order in which threads got ahead in this run.
bool is_wanted(const Fault& fault, const Options& options, size_t worker) {
  const size_t number = std::hash<std::string>()(describe(fault));
  return options.modes[static_cast<int>(fault.mode)] &&
         number % options.step == options.first - 1 && number / options.step % kWorkers == worker;
}

// Every chain of callers that makes a call in a run without faults sees its first such call
// disturbed, for the main thread and for all others apart.
std::vector<Fault> make_plan(const Run& run, const Options& options, size_t worker) {
  std::vector<Fault> plan;
  for (const Row& row : kRows) {
    if (!options.call.empty() && options.call != row.call) continue;
    std::set<std::string> chains;
    std::set<std::pair<bool, int>> known;
    for (const Call& call : run.calls) {
      if (call.name != row.call || call.callers.empty()) continue;
      if (!chains.insert(call.site).second || !known.insert({call.in_main, call.when}).second)
        continue;
      for (const Fault& fault : faults_at(row, call)) {
        if (is_wanted(fault, options, worker)) plan.push_back(fault);
      }
    }
  }
  return plan;
}

std::string traced_calls() {
  std::string all;
  for (const Row& row : kRows) all += std::string(all.empty() ? "" : ",") + row.call;
  return all;
}

// Where standard output was: the daemon and its tracer get /dev/null.
int report = STDOUT_FILENO;

// One write, so that the workers' lines do not mix; on a terminal, over the progress.
void say(const std::string& text) {
  const std::string line = (isatty(report) ? "\r\033[K" : "") + text + "\n";
  ssize_t ignored = write(report, line.data(), line.size());
  (void)ignored;
}

// A run that goes wrong is repeated: what is wrong again is a finding, what is not is told apart.
void try_fault(const Fault& fault, const Normal& normal, Counters& counters) {
  static const std::regex time("[0-9]{4}(-[0-9]{2}){5}");
  std::map<std::string, int> seen;
  bool disturbed = false, wrong = false;
  for (int i = 0; i < kTries && (i == 0 || !seen.empty()); ++i) {
    Run run = run_scenario(&fault, "");
    judge(&fault, normal, run);
    disturbed = disturbed || !run.calls.empty() || run.status != -1;
    std::set<std::string> problems;
    for (const std::string& text : run.problems)
      problems.insert(std::regex_replace(text, time, "TIME"));
    for (const std::string& problem : problems) ++seen[problem];
  }
  for (const auto& [problem, times] : seen) {
    say((times > 1 ? "WRONG: " : "once in three: ") + describe(fault) + " in " + fault.callers +
        ": " + problem);
    wrong = wrong || times > 1;
  }
  counters.disturbed += disturbed;
  counters.problems += wrong;
  ++counters.runs;
}

// In a device root of its own.
void work(const Options& options, size_t worker, Counters& counters) {
  test::enter_device_root();
  report = fcntl(STDOUT_FILENO, F_DUPFD_CLOEXEC, 3);
  const int null = open("/dev/null", O_RDWR | O_CLOEXEC);
  for (int fd : {0, 1, 2}) dup2(null, fd);
  unsetenv("TZ");
  Normal normal;
  std::vector<Fault> plan;
  for (int i = 0; i < kNormalRuns; ++i) {
    // Unhurried by the tracer, too.
    Run run = run_scenario(nullptr, i == 0 ? traced_calls() : "");
    if (i == 0) plan = make_plan(run, options, worker);
    add_to_normal(run, normal);
    judge(nullptr, normal, run);
    counters.problems += run.problems.size();
    for (const std::string& problem : run.problems) say("WRONG: no fault: " + problem);
  }
  counters.planned += plan.size();
  for (const Fault& fault : plan) try_fault(fault, normal, counters);
}

int sweep(const Options& options) {
  const time_t start = time(nullptr);
  auto& counters = *static_cast<Counters*>(
      mmap(nullptr, sizeof(Counters), PROT_READ | PROT_WRITE, MAP_SHARED | MAP_ANONYMOUS, -1, 0));
  auto show = [&] {
    printf("%s%zu of %zu runs in %lld s, %zu of them disturbed, %zu wrong",
           isatty(STDOUT_FILENO) ? "\r" : "", counters.runs.load(), counters.planned.load(),
           static_cast<long long>(time(nullptr) - start), counters.disturbed.load(),
           counters.problems.load());
    fflush(stdout);
  };
  for (size_t worker = 0; worker < kWorkers; ++worker) {
    if (fork() != 0) continue;
    work(options, worker, counters);
    _exit(0);
  }
  bool all_ended_well = true;
  for (int ended, status; (ended = waitpid(-1, &status, WNOHANG)) != -1; usleep(200'000)) {
    if (ended > 0) all_ended_well = all_ended_well && status == 0;
    if (isatty(STDOUT_FILENO)) show();
  }
  show();
  printf("\n");
  if (counters.planned == 0) fprintf(stderr, "a run without faults has no such call\n");
  return all_ended_well && counters.problems == 0 && counters.planned != 0 ? 0 : 1;
}

// False for what cannot be understood.
bool read_options(int argc, char** argv, Options& options) {
  for (int i = 1; i < argc; ++i) {
    const std::string word = argv[i];
    const auto* mode = std::find(std::begin(kModes), std::end(kModes), word);
    if (word == "--slice") {
      bool good = ++i < argc && sscanf(argv[i], "%zu/%zu", &options.first, &options.step) == 2;
      if (!good || options.first < 1 || options.first > options.step) return false;
    } else if (mode != std::end(kModes)) {
      for (size_t k = 0; k < 3; ++k) options.modes[k] = kModes[k] == word;
    } else if (options.call.empty() && word[0] != '-') {
      options.call = word;
    } else {
      return false;
    }
  }
  return true;
}

}  // namespace
}  // namespace corvexd::faults

int main(int argc, char** argv) {
  corvexd::faults::Options options;
  if (!corvexd::faults::read_options(argc, argv, options)) {
    fprintf(stderr, "usage: ./dev faults [fail|kill|delay] [CALL] [--slice N/M]\n");
    return 2;
  }
  return corvexd::faults::sweep(options);
}
