// The command table.
#pragma once

namespace corvexd {

// Runs the action of the command `text` to its end on the calling (main) thread; a text that is no
// command does nothing. The action may answer on `connection`, which the caller keeps.
void run_command(const char* text, int connection);

}  // namespace corvexd
