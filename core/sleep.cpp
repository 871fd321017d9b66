#include "core/sleep.h"

#include <errno.h>

namespace corvexd {

void sleep_seconds(time_t seconds) {
  struct timespec left = {seconds, 0};
  while (nanosleep(&left, &left) != 0 && errno == EINTR) {
  }
}

}  // namespace corvexd
