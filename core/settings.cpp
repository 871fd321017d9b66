#include "core/settings.h"

#include <cutils/properties.h>
#include <string.h>

#include "core/log.h"

namespace corvexd {

char lograw[200];
char loglevel[200];
char maskothers[8];
char android_logsize[8];
char android_lognum[8];
char event_logsize[8];
char event_lognum[8];
char kernel_logsize[8];
char kernel_lognum[8];
char radio_logsize[8];
char radio_lognum[8];
char tcpdump_logsize[8];
char tcpdump_lognum[8];

namespace {

struct Setting {
  char* text;
  size_t capacity;
  const char* property;
  const char* default_value;
};

constexpr Setting kSettings[] = {
    {lograw, sizeof lograw, "persist.sys.lograw", "threadtime"},
    {loglevel, sizeof loglevel, "persist.sys.loglevel", "*:V"},
    {maskothers, sizeof maskothers, "persist.sys.maskothers", ""},
    {android_logsize, sizeof android_logsize, "persist.sys.android.logsize", "20480"},
    {android_lognum, sizeof android_lognum, "persist.sys.android.lognum", "30"},
    {event_logsize, sizeof event_logsize, "persist.sys.event.logsize", "20480"},
    {event_lognum, sizeof event_lognum, "persist.sys.event.lognum", "5"},
    {kernel_logsize, sizeof kernel_logsize, "persist.sys.kernel.logsize", "20480"},
    {kernel_lognum, sizeof kernel_lognum, "persist.sys.kernel.lognum", "5"},
    {radio_logsize, sizeof radio_logsize, "persist.sys.radio.logsize", "20480"},
    {radio_lognum, sizeof radio_lognum, "persist.sys.radio.lognum", "5"},
    {tcpdump_logsize, sizeof tcpdump_logsize, "persist.sys.tcpdump.logsize", "100"},
    {tcpdump_lognum, sizeof tcpdump_lognum, "persist.sys.tcpdump.lognum", "3"},
};

}  // namespace

void loadSettings() {
  for (const Setting& setting : kSettings) {
    char value[PROPERTY_VALUE_MAX];
    property_get(setting.property, value, setting.default_value);
    if (strlen(value) >= setting.capacity) {
      log_error("corvexd: %s is too long, \"%s\" is used instead of \"%s\"\n", setting.property,
                setting.default_value, value);
      strcpy(value, setting.default_value);
    }
    strcpy(setting.text, value);
  }
}

}  // namespace corvexd
