#include "client/elapsed_clock.h"

#include <stdio.h>
#include <unistd.h>

namespace corvexd {

ElapsedClock::ElapsedClock()
    : on_terminal_(isatty(STDERR_FILENO) == 1), start_(std::chrono::steady_clock::now()) {}

std::chrono::milliseconds ElapsedClock::elapsed() const {
  return std::chrono::duration_cast<std::chrono::milliseconds>(std::chrono::steady_clock::now() -
                                                               start_);
}

int ElapsedClock::until_next() const {
  return on_terminal_ ? static_cast<int>(1000 - elapsed().count() % 1000) : -1;
}

void ElapsedClock::draw() {
  const long long seconds = elapsed().count() / 1000;
  if (!on_terminal_ || seconds == 0) return;
  fprintf(stderr, "\rwaiting for the daemon %lld:%02lld ", seconds / 60, seconds % 60);
  drawn_ = true;
}

void ElapsedClock::hide() {
  if (drawn_) fputs("\r\033[K", stderr);
  drawn_ = false;
}

}  // namespace corvexd
