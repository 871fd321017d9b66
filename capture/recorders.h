// The nine recorders of a capture: what switches each one on, what its child runs, what ends it.
#pragma once

#include <stdint.h>

#include "capture/children.h"
#include "capture/node_reader.h"

namespace corvexd {

// The switches that are read once at the start of a capture and hold for all of it.
struct CaptureSwitches {
  bool main;
  bool system;
  bool kernel_kmsg;
};

struct Recorder {
  const char* switches[2];  // properties; on when any of them is "yes"
  ChildSlot* slot;
  void (*run)(const CaptureSwitches& switches);  // the child's body, or
  const NodeReader* reader;                      // the reader that the child is
  int32_t* descriptors[2];                       // closed in this order before the child is ended
};

// In the order in which recorders are started and ended.
constexpr int kRecorderCount = 9;
extern const Recorder kRecorders[kRecorderCount];

// Whether a switch property reads exactly "yes" at this moment.
bool switched_on(const char* property);

}  // namespace corvexd
