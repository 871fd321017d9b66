// Any values of the properties that the daemon's settings come from, and of those that choose the
// log root: 91 bytes for each.
#include <cutils/properties.h>
#include <stdint.h>
#include <string.h>

#include <algorithm>
#include <string>

#include "capture/logcat_argv.h"
#include "core/settings.h"
#include "core/state.h"
#include "tests/device_root.h"

namespace {

constexpr size_t kLongest = PROPERTY_VALUE_MAX - 1;

const struct Setting {
  const char* property;
  char* text;
  size_t size;
} kSettings[] = {
    {"persist.sys.lograw", corvexd::lograw, sizeof corvexd::lograw},
    {"persist.sys.loglevel", corvexd::loglevel, sizeof corvexd::loglevel},
    {"persist.sys.maskothers", corvexd::maskothers, sizeof corvexd::maskothers},
    {"persist.sys.android.logsize", corvexd::android_logsize, sizeof corvexd::android_logsize},
    {"persist.sys.kernel.lognum", corvexd::kernel_lognum, sizeof corvexd::kernel_lognum},
};

std::string take_value(const uint8_t** data, size_t* size) {
  const size_t length = std::min(*size, kLongest);
  std::string value(reinterpret_cast<const char*>(*data), length);
  *data += length;
  *size -= length;
  return value;
}

void check(const std::string* values) {
  for (size_t i = 0; i < std::size(kSettings); ++i) {
    const size_t length = strnlen(kSettings[i].text, kSettings[i].size);
    if (length == kSettings[i].size) __builtin_trap();
    // As the property holds it, up to a NUL; or the default.
    const std::string value = values[i].c_str();
    if (!value.empty() && value.size() < kSettings[i].size && value != kSettings[i].text) {
      __builtin_trap();
    }
  }
  corvexd::checkLogPath();
  const corvexd::LogcatJob job = {corvexd::android_logsize, corvexd::kernel_lognum, {"main"}, true};
  const corvexd::LogcatArgv vector = corvexd::logcat_argv(job, "file");
  const char* const* end = std::end(vector.arguments);
  if (std::find(std::begin(vector.arguments), end, nullptr) == end) __builtin_trap();
}

}  // namespace

// Each property's value is another one than at the last time.
extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  do {
    std::string values[std::size(kSettings)];
    for (size_t i = 0; i < std::size(kSettings); ++i) {
      values[i] = take_value(&data, &size);
      corvexd::test::set_property(kSettings[i].property, values[i]);
    }
    corvexd::test::set_property("persist.sys.corvex.path", take_value(&data, &size));
    corvexd::loadSettings();
    check(values);
  } while (size != 0);
  return 0;
}
