// Sleeping that signals do not cut short.
#pragma once

#include <time.h>

namespace corvexd {

// Sleeps on the calling thread for the whole time, however many children end meanwhile. The only
// operation of its unit, so that a test can link a shorter one in its place.
void sleep_seconds(time_t seconds);

}  // namespace corvexd
