#include "core/local_time.h"

namespace corvexd {

std::mutex local_time_mutex;

Timestamp local_timestamp() {
  char text[100];
  time_t now = time(nullptr);
  struct tm local = {};
  {
    std::lock_guard<std::mutex> lock(local_time_mutex);
    localtime_r(&now, &local);
    strftime(text, sizeof text, "%Y-%m-%d-%H-%M-%S", &local);
  }
  return Timestamp().append(text);
}

}  // namespace corvexd
