// The keyword tables of the fstab reader.
#pragma once

#include <stdint.h>

struct flag_list;

constexpr int32_t kSlotSelectFlag = 0x8000;

extern const struct flag_list kMountOptions[];
extern const struct flag_list kFsMgrOptions[];
