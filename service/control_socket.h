// The control socket: its set-up, its framing, its command loop.
#pragma once

namespace corvexd {

// Reads exactly `count` bytes into `buffer`, in as many reads as it takes. Returns 0, or -1
// (logged) when the stream ends or fails first; -1 at once for a negative count.
int readx(int fd, void* buffer, int count);

// Marks the socket that init handed over, if it did, so that no child inherits it. Before the first
// child is started.
void set_control_socket_cloexec();

// Puts the socket that init handed over into listening state. Ends the process with status 1 when
// there is none or it cannot listen.
void listen_on_control_socket();

// Runs one client's commands, one after another, until the connection ends or breaks the framing;
// the caller closes it. Main thread.
void serve_connection(int connection);

// Serves one client after another on the calling (main) thread, for the rest of the process's life.
[[noreturn]] void serve_clients();

}  // namespace corvexd
