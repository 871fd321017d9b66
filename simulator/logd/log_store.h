// The log's ring buffers: each keeps its newest lines within a limit of bytes.
#pragma once

#include <stddef.h>
#include <stdint.h>
#include <sys/socket.h>

#include <deque>
#include <string>

namespace corvexd::sim {

constexpr int kBufferCount = 5;  // main, radio, events, system, crash: log ids 0 to 4

// How far a reader has come: the number of its next line in each buffer.
struct LogPosition {
  uint64_t next[kBufferCount];
};

class LogStore {
 public:
  // Takes a line as it was written to the socket; one that is no line is dropped.
  void add(const char* datagram, size_t size, const struct ucred& writer);

  // The oldest line at or after `position`, and before `end`, in the chosen buffers, as a
  // logger_entry with its payload; null when there is none. `position` moves past lines that the
  // limit took away, and past the answered one. The line stays the store's, until the next add.
  const std::string* take(uint32_t buffers, LogPosition* position, const LogPosition& end) const;
  bool has_more(uint32_t buffers, const LogPosition& position, const LogPosition& end) const;

  void clear(uint32_t buffers);

  // Behind the newest line of each buffer.
  LogPosition end() const;

 private:
  struct Buffer {
    std::deque<std::string> lines;
    uint64_t first = 0;  // number of the oldest line
    size_t bytes = 0;

    void drop_oldest();
  };

  Buffer buffers_[kBufferCount];
};

}  // namespace corvexd::sim
