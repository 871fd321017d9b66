#include "thermal/thermal_sampler.h"

#include <android-base/unique_fd.h>
#include <cutils/properties.h>
#include <errno.h>
#include <fcntl.h>
#include <stdlib.h>
#include <string.h>
#include <unistd.h>

#include "core/files.h"
#include "core/fixed_string.h"
#include "core/local_time.h"
#include "core/log.h"
#include "core/sleep.h"
#include "storage/log_directory.h"
#include "storage/mkdirs.h"

using android::base::unique_fd;

namespace corvexd {
namespace {

constexpr time_t kPeriod = 3;  // seconds
constexpr mode_t kRecordMode = 0600;
constexpr size_t kFieldSize = 20;
constexpr char kSubdirectory[] = "/kv_tsen_data/";

struct Source {
  const char* name;
  const char* path;
  const char* fill;  // stands in the line when the source cannot be read
};

constexpr Source kSources[] = {
    {"cpu0_freq", "/sys/devices/system/cpu/cpu0/cpufreq/cpuinfo_cur_freq", "      "},
    {"cpu1_freq", "/sys/devices/system/cpu/cpu1/cpufreq/cpuinfo_cur_freq", "       "},
    {"cpu2_freq", "/sys/devices/system/cpu/cpu2/cpufreq/cpuinfo_cur_freq", "       "},
    {"cpu3_freq", "/sys/devices/system/cpu/cpu3/cpufreq/cpuinfo_cur_freq", "        "},
    {"tz_sensor0", "/sys/class/thermal/thermal_zone0/temp", "        "},
    {"tz_sensor1", "/sys/class/thermal/thermal_zone1/temp", "        "},
    {"tz_sensor2", "/sys/class/thermal/thermal_zone2/temp", "        "},
    {"tz_sensor3", "/sys/class/thermal/thermal_zone3/temp", "        "},
    {"tz_sensor4", "/sys/class/thermal/thermal_zone4/temp", "        "},
    {"tz_sensor5", "/sys/class/thermal/thermal_zone5/temp", "        "},
    {"tz_sensor6", "/sys/class/thermal/thermal_zone6/temp", "        "},
    {"tz_sensor7", "/sys/class/thermal/thermal_zone7/temp", "        "},
    {"tz_sensor8", "/sys/class/thermal/thermal_zone8/temp", "        "},
    {"tz_sensor9", "/sys/class/thermal/thermal_zone9/temp", "        "},
    {"tz_sensor10", "/sys/class/thermal/thermal_zone10/temp", "        "},
    {"pm8841_tz", "/sys/class/thermal/thermal_zone11/temp", "        "},
    {"pm8941_tz", "/sys/class/thermal/thermal_zone12/temp", "        "},
    {"pa_therm0", "/sys/class/thermal/thermal_zone13/temp", "        "},
    {"pa_therm1", "/sys/class/thermal/thermal_zone14/temp", "        "},
    {"emmc_therm", "/sys/class/thermal/thermal_zone15/temp", "        "},
    {"msm_therm", "/sys/class/thermal/thermal_zone16/temp", "        "},
};

using Line = FixedString<4096>;

void append_value(Line& line, const Source& source) {
  char field[kFieldSize] = {};
  unique_fd fd(open(source.path, O_RDONLY | O_CLOEXEC));
  ssize_t size = fd == -1 ? -1 : read(fd, field, sizeof field);
  if (size == -1) {
    line.append(source.fill);
    return;
  }
  if (size > 0 && field[size - 1] == '\n') field[size - 1] = '\0';
  field[kFieldSize - 1] = '\0';
  line.append(field);
}

Line sample() {
  struct tm now = local_time();
  Line line;
  line.append_format("datetime=%d%d%d_%d:%d:%d", now.tm_year + 1900, now.tm_mon + 1, now.tm_mday,
                     now.tm_hour, now.tm_min, now.tm_sec);
  for (const Source& source : kSources) {
    line.append(", ").append(source.name).append("=");
    append_value(line, source);
  }
  line.append("\n");
  return line;
}

void append_line(const char* file, const Line& line) {
  const unique_fd fd = open_output(file, O_WRONLY | O_APPEND, kRecordMode);
  if (fd == -1) return;
  ssize_t ignored = TEMP_FAILURE_RETRY(write(fd, line.c_str(), strlen(line.c_str())));
  (void)ignored;
}

void run_sampler(const void* path) {
  char value[PROPERTY_VALUE_MAX];
  property_get("persist.sys.cpuandthermal", value, "30");
  record_cpux_thermal(static_cast<const Path*>(path)->c_str(), atoi(value));
}

}  // namespace

ChildSlot cpu_thermal_pid;

int getCpuxThermal() {
  install_sigchld_handler();
  Path path = provide_current_directory();
  if (!path.append(kSubdirectory).fits_or_log()) return -1;
  log_info("corvexd: cpu&thermal log path is %s \n", path.c_str());
  mkdirs(path.c_str());
  start_child(cpu_thermal_pid, run_sampler, &path);
  return cpu_thermal_pid.pid;
}

void record_cpux_thermal(const char* path, int /*value*/) {
  struct tm start = local_time();
  Path file =
      Path().append(path).append_format("%d%d%d_%d%d%d", start.tm_year + 1900, start.tm_mon + 1,
                                        start.tm_mday, start.tm_hour, start.tm_min, start.tm_sec);
  for (;;) {
    if (file.fits()) append_line(file.c_str(), sample());
    sleep_seconds(kPeriod);
  }
}

}  // namespace corvexd
