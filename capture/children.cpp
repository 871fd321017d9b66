#include "capture/children.h"

#include <errno.h>
#include <sched.h>
#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

#include <atomic>

#include "capture/recorders.h"
#include "core/local_time.h"
#include "core/log.h"

// The handler runs on any thread, at any moment, and reaps any child, and a number is free for
// another process once its child is reaped. So:
//
// - Slots are read and written, children reaped and signals sent under one spin lock. It is taken
//   with SIGCHLD blocked on the taking thread, so the handler never waits for the thread that it
//   interrupted. Its holder never blocks. A slot that says "running" cannot lose its child between
//   the test and the kill.
// - It is never held across fork(). The C library takes its allocation locks there; a thread
//   interrupted inside an allocation would otherwise spin in the handler for a lock whose owner
//   waits for that very allocation.
// - The forking thread blocks SIGCHLD. In the child, the lock may be held by a thread that does not
//   exist there; a handler that ran before the lock is reset would wait forever.
// - Between a fork and the storing of its result, no slot names the child. SIGCHLDs that other
//   threads get then are counted, and the starter handles them right afterwards: a child that ends
//   at once is still found in its slot. Two threads start children. Each holds the mutex over the
//   local time while it does, so one start ends before the next begins.

namespace corvexd {
namespace {

std::atomic_flag slots_locked = ATOMIC_FLAG_INIT;
ChildSlot* known_slots = nullptr;
bool starting = false;
int pending_deliveries = 0;

class SigchldBlock {
 public:
  SigchldBlock() {
    sigset_t child_ended;
    sigemptyset(&child_ended);
    sigaddset(&child_ended, SIGCHLD);
    pthread_sigmask(SIG_BLOCK, &child_ended, &earlier_mask_);
  }
  ~SigchldBlock() { pthread_sigmask(SIG_SETMASK, &earlier_mask_, nullptr); }
  SigchldBlock(const SigchldBlock&) = delete;
  SigchldBlock& operator=(const SigchldBlock&) = delete;

 private:
  sigset_t earlier_mask_;
};

class SlotLock {
 public:
  SlotLock() {
    while (slots_locked.test_and_set(std::memory_order_acquire)) sched_yield();
  }
  ~SlotLock() { slots_locked.clear(std::memory_order_release); }

 private:
  SigchldBlock blocked_;  // from before the lock is taken until after it is free
};

void begin_start(ChildSlot& slot) {
  SlotLock lock;
  starting = true;
  slot.status = 0;
  if (slot.known) return;
  slot.known = true;
  slot.next = known_slots;
  known_slots = &slot;
}

// Another thread's handler may have held the lock at the fork; it does not exist in the child.
void reset_after_fork() {
  starting = false;
  pending_deliveries = 0;
  slots_locked.clear(std::memory_order_release);
}

// Ends the start: stores the fork's result and returns how many SIGCHLDs arrived meanwhile.
int end_start(ChildSlot& slot, pid_t result) {
  SlotLock lock;
  slot.pid = result;
  slot.running = result > 0;
  starting = false;
  int pending = pending_deliveries;
  pending_deliveries = 0;
  return pending;
}

// In the parent, *pending gets what end_start returns.
pid_t fork_and_store(ChildSlot& slot, int* pending) {
  SigchldBlock blocked;
  pid_t result = fork();
  if (result == 0) {
    reset_after_fork();
  } else {
    *pending = end_start(slot, result);
  }
  return result;
}

void mark_ended(ChildSlot& slot, int status) {
  slot.running = false;
  slot.status = status;
}

// Reaps one ended child, if there is one. False when a start is under way and it must wait.
bool reap_one(pid_t* reaped) {
  SlotLock lock;
  if (starting) {
    ++pending_deliveries;
    return false;
  }
  int status;
  *reaped = waitpid(-1, &status, WNOHANG);
  if (*reaped <= 0) return true;
  for (ChildSlot* slot = known_slots; slot != nullptr; slot = slot->next) {
    if (slot->pid == *reaped) mark_ended(*slot, status);
  }
  return true;
}

void on_sigchld() {
  pid_t reaped = 0;
  if (!reap_one(&reaped)) return;
  log_error("corvexd: stop_logcat : %d, pid = %d\n", stop_logcat.load(), reaped);
}

// Each SIGCHLD reaps one child, but the kernel merges SIGCHLDs that arrive together. Without this
// the zombies that are left over would pile up, capture after capture.
void reap_merged_ends() {
  siginfo_t ended = {};
  while (waitid(P_ALL, 0, &ended, WEXITED | WNOHANG | WNOWAIT) == 0 && ended.si_pid != 0) {
    sig_chld_handler(SIGCHLD);
    ended = {};
  }
}

}  // namespace

void start_child(ChildSlot& slot, void (*body)(const void*), const void* argument) {
  local_time_mutex.lock();
  reap_merged_ends();
  begin_start(slot);
  int pending = 0;
  pid_t result = fork_and_store(slot, &pending);
  int error = errno;
  local_time_mutex.unlock();
  if (result == 0) {
    body(argument);
    _exit(1);
  }
  for (; pending > 0; --pending) on_sigchld();
  errno = error;
}

void exec_program(const char* path, const char* const* arguments) {
  execv(path, const_cast<char* const*>(arguments));
  _exit(1);
}

int wait_for_child(ChildSlot& slot) {
  // Wait without reaping, then reap under the lock. If the handler reaped the child first, the slot
  // holds its status.
  siginfo_t info;
  TEMP_FAILURE_RETRY(waitid(P_PID, slot.pid, &info, WEXITED | WNOWAIT));
  SlotLock lock;
  int status;
  if (slot.running && waitpid(slot.pid, &status, WNOHANG) == slot.pid) mark_ended(slot, status);
  return slot.status;
}

void terminate_child(ChildSlot& slot) {
  SlotLock lock;
  if (slot.running) kill(slot.pid, SIGTERM);
}

void forget_child(ChildSlot& slot) {
  SlotLock lock;
  if (slot.pid > 0) slot.pid = 0;
  slot.running = false;
}

void sig_chld_handler(int signal) {
  int saved_errno = errno;
  log_debug("corvexd: in function %s\n", __func__);
  if (signal == SIGCHLD) {
    log_debug("corvexd: in function %s, and receive signal %d\n", __func__, signal);
    on_sigchld();
  }
  errno = saved_errno;
}

void install_sigchld_handler() { signal(SIGCHLD, sig_chld_handler); }

}  // namespace corvexd
