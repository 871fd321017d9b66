// Plays the log daemon: keeps every line that is logged.
#pragma once

#include <atomic>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

namespace corvexd::test {

struct LogLine {
  int buffer;
  int priority;
  std::string tag;
  std::string text;
};

class LogCatcher {
 public:
  ~LogCatcher() { stop(); }
  void start();  // binds the log daemon's socket
  void stop();

  std::vector<LogLine> lines();           // every line sent before the call
  std::vector<std::string> texts();       // in the order of arrival
  bool has(const std::string& text);      // exactly this line, waited for
  size_t count(const std::string& part);  // lines that hold `part`
  void clear();

 private:
  void collect();
  void catch_up();

  int socket_ = -1;
  std::thread collector_;
  std::mutex mutex_;
  std::vector<LogLine> lines_;
  std::atomic<bool> caught_up_{false};
};

}  // namespace corvexd::test
