// The daemon's answers to DELETELOG, taken out of a stream that does not part them.
#pragma once

#include <stddef.h>

#include <string>

namespace corvexd {

class Replies {
 public:
  // Takes in what was received, and prints each reply that is whole on a line of its own. False
  // when the bytes cannot be a reply.
  bool receive(const char* data, size_t size);

  size_t count() const { return count_; }
  bool any_failed() const { return any_failed_; }

 private:
  bool take(const char* reply);

  std::string pending_;
  size_t count_ = 0;
  bool any_failed_ = false;
};

}  // namespace corvexd
