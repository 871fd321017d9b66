#include "capture/children.h"

#include <errno.h>
#include <pthread.h>
#include <signal.h>
#include <stdio.h>
#include <stdlib.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <atomic>
#include <memory>
#include <thread>

#include "core/local_time.h"
#include "core/log.h"
#include "tests/daemon.h"

namespace corvexd::test {
namespace {

using Children = DeviceTest;

#ifdef CORVEX_SANITIZED
constexpr bool kSanitized = true;
#else
constexpr bool kSanitized = false;
#endif
#ifdef CORVEX_NOISY_MEMORY
constexpr long kMemoryNoise = 100'000;  // KiB
#else
constexpr long kMemoryNoise = 256;
#endif

// The sanitizers' allocators, unlike the C library's, do not survive a fork beside threads that are
// inside them.
constexpr bool kChildrenMayAllocate = !kSanitized;

ChildSlot slots[4];

void end_at_once(const void*) {}

void live(const void*) {
  while (true) pause();
}

void live_on(const void*) {
  signal(SIGTERM, SIG_IGN);
  live(nullptr);
}

void allocate(size_t size) {
  void* volatile memory = malloc(size);  // volatile: or the pair is optimised away
  free(memory);
}

// What the daemon's own readers and samplers may do before they end.
void work_and_end(const void*) {
  for (int i = 0; i < 20 && kChildrenMayAllocate; ++i) allocate(64 << (i % 12));
  log_debug("%s\n", local_timestamp().c_str());
  raise(SIGCHLD);  // a child may have children, too
}

// Makes a process with exactly this number in the pid namespace of the test.
pid_t start_bystander(pid_t number) {
  write_file("/proc/sys/kernel/ns_last_pid", std::to_string(number - 1));
  pid_t pid = fork();
  if (pid == 0) live(nullptr);
  return pid;
}

bool is_running(pid_t pid) {
  int status;
  return waitpid(pid, &status, WNOHANG) == 0;
}

TEST_F(Children, NoSignalReachesARecycledNumber) {
  install_sigchld_handler();
  start_child(slots[0], end_at_once, nullptr);
  const pid_t number = slots[0].pid;
  ASSERT_TRUE(log.has("corvexd: stop_logcat : 1, pid = " + std::to_string(number) + "\n"));
  signal(SIGCHLD, SIG_DFL);
  pid_t bystander = start_bystander(number);
  ASSERT_EQ(number, bystander);
  terminate_child(slots[0]);
  usleep(100'000);
  EXPECT_TRUE(is_running(bystander));
  EXPECT_EQ(number, slots[0].pid) << "a slot keeps its number";
  kill(bystander, SIGKILL);
  waitpid(bystander, nullptr, 0);

  install_sigchld_handler();
  start_child(slots[0], live, nullptr);
  terminate_child(slots[0]);
  EXPECT_TRUE(log.has("corvexd: stop_logcat : 1, pid = " + std::to_string(slots[0].pid) + "\n"));
  errno = EDOM;
  raise(SIGCHLD);
  EXPECT_EQ(EDOM, errno) << "whoever is interrupted keeps its own";
}

TEST_F(Children, AForkThatFailsLeavesNobodyToSignal) {
  if (!owners_work()) GTEST_SKIP() << "Only another user can have too many processes.";
  EXPECT_EQ(0, status_in_child([] {
              const struct rlimit none = {0, 0};
              setrlimit(RLIMIT_NPROC, &none);
              if (setuid(10001) != 0) _exit(2);
              start_child(slots[0], end_at_once, nullptr);
              _exit(errno == EAGAIN && slots[0].pid == -1 && !slots[0].running ? 0 : 1);
            }));
}

// SIGCHLD for every thread of a process, in whatever it does, sleeps or waits for.
class Storm {
 public:
  explicit Storm(pid_t pid) : thread_([this, pid] { rage(pid); }) {}
  ~Storm() {
    done_ = true;
    thread_.join();
  }

 private:
  void rage(pid_t pid) const {
    for (; !done_; usleep(2000)) {
      for (const std::string& task : list("/proc/" + std::to_string(pid) + "/task")) {
        tgkill(pid, atoi(task.c_str()), SIGCHLD);
      }
    }
  }

  std::atomic<bool> done_{false};
  std::thread thread_;
};

bool children_begin_with_a_signal = false;

void signal_new_child() {
  if (children_begin_with_a_signal) raise(SIGCHLD);
}

TEST_F(Children, ForkBesideThreadsInsideTheLibraryNeverHangs) {
  ASSERT_EQ(0, pthread_atfork(nullptr, nullptr, signal_new_child));
  children_begin_with_a_signal = true;
  // A handler that interrupts an allocation waits for the log's reader, who allocates as well here.
  log.stop();
  ASSERT_NE(nullptr, freopen("/dev/null", "w", stderr));
  install_sigchld_handler();
  std::atomic<bool> done{false};
  ChildSlot stubborn;
  start_child(stubborn, live_on, nullptr);
  std::vector<std::thread> threads;
  for (int i = 0; i < 3; ++i) {
    threads.emplace_back([&done, &stubborn, i] {
      unsigned size = 1;
      while (!done && i == 0) terminate_child(stubborn);
      while (!done) {
        size = size * 1103515245 + 12345;
        allocate(size % 70'000);
        if (i == 1 && size % 64 == 0) local_timestamp();
        if (i == 2 && size % 4096 == 0) log_debug("busy\n");
      }
    });
  }
  auto storm = std::make_unique<Storm>(getpid());
  constexpr int kRounds = 200;
  static ChildSlot beside;
  std::thread starter([&] {
    for (int round = 0; round < kRounds; ++round) {
      start_child(beside, end_at_once, nullptr);
    }
  });
  for (int round = 0; round < kRounds; ++round) {
    ChildSlot& slot = slots[round % 4];
    start_child(slot, round % 2 == 0 ? work_and_end : end_at_once, nullptr);
    ASSERT_GT(slot.pid, 0);
  }
  starter.join();
  done = true;
  storm.reset();
  for (std::thread& thread : threads) thread.join();
  signal(SIGCHLD, SIG_DFL);
  kill(stubborn.pid, SIGKILL);
  while (waitpid(-1, nullptr, 0) > 0) {
  }
}

// The C library's lock over its time zone goes into the child as it stands at the fork.
bool looks_at_forks = false, fork_came_between = false;

void look_at_fork() {
  if (!looks_at_forks) return;
  std::thread([] {
    if (!local_time_mutex.try_lock()) return;
    fork_came_between = true;
    local_time_mutex.unlock();
  }).join();
}

TEST_F(Children, NobodyIsInsideTheTimeZoneAtAFork) {
  install_sigchld_handler();
  ASSERT_EQ(0, pthread_atfork(look_at_fork, nullptr, nullptr));
  looks_at_forks = true;
  start_child(slots[0], end_at_once, nullptr);
  looks_at_forks = false;
  EXPECT_FALSE(fork_came_between);
  EXPECT_TRUE(local_time_mutex.try_lock());
  local_time_mutex.unlock();
}

struct Usage {
  size_t descriptors, threads, children;
  long kilobytes;
};

Usage usage_of(pid_t pid) {
  const std::string proc = "/proc/" + std::to_string(pid);
  Usage usage = {list(proc + "/fd").size(), list(proc + "/task").size(), children_of(pid).size(),
                 0};
  std::string status = read_file(proc + "/status");
  usage.kilobytes = atol(status.c_str() + status.find("VmRSS:") + 6);
  return usage;
}

TEST_F(Children, TwoHundredCapturesInAStormOfSignalsLeaveNothingBehind) {
  write_script("/system/bin/getprop", "");
  write_script("/system/bin/bugreport", "echo report");
  switch_on({"main", "radio", "event", "kernel", "tcpdump"});
  run("mkdir /data/tombstones");
  Daemon daemon(log);
  send_commands({"LOGSTOP"});
  set_property("persist.sys.assert.panic", "true");
  // The thread sanitizer adds one of its own beside the first thread that is started.
  const size_t idle_threads = usage_of(daemon.pid()).threads + (kSanitized ? 1 : 0);
  Storm storm(daemon.pid());
  Usage before = {};
  for (int round = 0; round < 200; ++round) {
    const char* modes[] = {"die", "live", "brief", "stubborn"};
    install_probes(modes[round % 4]);
    send_commands({"LOGBEGIN", "CPUTHERMAL"});
    write_file("/data/tombstones/tombstone", "t");
    if (kChildrenMayAllocate) send_commands({"BUGREPORT"});
    send_commands({"STOPCPUTHERMAL", "LOGSTOP"});
    if (round == 19) before = usage_of(daemon.pid());
  }
  run("pkill -KILL -P " + std::to_string(daemon.pid()) + " -f 'logcat|tcpdump'");
  Usage after;
  EXPECT_TRUE(eventually([&] {
    after = usage_of(daemon.pid());
    return after.threads <= idle_threads && after.children == 0;
  })) << after.threads
      << " threads, " << after.children << " children";
  EXPECT_LE(after.descriptors, before.descriptors);
  EXPECT_LT(after.kilobytes, before.kilobytes + kMemoryNoise);
  EXPECT_EQ(0u, log.count("abnormally"));
  if (!kChildrenMayAllocate) return;
  run("[ $(cat /data/corvex/*/*-BUGREPORT.log | grep -c '^report$') = 200 ]");
}

}  // namespace
}  // namespace corvexd::test
