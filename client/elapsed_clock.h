// A line on standard error that shows how long the daemon has been at it.
#pragma once

#include <chrono>

namespace corvexd {

// Shows nothing unless standard error is a terminal, and nothing in the first second, in which most
// commands end.
class ElapsedClock {
 public:
  ElapsedClock();
  ~ElapsedClock() { hide(); }
  ElapsedClock(const ElapsedClock&) = delete;
  ElapsedClock& operator=(const ElapsedClock&) = delete;

  // Milliseconds until the line has to be drawn again, -1 for never: a timeout for poll().
  int until_next() const;
  void draw();
  // Clears the line, so that other output can stand in its place.
  void hide();

 private:
  std::chrono::milliseconds elapsed() const;

  const bool on_terminal_;
  const std::chrono::steady_clock::time_point start_;
  bool drawn_ = false;
};

}  // namespace corvexd
