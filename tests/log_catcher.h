// Plays the log daemon: keeps every line that is logged.
#pragma once

#include <atomic>
#include <mutex>
#include <string>
#include <thread>

#include "tests/files.h"

namespace corvexd::test {

class LogCatcher {
 public:
  ~LogCatcher() { stop(); }
  void start();  // binds the log daemon's socket
  void stop();

  // Every line sent before the call, in the order of arrival, but those that hold a part ignored.
  // The second way, each stands behind the letter of its priority and "/".
  Texts texts(const Texts& ignored = {});
  Texts lines(const Texts& ignored = {});
  bool has(const std::string& text);      // exactly this line, waited for
  size_t count(const std::string& part);  // lines that hold `part`
  void clear();

 private:
  void collect();
  void catch_up();

  int socket_ = -1;
  std::thread collector_;
  std::mutex mutex_;
  Texts lines_;
  std::atomic<bool> caught_up_{false};
};

}  // namespace corvexd::test
