#include "simulator/init/property_store.h"

#include <android-base/file.h>
#include <dirent.h>
#include <limits.h>
#include <stdio.h>
#include <sys/stat.h>
#include <unistd.h>

#include "simulator/common/protocol.h"

namespace corvexd::sim {
namespace {

constexpr char kLastingDirectory[] = "/data/property";
constexpr char kLastingPrefix[] = "persist.";

constexpr struct {
  const char* key;
  const char* value;
} kAtBoot[] = {
    {"ro.product.manufacturer", "Corvex"},
    {"ro.product.model", "Simulated Device"},
    {"ro.product.device", "simulator"},
    {"ro.build.version.release", "8.1.0"},
    {"ro.build.version.sdk", "27"},
    {"ro.build.type", "userdebug"},
    {"ro.build.ota.versionname", "SIM-8.1.0-0001"},
    {"ro.hardware", "qcom"},
};

bool is_key(const std::string& key) {
  constexpr char kAllowed[] = "abcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ0123456789._-@:";
  return !key.empty() && key.size() < NAME_MAX && key[0] != '.' &&
         key.find_first_not_of(kAllowed) == std::string::npos;
}

// The name of the file on its way begins with a dot, so that it is no property's.
bool replace_file(const char* directory, const std::string& key, const std::string& value) {
  std::string path = std::string(directory) + "/" + key;
  std::string fresh = std::string(directory) + "/.new";
  return android::base::WriteStringToFile(value, fresh) && chmod(fresh.c_str(), 0644) == 0 &&
         rename(fresh.c_str(), path.c_str()) == 0;
}

}  // namespace

void load_properties() {
  mkdir(kPropertyDirectory, 0755);
  mkdir(kLastingDirectory, 0700);
  for (const auto& property : kAtBoot) {
    replace_file(kPropertyDirectory, property.key, property.value);
  }
  DIR* directory = opendir(kLastingDirectory);
  if (directory == nullptr) return;
  while (struct dirent* entry = readdir(directory)) {
    std::string path = std::string(kLastingDirectory) + "/" + entry->d_name;
    std::string value;
    if (entry->d_name[0] == '.' || !android::base::ReadFileToString(path, &value)) continue;
    replace_file(kPropertyDirectory, entry->d_name, value);
  }
  closedir(directory);
}

bool store_property(const std::string& key, const std::string& value) {
  if (!is_key(key) || value.size() > kMaxPropertyValue) return false;
  if (key.compare(0, sizeof kLastingPrefix - 1, kLastingPrefix) == 0 &&
      !replace_file(kLastingDirectory, key, value)) {
    return false;
  }
  return replace_file(kPropertyDirectory, key, value);
}

}  // namespace corvexd::sim
