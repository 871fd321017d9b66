// The end of the daemon by its own will.
#pragma once

#include <atomic>

namespace corvexd {

// The sockets that clients wait at; -1 for none. The control socket's loop keeps them here.
extern std::atomic<int> listening_socket;
extern std::atomic<int> client_connection;

// Ends the process with status 1; init starts it again. Clients see the end at once, though readers
// and samplers, which live on, hold copies of the sockets. Any thread.
[[noreturn]] void exit_daemon();

}  // namespace corvexd
