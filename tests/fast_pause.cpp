#include <errno.h>

#include "core/pause.h"

namespace corvexd {

void pause_seconds(time_t seconds) {
  struct timespec left = {0, seconds * 10'000'000};
  while (nanosleep(&left, &left) != 0 && errno == EINTR) {
  }
}

}  // namespace corvexd
