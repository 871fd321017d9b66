#include "core/thread.h"

#include <pthread.h>
#include <string.h>

#include "core/log.h"

namespace corvexd {

void start_thread(void* (*body)(void*)) {
  pthread_t thread;
  int error = pthread_create(&thread, nullptr, body, nullptr);
  if (error != 0) {
    log_error("corvexd: thread create failed: %s\n", strerror(error));
    return;
  }
  pthread_detach(thread);
}

}  // namespace corvexd
