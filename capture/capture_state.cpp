#include "capture/capture_state.h"

namespace corvexd {

ChildSlot android_pid;
ChildSlot radio_pid;
ChildSlot event_pid;
ChildSlot kernel_pid;
ChildSlot tcpdump_pid;
ChildSlot qsee_pid;
ChildSlot tz_pid;
ChildSlot bootloader_pid;
ChildSlot pre_bootloader_pid;

int32_t kernel_from_fd = -1, kernel_to_fd = -1;
int32_t qsee_from_fd = -1, qsee_to_fd = -1;
int32_t tz_from_fd = -1, tz_to_fd = -1;
int32_t bootloader_from_fd = -1, bootloader_to_fd = -1;
int32_t pre_bootloader_from_fd = -1, pre_bootloader_to_fd = -1;

std::atomic<uint8_t> stop_logcat{1};
std::atomic<uint8_t> capture_running{0};

}  // namespace corvexd
