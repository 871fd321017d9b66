// The fstab reader: every entry of the file as a record. Knows nothing of the daemon.
#pragma once

#include <stdint.h>
#include <stdio.h>

// The parameters of one entry's fifth field.
struct fs_mgr_flag_values {
  char* key_location;
  char* key_directory;
  char* verity_location;
  int64_t length;
  char* label;
  int32_t partition_number;
  int32_t swap_priority;
  int32_t max_comp_streams;
  uint32_t zram_size;           // bytes
  uint64_t reserved_size;       // bytes
  uint32_t file_contents_mode;  // 0: none or unknown
  uint32_t file_names_mode;
  uint32_t erase_block_size;  // bytes
  uint32_t logical_block_size;
  bool incomplete;  // memory for a text was lacking
};

// One entry. Strings are the table's; an absent one is null.
struct fstab_entry : fs_mgr_flag_values {
  char* mount_source;
  char* mount_point;
  char* fs_type;
  uint64_t mount_flags;  // as mount(2) takes them
  char* mount_options;   // the options that are no mount flags, joined by ","
  int32_t fs_mgr_flags;
};

struct fstab {
  int32_t entry_count;
  struct fstab_entry* entries;  // in file order
  char* source_path;
};

// Set in fs_mgr_flags by "forceencrypt=".
constexpr int32_t kForceEncryptFlag = 0x400;

// Reads the table at `path`, which the caller releases with fs_mgr_free_fstab. Null (logged) when
// the file cannot be opened or read, holds no entry, or one of fewer than five fields, shrinks
// while it is read, or memory is lacking. Any thread.
struct fstab* fs_mgr_read_fstab(const char* path);

// Releases a table with all it owns; null is allowed.
void fs_mgr_free_fstab(struct fstab* table);

// The first entry whose mount point is `path` or a directory above it; null for none or for a null
// table. The table's own.
struct fstab_entry* fs_mgr_get_entry_for_mount_point(struct fstab* table, const char* path);

// --- The reader's parts ---

// A keyword and its value; a table of these ends with a null keyword. A keyword that takes a value
// ends in "=".
struct flag_list {
  const char* keyword;
  uint32_t value;
};

struct fstab* fs_mgr_read_fstab_file(FILE* file);

// Cuts `field` at its commas (changing it) and returns the values of the options that start with a
// keyword, or-ed. Parameters go to *values unless that is null, whole options without a keyword
// into `options` (options_size bytes, joined by ",") unless that is null.
int parse_flags(char* field, const struct flag_list* table, struct fs_mgr_flag_values* values,
                char* options, int options_size);

// The code of an encryption mode; 0 (logged) for an unknown one.
uint32_t encryption_mode_to_flag(const struct flag_list* modes, const char* mode, const char* kind);

// Appends the slot suffix to the sources of entries that ask for it; false when there is none.
bool fs_mgr_update_for_slotselect(struct fstab* table);
