// Any bytes as an fstab: read, asked, released.
#include <stdint.h>
#include <stdio.h>

#include "fs_mgr/fs_mgr_fstab.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  if (size == 0) return 0;
  FILE* file = fmemopen(const_cast<uint8_t*>(data), size, "r");
  if (file == nullptr) return 0;
  fstab* table = fs_mgr_read_fstab_file(file);
  fclose(file);
  if (table != nullptr && table->entry_count < 1) __builtin_trap();
  fs_mgr_get_entry_for_mount_point(table, "/data");
  fs_mgr_free_fstab(table);
  return 0;
}
