// The command table.
#pragma once

namespace corvexd {

// Runs the action of the command that `text` is, to its end, on the calling (main) thread; a text
// that is no command does nothing. The action may answer on `connection`, which stays the caller's.
void run_command(const char* text, int connection);

}  // namespace corvexd
