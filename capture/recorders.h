// The nine recorders of a capture: what switches each one on, what its child runs, what ends it;
// and the state of the capture that their start, their stop and those who watch it share.
#pragma once

#include <stdint.h>

#include <atomic>

#include "capture/children.h"
#include "capture/node_reader.h"

namespace corvexd {

// The recorders' children. A slot holds its recorder's number from the fork until "LOGSTOP" signals
// it, whether or not the recorder has ended meanwhile.
extern ChildSlot android_pid;
extern ChildSlot radio_pid;
extern ChildSlot event_pid;
extern ChildSlot kernel_pid;
extern ChildSlot tcpdump_pid;
extern ChildSlot qsee_pid;
extern ChildSlot tz_pid;
extern ChildSlot bootloader_pid;
extern ChildSlot pre_bootloader_pid;

// The source and output of the daemon's own readers. They are -1 except in the reader's process.
extern int32_t kernel_from_fd, kernel_to_fd;
extern int32_t qsee_from_fd, qsee_to_fd;
extern int32_t tz_from_fd, tz_to_fd;
extern int32_t bootloader_from_fd, bootloader_to_fd;
extern int32_t pre_bootloader_from_fd, pre_bootloader_to_fd;

// stop_logcat is 0 from the end of a start to the next stop. capture_running is 1 from the start of
// the first recorder to the stop. Written by the main thread.
extern std::atomic<uint8_t> stop_logcat;
extern std::atomic<uint8_t> capture_running;

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
