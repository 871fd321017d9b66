#include "core/settings.h"

#include "core/state.h"
#include "tests/device_root.h"

namespace corvexd::test {
namespace {

using Core = DeviceTest;

TEST_F(Core, SettingsComeFromTheirPropertiesOrDefaults) {
  set_property("persist.sys.lograw", std::string(91, 'x'));
  set_property("persist.sys.loglevel", "");
  set_property("persist.sys.maskothers", "1234567");
  set_property("persist.sys.radio.lognum", "12345678");
  set_property("persist.sys.tcpdump.logsize", "007");
  loadSettings();
  EXPECT_EQ(std::string(91, 'x'), lograw);
  EXPECT_STREQ("*:V", loglevel);
  EXPECT_STREQ("1234567", maskothers);
  EXPECT_STREQ("5", radio_lognum) << "a number that does not fit is refused, not cut";
  EXPECT_STREQ("007", tcpdump_logsize);
  EXPECT_STREQ("30", android_lognum);
  EXPECT_STREQ("20480", kernel_logsize);
  EXPECT_STREQ("3", tcpdump_lognum);
  EXPECT_EQ(1u, log.count("persist.sys.radio.lognum is too long"));
}

TEST_F(Core, LogRootFollowsItsTwoProperties) {
  struct {
    const char* watchdog;
    const char* path;
    bool in_data;
  } rows[] = {{"", "", true},      {"false", "data", true}, {"true", "data", false},
              {"", "Data", false}, {"", "data ", false},    {"false", "sdcard", false}};
  for (const auto& row : rows) {
    set_property("sys.debug.watchdog", row.watchdog);
    set_property("persist.sys.corvex.path", row.path);
    checkLogPath();
    std::string root = row.in_data ? "/data/corvex" : "/storage/emulated/0/corvex";
    EXPECT_EQ(root, LOG_ROOT.load()) << row.watchdog << row.path;
    EXPECT_EQ(root + "/KVBR_", LOG_PATH.load());
    EXPECT_EQ(row.in_data, isInDataPartition == 1);
  }
}

}  // namespace
}  // namespace corvexd::test
