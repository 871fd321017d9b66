#include "fs_mgr/fs_mgr_boot_config.h"

#include <android-base/file.h>
#include <android-base/logging.h>
#include <android-base/properties.h>
#include <android-base/strings.h>

#include <vector>

namespace {

constexpr char kCommandLine[] = "/proc/cmdline";
constexpr char kDefaultDtDir[] = "/proc/device-tree/firmware/android";

std::string find_android_dt_dir() {
  std::string directory;
  fs_mgr_get_boot_config_from_kernel_cmdline("android_dt_dir", &directory);
  return directory.empty() ? kDefaultDtDir : directory;
}

}  // namespace

const std::string& get_android_dt_dir() {
  // Never destroyed: threads may still ask while the process ends.
  static const std::string& directory = *new std::string(find_android_dt_dir());
  return directory;
}

bool read_dt_file(const std::string& file, std::string* out) {
  if (!android::base::ReadFileToString(file, out) || out->empty()) return false;
  out->pop_back();
  return true;
}

bool is_dt_compatible() {
  std::string compatible;
  return read_dt_file(get_android_dt_dir() + "/compatible", &compatible) &&
         compatible == "android,firmware";
}

bool find_in_command_line(const std::string& command_line, const std::string& key,
                          std::string* out_val) {
  const std::string name = "androidboot." + key;
  for (const std::string& entry : android::base::Split(android::base::Trim(command_line), " ")) {
    std::vector<std::string> parts = android::base::Split(entry, "=");
    if (parts.size() != 2 || parts[0] != name) continue;
    *out_val = parts[1];
    return true;
  }
  return false;
}

bool fs_mgr_get_boot_config_from_kernel_cmdline(const std::string& key, std::string* out_val) {
  CHECK(out_val != nullptr) << "in libfs_mgr ";
  std::string command_line;
  return android::base::ReadFileToString(kCommandLine, &command_line) &&
         find_in_command_line(command_line, key, out_val);
}

bool fs_mgr_get_boot_config(const std::string& key, std::string* out_val) {
  CHECK(out_val != nullptr) << "in libfs_mgr ";
  // A value that is present but empty is no answer; the next source is asked.
  *out_val = android::base::GetProperty("ro.boot." + key, "");
  if (!out_val->empty()) return true;
  if (fs_mgr_get_boot_config_from_kernel_cmdline(key, out_val) && !out_val->empty()) return true;
  return is_dt_compatible() && read_dt_file(get_android_dt_dir() + "/" + key, out_val) &&
         !out_val->empty();
}

std::string fs_mgr_get_slot_suffix() {
  std::string value;
  if (fs_mgr_get_boot_config("slot", &value)) return "_" + value;
  if (fs_mgr_get_boot_config("slot_suffix", &value)) return value;
  return "";
}
