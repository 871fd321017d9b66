// Any bytes as a kernel command line, asked for a key cut from their start.
#include <stddef.h>
#include <stdint.h>

#include <string>

#include "fs_mgr/fs_mgr_boot_config.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  const std::string text(reinterpret_cast<const char*>(data), size);
  const size_t end = text.find('\n');
  const std::string key = end == std::string::npos ? "slot" : text.substr(0, end);
  const std::string command_line = end == std::string::npos ? text : text.substr(end + 1);
  std::string value = "untouched";
  if (find_in_command_line(command_line, key, &value)) {
    // A value comes out of one entry: between blanks, behind the only "=".
    if (value.find_first_of(" =") != std::string::npos) __builtin_trap();
    if (command_line.find("androidboot." + key + "=" + value) == std::string::npos) {
      __builtin_trap();
    }
  } else if (value != "untouched") {
    __builtin_trap();
  }
  return 0;
}
