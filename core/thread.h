// Worker threads.
#pragma once

namespace corvexd {

// Starts a thread that nobody joins. When it cannot be started, one error line says so and its work
// is missing.
void start_thread(void* (*body)(void*));

}  // namespace corvexd
