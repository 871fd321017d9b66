// Child processes: how every one of them is started, reaped and ended.
#pragma once

#include <stdint.h>
#include <sys/types.h>

namespace corvexd {

// Where a starter keeps its latest child. Only the operations below touch it. Static storage: a
// slot that was used stays known to the handler.
struct ChildSlot {
  int32_t pid = 0;       // what the latest fork returned; -1 when it failed, 0 for none
  bool running = false;  // false once the child has been reaped: its number may be another's now
  int status = 0;        // the wait status of a child that has been reaped; 0 until then
  bool known = false;
  ChildSlot* next = nullptr;
};

// Forks. The child runs body(argument) and ends with status 1 if that returns; it must not return
// into the starter's sequence in any other way, nor wait for a lock that another thread may hold
// (allocation and local_timestamp are safe). The parent does not wait; the result of the fork is
// in the slot (errno is the fork's). The slot forgets its earlier child, which goes on. Children
// that have ended are reaped first, as by one SIGCHLD each. Any thread; each slot belongs to one
// thread.
void start_child(ChildSlot& slot, void (*body)(const void*), const void* argument);

// Replaces the calling child by a program with the daemon's environment; ends it with status 1
// when that fails. `arguments` ends with a null entry.
[[noreturn]] void exec_program(const char* path, const char* const* arguments);

// Waits until the slot's child has ended, whoever reaps it, and returns its wait status. Main
// thread, after a start_child that did not fail.
int wait_for_child(ChildSlot& slot);

// Sends SIGTERM to the slot's child if it still runs; never to a number that may have passed on to
// another process. Any thread.
void terminate_child(ChildSlot& slot);

// Empties the slot: its child, if it still runs, goes on without being watched. Any thread.
void forget_child(ChildSlot& slot);

// The SIGCHLD handler: reaps one ended child, any of them, and logs it.
void sig_chld_handler(int signal);

// Installs sig_chld_handler. Every starter does so before its first child.
void install_sigchld_handler();

}  // namespace corvexd
