// Sleeping that signals do not cut short.
#pragma once

#include <time.h>

namespace corvexd {

// Sleeps on the calling thread for the whole time, however many signals arrive meanwhile. It has a
// file of its own so that a test can link a shorter sleep in its place.
void sleep_seconds(time_t seconds);

}  // namespace corvexd
