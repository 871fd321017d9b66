#include "fs_mgr/fs_mgr_fstab.h"

#include <android-base/logging.h>
#include <ctype.h>
#include <errno.h>
#include <stdlib.h>
#include <string.h>
#include <sys/types.h>

#include <memory>
#include <string>

#include "fs_mgr/fs_mgr_boot_config.h"
#include "fs_mgr/fs_mgr_flags.h"

namespace {

constexpr char kPrefix[] = "[libfs_mgr]";
constexpr char kDelimiters[] = " \t";
constexpr int kMountOptionsSize = 1024;

struct FreeTable {
  void operator()(fstab* table) const { fs_mgr_free_fstab(table); }
};
using Table = std::unique_ptr<fstab, FreeTable>;

// The line buffer that both passes use again and again.
class Lines {
 public:
  explicit Lines(FILE* file) : file_(file) {}
  ~Lines() { free(line_); }
  Lines(const Lines&) = delete;
  Lines& operator=(const Lines&) = delete;

  // The next line that holds an entry, without its line end; null at the end of the file.
  char* next_entry() {
    for (ssize_t length; (length = getline(&line_, &capacity_, file_)) != -1;) {
      if (length > 0 && line_[length - 1] == '\n') line_[length - 1] = '\0';
      const char* start = line_;
      while (isspace(static_cast<unsigned char>(*start))) ++start;
      if (*start != '#' && *start != '\0') return line_;
    }
    return nullptr;
  }

 private:
  FILE* file_;
  char* line_ = nullptr;
  size_t capacity_ = 0;
};

bool copy(const char* text, char** copied) {
  *copied = strdup(text);
  return *copied != nullptr;
}

// The next field of a line, or null (logged) when there is none.
char* next_field(char* line, char** position, const char* what) {
  char* field = strtok_r(line, kDelimiters, position);
  if (field == nullptr) LOG(ERROR) << kPrefix << "Error parsing " << what;
  return field;
}

bool parse_entry(char* line, fstab_entry* entry) {
  char* position = nullptr;
  char* field = next_field(line, &position, "mount source");
  if (field == nullptr || !copy(field, &entry->mount_source)) return false;

  field = next_field(nullptr, &position, "mount_point");
  if (field == nullptr || !copy(field, &entry->mount_point)) return false;

  field = next_field(nullptr, &position, "fs_type");
  if (field == nullptr || !copy(field, &entry->fs_type)) return false;

  field = next_field(nullptr, &position, "mount_flags");
  if (field == nullptr) return false;
  char options[kMountOptionsSize];
  entry->mount_flags = static_cast<uint64_t>(
      static_cast<int64_t>(parse_flags(field, kMountOptions, nullptr, options, sizeof options)));
  if (*options != '\0' && !copy(options, &entry->mount_options)) return false;

  field = next_field(nullptr, &position, "fs_mgr_options");
  if (field == nullptr) return false;
  entry->fs_mgr_flags = parse_flags(field, kFsMgrOptions, entry, nullptr, 0);
  return !entry->incomplete;
}

int count_entries(Lines& lines) {
  int count = 0;
  while (lines.next_entry() != nullptr) ++count;
  return count;
}

// Fills the entries that were counted; false when a line is no entry, or there are fewer by now.
bool parse_entries(Lines& lines, fstab* table) {
  int filled = 0;
  while (char* line = lines.next_entry()) {
    if (filled == table->entry_count) {
      LOG(ERROR) << kPrefix << "Tried to process more entries than counted";
      break;
    }
    if (!parse_entry(line, &table->entries[filled])) return false;
    ++filled;
  }
  return filled == table->entry_count;
}

void free_entry(const fstab_entry& entry) {
  free(entry.mount_source);
  free(entry.mount_point);
  free(entry.fs_type);
  free(entry.mount_options);
  free(entry.key_location);
  free(entry.key_directory);
  free(entry.verity_location);
  free(entry.label);
}

}  // namespace

fstab* fs_mgr_read_fstab_file(FILE* file) {
  Lines lines(file);
  int count = count_entries(lines);
  if (count == 0) {
    LOG(ERROR) << kPrefix << "No entries found in fstab";
    return nullptr;
  }
  Table table(static_cast<fstab*>(calloc(1, sizeof(fstab))));
  if (table == nullptr) return nullptr;
  table->entries = static_cast<fstab_entry*>(calloc(count, sizeof(fstab_entry)));
  if (table->entries == nullptr) return nullptr;
  table->entry_count = count;
  if (fseeko(file, 0, SEEK_SET) != 0 || !parse_entries(lines, table.get())) return nullptr;
  if (!fs_mgr_update_for_slotselect(table.get())) {
    LOG(ERROR) << kPrefix << "Error updating for slotselect";
    return nullptr;
  }
  return table.release();
}

bool fs_mgr_update_for_slotselect(fstab* table) {
  std::string suffix;
  for (int i = 0; i < table->entry_count; ++i) {
    fstab_entry& entry = table->entries[i];
    if ((entry.fs_mgr_flags & kSlotSelectFlag) == 0) continue;
    if (suffix.empty()) suffix = fs_mgr_get_slot_suffix();
    if (suffix.empty()) return false;
    char* source;
    if (asprintf(&source, "%s%s", entry.mount_source, suffix.c_str()) == -1) return false;
    free(entry.mount_source);
    entry.mount_source = source;
  }
  return true;
}

fstab* fs_mgr_read_fstab(const char* path) {
  FILE* file = fopen(path, "re");
  if (file == nullptr) {
    PLOG(ERROR) << kPrefix << "fs_mgr_read_fstab(): cannot open file: '" << path << "'";
    return nullptr;
  }
  Table table(fs_mgr_read_fstab_file(file));
  fclose(file);
  if (table == nullptr || !copy(path, &table->source_path)) {
    LOG(ERROR) << kPrefix << "fs_mgr_read_fstab(): failed to load fstab from : '" << path << "'";
    return nullptr;
  }
  return table.release();
}

void fs_mgr_free_fstab(fstab* table) {
  if (table == nullptr) return;
  for (int i = 0; i < table->entry_count; ++i) free_entry(table->entries[i]);
  free(table->entries);
  free(table->source_path);
  free(table);
}

fstab_entry* fs_mgr_get_entry_for_mount_point(fstab* table, const char* path) {
  if (table == nullptr) return nullptr;
  for (int i = 0; i < table->entry_count; ++i) {
    const char* mount_point = table->entries[i].mount_point;
    if (mount_point == nullptr) continue;
    size_t length = strlen(mount_point);
    if (strncmp(path, mount_point, length) != 0) continue;
    if (path[length] == '\0' || path[length] == '/') return &table->entries[i];
  }
  return nullptr;
}
