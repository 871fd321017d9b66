#include "core/published_path.h"

namespace corvexd {

// A sequence lock: odd while a text is being written. Each word is stored with release and loaded
// with acquire, so a reader that saw one word of a newer text also sees the newer sequence and
// reads again.

void PublishedPath::set(const Path& path) {
  uint64_t words[kWords] = {};
  memcpy(words, path.c_str(), strlen(path.c_str()));
  uint32_t sequence = sequence_.load(std::memory_order_relaxed);
  sequence_.store(sequence + 1, std::memory_order_relaxed);
  for (size_t i = 0; i < kWords; ++i) words_[i].store(words[i], std::memory_order_release);
  sequence_.store(sequence + 2, std::memory_order_release);
}

Path PublishedPath::get() const {
  uint64_t words[kWords];
  uint32_t before;
  do {
    before = sequence_.load(std::memory_order_acquire);
    for (size_t i = 0; i < kWords; ++i) words[i] = words_[i].load(std::memory_order_acquire);
  } while (before % 2 != 0 || sequence_.load(std::memory_order_relaxed) != before);
  return Path().append(reinterpret_cast<const char*>(words));
}

}  // namespace corvexd
