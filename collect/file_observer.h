// The watch over the directories where crash and diagnostic artefacts appear.
#pragma once

#include <limits.h>
#include <stddef.h>
#include <stdint.h>

#include "core/fixed_string.h"

namespace corvexd {

// Thread body: hands artefacts to the mover as they appear, while persistent capture is on. Returns
// only when inotify fails.
void* file_observer(void*);

struct Event {
  uint32_t mask;
  char name[NAME_MAX + 1];
};

// Iterates over the named events in the inotify records of one read. The records may be cut off.
class EventReader {
 public:
  EventReader(const char* records, size_t size) : next_(records), left_(size) {}

  // Sets *event to the next one; false when there is none any more.
  bool read(Event* event);

 private:
  const char* next_;
  size_t left_;
};

// The observer's state between events.
struct ObserverState {
  int inotify_fd = -1;
  LongPath anr_directory;  // of the latest trace; empty before the first
};

// Handles the inotify records of one read, which may be cut off. Observer thread.
void handle_events(ObserverState& state, const char* records, size_t size);

}  // namespace corvexd
