// The keywords of an fstab's options, and what their parameters mean.
#include <android-base/logging.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/mount.h>
#include <unistd.h>

#include "fs_mgr/fs_mgr_flags.h"
#include "fs_mgr/fs_mgr_fstab.h"

const flag_list kMountOptions[] = {
    {"noatime", MS_NOATIME},
    {"noexec", MS_NOEXEC},
    {"nosuid", MS_NOSUID},
    {"nodev", MS_NODEV},
    {"nodiratime", MS_NODIRATIME},
    {"ro", MS_RDONLY},
    {"rw", 0},
    {"remount", MS_REMOUNT},
    {"bind", MS_BIND},
    {"rec", MS_REC},
    {"unbindable", MS_UNBINDABLE},
    {"private", MS_PRIVATE},
    {"slave", MS_SLAVE},
    {"shared", MS_SHARED},
    {"defaults", 0},
    {nullptr, 0},
};

// "verifyatboot" stands before "verify", which is a prefix of it.
const flag_list kFsMgrOptions[] = {
    {"wait", 0x1},
    {"check", 0x2},
    {"encryptable=", 0x4},
    {"forceencrypt=", kForceEncryptFlag},
    {"fileencryption=", 0x2000},
    {"forcefdeorfbe=", 0x10000},
    {"keydirectory=", 0x4000000},
    {"nonremovable", 0x8},
    {"voldmanaged=", 0x10},
    {"length=", 0x20},
    {"recoveryonly", 0x40},
    {"swapprio=", 0x80},
    {"zramsize=", 0x100},
    {"max_comp_streams=", 0x100000},
    {"verifyatboot", 0x80000},
    {"verify", 0x200},
    {"avb", 0x2000000},
    {"noemulatedsd", 0x800},
    {"notrim", 0x1000},
    {"formattable", 0x4000},
    {"slotselect", kSlotSelectFlag},
    {"nofail", 0x40000},
    {"latemount", 0x20000},
    {"reservedsize=", 0x200000},
    {"quota", 0x400000},
    {"eraseblk=", 0x800000},
    {"logicalblk=", 0x1000000},
    {"defaults", 0x0},
    {nullptr, 0},
};

namespace {

const flag_list kContentsModes[] = {{"aes-256-xts", 1}, {"software", 1}, {"ice", 2}, {nullptr, 0}};
const flag_list kNamesModes[] = {{"aes-256-cts", 3}, {"aes-256-heh", 4}, {nullptr, 0}};

constexpr uint32_t kDefaultContentsMode = 1;
constexpr uint32_t kDefaultNamesMode = 3;

// Numbers are read as the widest type, then converted to the type of their field.
long long integer(const char* text) { return strtoll(text, nullptr, 0); }

// Makes one of the values' texts a copy of the first `length` characters.
void replace(char** text, const char* value, size_t length, fs_mgr_flag_values* values) {
  free(*text);
  *text = strndup(value, length);
  if (*text == nullptr) values->incomplete = true;
}

void replace(char** text, const char* value, fs_mgr_flag_values* values) {
  replace(text, value, strlen(value), values);
}

void store_encryption(const char* argument, fs_mgr_flag_values* values) {
  const char* colon = strchr(argument, ':');
  char* contents = nullptr;
  replace(&contents, argument, strcspn(argument, ":"), values);
  if (contents == nullptr) return;
  values->file_contents_mode = encryption_mode_to_flag(kContentsModes, contents, "file contents");
  values->file_names_mode = colon == nullptr
                                ? kDefaultNamesMode
                                : encryption_mode_to_flag(kNamesModes, colon + 1, "file names");
  free(contents);
}

void store_managed_volume(const char* argument, fs_mgr_flag_values* values) {
  const char* colon = strchr(argument, ':');
  if (colon == nullptr) {
    LOG(ERROR) << "[libfs_mgr]Warning: voldmanaged= flag malformed";
    return;
  }
  replace(&values->label, argument, colon - argument, values);
  const char* partition = colon + 1;
  values->partition_number =
      strcmp(partition, "auto") == 0 ? -1 : static_cast<int32_t>(integer(partition));
}

void store_zram_size(const char* argument, fs_mgr_flag_values* values) {
  uint32_t number = static_cast<uint32_t>(integer(argument));
  if (strchr(argument, '%') == nullptr) {
    values->zram_size = number;
    return;
  }
  uint64_t pages = static_cast<uint64_t>(sysconf(_SC_PHYS_PAGES));
  uint64_t page_size = static_cast<uint64_t>(sysconf(_SC_PAGESIZE));
  values->zram_size = static_cast<uint32_t>(pages * number / 100 * page_size);
}

uint64_t size_with_suffix(const char* text) {
  char* suffix;
  uint64_t size = strtoull(text, &suffix, 10);
  switch (*suffix) {
    case 'K':
    case 'k':
      return size << 10;
    case 'M':
    case 'm':
      return size << 20;
    case 'G':
    case 'g':
      return size << 30;
    default:
      return size;
  }
}

void store_block_size(const char* argument, uint32_t* field) {
  uint32_t size = static_cast<uint32_t>(strtoull(argument, nullptr, 0));
  if (size >= 4096 && (size & (size - 1)) == 0) *field = size;
}

struct Parameter {
  const char* keyword;
  void (*store)(const char* argument, fs_mgr_flag_values* values);
};

const Parameter kParameters[] = {
    {"encryptable=", [](const char* a, fs_mgr_flag_values* v) { replace(&v->key_location, a, v); }},
    {"forceencrypt=",
     [](const char* a, fs_mgr_flag_values* v) { replace(&v->key_location, a, v); }},
    {"fileencryption=", store_encryption},
    {"forcefdeorfbe=",
     [](const char* a, fs_mgr_flag_values* v) {
       replace(&v->key_location, a, v);
       v->file_contents_mode = kDefaultContentsMode;
       v->file_names_mode = kDefaultNamesMode;
     }},
    {"keydirectory=",
     [](const char* a, fs_mgr_flag_values* v) { replace(&v->key_directory, a, v); }},
    {"voldmanaged=", store_managed_volume},
    {"length=", [](const char* a, fs_mgr_flag_values* v) { v->length = integer(a); }},
    {"swapprio=",
     [](const char* a, fs_mgr_flag_values* v) {
       v->swap_priority = static_cast<int32_t>(integer(a));
     }},
    {"zramsize=", store_zram_size},
    {"max_comp_streams=",
     [](const char* a, fs_mgr_flag_values* v) {
       v->max_comp_streams = static_cast<int32_t>(integer(a));
     }},
    {"verify", [](const char* a, fs_mgr_flag_values* v) { replace(&v->verity_location, a, v); }},
    {"reservedsize=",
     [](const char* a, fs_mgr_flag_values* v) { v->reserved_size = size_with_suffix(a); }},
    {"eraseblk=",
     [](const char* a, fs_mgr_flag_values* v) { store_block_size(a, &v->erase_block_size); }},
    {"logicalblk=",
     [](const char* a, fs_mgr_flag_values* v) { store_block_size(a, &v->logical_block_size); }},
};

// Stores the parameter of an option that starts with `keyword`, if that keyword has one.
void store_parameter(const char* keyword, const char* option, fs_mgr_flag_values* values) {
  const char* equals = strchr(option, '=');
  if (equals == nullptr) return;
  for (const Parameter& parameter : kParameters) {
    if (strcmp(parameter.keyword, keyword) == 0) parameter.store(equals + 1, values);
  }
}

const flag_list* find_keyword(const flag_list* table, const char* option) {
  for (; table->keyword != nullptr; ++table) {
    if (strncmp(option, table->keyword, strlen(table->keyword)) == 0) return table;
  }
  return nullptr;
}

// Appends `option` and a comma, whole or not at all.
void append_option(char* options, int options_size, const char* option) {
  if (options_size <= 0) return;
  size_t used = strlen(options);
  size_t length = strlen(option);
  if (used + length + 1 >= static_cast<size_t>(options_size)) return;
  snprintf(options + used, options_size - used, "%s,", option);
}

}  // namespace

int parse_flags(char* field, const flag_list* table, fs_mgr_flag_values* values, char* options,
                int options_size) {
  if (values != nullptr) {
    *values = {};
    values->partition_number = -1;
    values->swap_priority = -1;
  }
  if (options != nullptr && options_size > 0) options[0] = '\0';
  uint32_t flags = 0;
  char* position = nullptr;
  for (char* option = strtok_r(field, ",", &position); option != nullptr;
       option = strtok_r(nullptr, ",", &position)) {
    if (const flag_list* match = find_keyword(table, option)) {
      flags |= match->value;
      if (values != nullptr) store_parameter(match->keyword, option, values);
    } else if (options != nullptr) {
      append_option(options, options_size, option);
    } else {
      LOG(ERROR) << "[libfs_mgr]Warning: unknown flag " << option;
    }
  }
  if (options != nullptr && options_size > 0 && options[0] != '\0') {
    options[strlen(options) - 1] = '\0';
  }
  return static_cast<int>(flags);
}

uint32_t encryption_mode_to_flag(const flag_list* modes, const char* mode, const char* kind) {
  for (; modes->keyword != nullptr; ++modes) {
    if (strcmp(mode, modes->keyword) == 0) return modes->value;
  }
  LOG(ERROR) << "[libfs_mgr]Unknown " << kind << " encryption mode: " << mode;
  return 0;
}
