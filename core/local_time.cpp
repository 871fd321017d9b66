#include "core/local_time.h"

namespace corvexd {

std::mutex local_time_mutex;

struct tm local_time() {
  time_t now = time(nullptr);
  struct tm local = {};
  std::lock_guard<std::mutex> lock(local_time_mutex);
  tzset();  // the phone may have learned its zone since the last time
  localtime_r(&now, &local);
  return local;
}

Timestamp local_timestamp() {
  struct tm now = local_time();
  return Timestamp().append_format("%d-%02d-%02d-%02d-%02d-%02d", now.tm_year + 1900,
                                   now.tm_mon + 1, now.tm_mday, now.tm_hour, now.tm_min,
                                   now.tm_sec);
}

}  // namespace corvexd
