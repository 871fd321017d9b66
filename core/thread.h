// Worker threads.
#pragma once

namespace corvexd {

// Starts a detached thread. If it cannot be started, one error line says so, and its work is not
// done.
void start_thread(void* (*body)(void*));

}  // namespace corvexd
