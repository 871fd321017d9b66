// Lives the daemon's life again and again, and each time another of its system calls fails, is its
// last, or takes long.
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
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
#include "tools/faults/life.h"
#include "tools/faults/verdict.h"

namespace corvexd::faults {
namespace {

constexpr int kWorkers = 4;      // a life sleeps as much as it works
constexpr int kTries = 3;        // of a life that went wrong; twice the same is no chance
constexpr int kNormalLives = 4;  // tell what all lives without faults have in common

constexpr size_t kMaxPlan = 8000;
constexpr char kKill[] = "signal=USR2";  // kKillingSignal
constexpr char kDelay[] = "delay_enter=300000";
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
    {"pipe2", SYS_pipe2, {"error=EMFILE", "error=ENFILE"}, "error=ENFILE"},
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
    {"lseek", SYS_lseek, {"error=EIO"}, nullptr},
    {"openat", SYS_openat, {"error=EMFILE"}, "error=ENFILE"},
    {"close", SYS_close, {"error=EIO"}, nullptr},
};

// What is to be done: all, unless the command line says less.
struct Wish {
  bool modes[3] = {true, true, true};
  std::string call;
  size_t first = 1, step = 1;  // every `step`th site, beginning with this one
};

using Place = std::pair<const Row*, Call>;

// Every chain of callers that makes a call in a fault-free life sees its first such call disturbed,
// for the main thread and for all others apart.
std::vector<Place> find_places(const Life& life) {
  std::vector<Place> places;
  for (const Row& row : kRows) {
    std::set<std::string> chains;
    std::set<std::pair<bool, int>> known;
    for (const Call& call : life.calls) {
      if (call.name != row.call || call.callers.empty() || !chains.insert(call.site).second)
        continue;
      if (known.insert({call.in_main, call.when}).second) places.emplace_back(&row, call);
    }
  }
  return places;
}

// What the workers share.
struct Shared {
  std::atomic<size_t> next, lives, disturbed, problems;
  size_t planned, normal_size;
  struct {
    Fault fault;
    char where[500];
  } plan[kMaxPlan];
  char normal[1 << 20];
};

void make_plan(const std::vector<Place>& places, const Wish& wish, Shared& shared) {
  for (Mode mode : {Mode::kFail, Mode::kKill, Mode::kDelay}) {
    if (!wish.modes[static_cast<int>(mode)]) continue;
    for (size_t i = wish.first - 1; i < places.size(); i += wish.step) {
      const auto& [row, call] = places[i];
      if (!wish.call.empty() && wish.call != row->call) continue;
      std::vector<const char*> outcomes = row->errors;
      if (mode == Mode::kFail && row->lasting != nullptr) outcomes.push_back(row->lasting);
      if (mode == Mode::kKill) outcomes = {kKill};
      if (mode == Mode::kDelay) outcomes = {kDelay};
      for (size_t k = 0; k < outcomes.size(); ++k) {
        bool lasting = mode == Mode::kFail && k == row->errors.size();
        auto& entry = shared.plan[shared.planned++];
        entry.fault = {mode, row->call, row->number, outcomes[k], lasting, call.in_main, call.when};
        snprintf(entry.where, sizeof entry.where, "%s", call.callers.c_str());
      }
    }
  }
}

std::string traced_calls() {
  std::string all;
  for (const Row& row : kRows) all += std::string(all.empty() ? "" : ",") + row.call;
  return all;
}

// Runs `body` in a process with a device root of its own.
template <typename Body>
void start_worker(const Body& body) {
  fflush(stdout);
  if (fork() != 0) return;
  test::enter_device_root();
  prepare_root();
  body();
  _exit(0);
}

// One write, so that the workers' lines do not mix; on a terminal, over the progress.
void say(const std::string& text) {
  static const std::regex line_end("\n");
  const std::string line =
      (isatty(STDOUT_FILENO) ? "\r\033[K" : "") + std::regex_replace(text, line_end, "\\n") + "\n";
  ssize_t ignored = write(STDOUT_FILENO, line.data(), line.size());
  (void)ignored;
}

void plan(const Wish& wish, Shared& shared) {
  Normal normal;
  for (int i = 0; i < kNormalLives; ++i) {
    // Unhurried by the tracer, too.
    Life life = live(nullptr, i == 0 ? traced_calls() : "");
    add_to_normal(life, i == 0, normal);
    judge(nullptr, normal, life);
    shared.problems += life.problems.size();
    for (const std::string& problem : life.problems) say("WRONG: no fault: " + problem);
    if (i == 0) make_plan(find_places(life), wish, shared);
  }
  const std::string text = write_normal(normal);
  shared.normal_size = text.copy(shared.normal, sizeof shared.normal);
}

// A life that goes wrong is repeated: what is wrong again is a finding, what is not is told apart.
bool try_fault(const Fault& fault, const char* where, const Normal& normal, Shared& shared) {
  static const std::regex time("[0-9]{4}(-[0-9]{2}){5}");
  std::map<std::string, int> seen;
  bool disturbed = false;
  for (int i = 0; i < kTries && (i == 0 || !seen.empty()); ++i) {
    Life life = live(&fault, "");
    judge(&fault, normal, life);
    disturbed = disturbed || !life.calls.empty() || life.status != -1;
    std::set<std::string> problems;
    for (const std::string& text : life.problems)
      problems.insert(std::regex_replace(text, time, "TIME"));
    for (const std::string& problem : problems) ++seen[problem];
  }
  const std::string place = std::string(fault.call) + ":" + fault.outcome +
                            (fault.lasting ? "+" : "") + " call " + std::to_string(fault.when) +
                            " of " + (fault.in_main ? "the main thread" : "the others") + " in " +
                            where;
  bool sound = true;
  for (const auto& [problem, times] : seen) {
    say((times > 1 ? "WRONG: " : "once in three: ") + place + ": " + problem);
    sound = sound && times == 1;
  }
  shared.disturbed += disturbed;
  return sound;
}

// Until the last worker has ended.
void show_progress(const Shared& shared) {
  const time_t start = time(nullptr);
  while (waitpid(-1, nullptr, WNOHANG) != -1) {
    if (isatty(STDOUT_FILENO)) {
      printf("\r%zu of %zu lives, %lld s, %zu wrong", shared.lives.load(), shared.planned,
             static_cast<long long>(time(nullptr) - start), shared.problems.load());
      fflush(stdout);
    }
    usleep(200'000);
  }
  printf("%s%zu of %zu lives in %lld s, %zu of them disturbed, %zu wrong\n",
         isatty(STDOUT_FILENO) ? "\r\033[K" : "", shared.lives.load(), shared.planned,
         static_cast<long long>(time(nullptr) - start), shared.disturbed.load(),
         shared.problems.load());
}

int sweep(const Wish& wish) {
  auto& shared = *static_cast<Shared*>(
      mmap(nullptr, sizeof(Shared), PROT_READ | PROT_WRITE, MAP_SHARED | MAP_ANONYMOUS, -1, 0));
  start_worker([&] { plan(wish, shared); });
  while (wait(nullptr) > 0) {
  }
  if (shared.planned == 0) {
    fprintf(stderr, "a life without faults has no such call\n");
    return 1;
  }
  const Normal normal = read_normal({shared.normal, shared.normal_size});
  for (int i = 0; i < kWorkers; ++i) {
    start_worker([&] {
      for (size_t turn; (turn = shared.next++) < shared.planned; ++shared.lives) {
        const auto& [fault, where] = shared.plan[turn];
        if (!try_fault(fault, where, normal, shared)) ++shared.problems;
      }
    });
  }
  show_progress(shared);
  return shared.problems == 0 && shared.lives == shared.planned ? 0 : 1;
}

// False for what cannot be understood.
bool read_wish(int argc, char** argv, Wish& wish) {
  for (int i = 1; i < argc; ++i) {
    const std::string word = argv[i];
    const auto* mode = std::find(std::begin(kModes), std::end(kModes), word);
    if (word == "--slice") {
      bool good = ++i < argc && sscanf(argv[i], "%zu/%zu", &wish.first, &wish.step) == 2;
      if (!good || wish.first < 1 || wish.first > wish.step) return false;
    } else if (mode != std::end(kModes)) {
      for (size_t k = 0; k < 3; ++k) wish.modes[k] = kModes[k] == word;
    } else if (wish.call.empty() && word[0] != '-') {
      wish.call = word;
    } else {
      return false;
    }
  }
  return true;
}

}  // namespace
}  // namespace corvexd::faults

int main(int argc, char** argv) {
  corvexd::faults::Wish wish;
  if (!corvexd::faults::read_wish(argc, argv, wish)) {
    fprintf(stderr, "usage: ./dev faults [fail|kill|delay] [CALL] [--slice N/M]\n");
    return 2;
  }
  return corvexd::faults::sweep(wish);
}
