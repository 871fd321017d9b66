// A path that one thread writes and any thread reads, whole.
#pragma once

#include <stdint.h>

#include <atomic>

#include "core/fixed_string.h"

namespace corvexd {

// Empty until the first set(). set() runs on the main thread only; get() on any thread, and in a
// child, returns the text of the last set() or the one before it, never a mixture, and waits only
// for a set() in progress. Both copy; the object is never released.
class PublishedPath {
 public:
  void set(const Path& path);
  Path get() const;

 private:
  static constexpr size_t kWords = kPathSize / sizeof(uint64_t);
  static_assert(kPathSize % sizeof(uint64_t) == 0, "the text fills whole words");

  std::atomic<uint32_t> sequence_{0};
  std::atomic<uint64_t> words_[kWords] = {};
};

}  // namespace corvexd
