// One connection to the daemon: words go out, replies come in, until the daemon ends it.
#pragma once

#include <string>
#include <vector>

#include "client/command_words.h"
#include "client/elapsed_clock.h"
#include "client/replies.h"

namespace corvexd {

// The messages that carry `words`, each behind its length.
std::string frame(const std::vector<const CommandWord*>& words);

// Connects to the socket at `path`, waiting while the daemon's queue of clients is full. Returns
// the descriptor, or -1 with errno set.
int connect_to_daemon(const std::string& path, ElapsedClock* clock);

// Sends `messages`, ends the sending half and hands everything that comes back to `replies` until
// the daemon has ended the connection. Returns 0, or the error number when the daemon ended it
// before it had taken in every message, or answered what cannot be a reply (EBADMSG).
int converse(int connection, const std::string& messages, ElapsedClock* clock, Replies* replies);

}  // namespace corvexd
