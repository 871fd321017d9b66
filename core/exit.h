// How the daemon ends itself.
#pragma once

#include <atomic>

namespace corvexd {

// The sockets that clients wait for; -1 for none. The control socket's loop sets them.
extern std::atomic<int> listening_socket;
extern std::atomic<int> client_connection;

// Ends the process with status 1; init starts it again. Clients see the end at once, although
// readers and samplers go on and hold copies of the sockets. Any thread.
[[noreturn]] void exit_daemon();

}  // namespace corvexd
