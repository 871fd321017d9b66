#include <string.h>
#include <unistd.h>

#include <sstream>

#include "tests/daemon.h"

namespace corvexd::test {
namespace {

class Thermal : public DeviceTest {
 protected:
  Thermal() { run("rm -rf /sys && mkdir -p /sys"); }

  static std::string frequency(int cpu) {
    return "/sys/devices/system/cpu/cpu" + std::to_string(cpu) + "/cpufreq/cpuinfo_cur_freq";
  }

  static std::string zone(int number) {
    return "/sys/class/thermal/thermal_zone" + std::to_string(number) + "/temp";
  }

  static void set_source(const std::string& path, const std::string& content) {
    run("mkdir -p $(dirname " + path + ")");
    write_file("/sys/draft", content);
    rename("/sys/draft", path.c_str());
  }
};

Texts lines_of(const std::string& directory) {
  Texts lines;
  for (const std::string& name : list(directory)) {
    std::istringstream file(read_file(directory + "/" + name));
    for (std::string line; std::getline(file, line);) lines.push_back(line);
  }
  return lines;
}

TEST_F(Thermal, EveryLineTellsTheSourcesOfItsMoment) {
  set_source(frequency(1), "1804800\n");
  set_source(zone(0), "35000\n");
  set_source(zone(1), "");
  set_source(zone(2), "12345678901234567890123\n");
  set_source(zone(12), "41");
  run("mkdir -p " + zone(16));  // a source that opens and cannot be read
  run("mkdir -p /data/corvex/KVBR_9_current && touch /data/corvex/A_current");
  Daemon daemon(log);
  EXPECT_EQ("", send_commands({"CPUTHERMAL"}));
  const std::string directory = "/data/corvex/KVBR_9_current/kv_tsen_data";
  EXPECT_TRUE(log.has("corvexd: cpu&thermal log path is " + directory + "/ \n"));
  ASSERT_EVENTUALLY(lines_of(directory).size() >= 2);
  std::string line = lines_of(directory)[0];
  const std::string time = line.substr(strlen("datetime="), line.find(',') - strlen("datetime="));
  EXPECT_EQ(time.find('_'), list(directory)[0].find('_')) << time;
  EXPECT_EQ("datetime=" + time +
                ", cpu0_freq=      , cpu1_freq=1804800, cpu2_freq=       , cpu3_freq=        , "
                "tz_sensor0=35000, tz_sensor1=, tz_sensor2=1234567890123456789, "
                "tz_sensor3=        , tz_sensor4=        , tz_sensor5=        , "
                "tz_sensor6=        , tz_sensor7=        , tz_sensor8=        , "
                "tz_sensor9=        , tz_sensor10=        , pm8841_tz=        , pm8941_tz=41, "
                "pa_therm0=        , pa_therm1=        , emmc_therm=        , msm_therm=        ",
            line);
  EXPECT_EQ(0600u, mode_of(directory + "/" + list(directory)[0]));
  run("rm -r " + zone(16));
  std::string wanted;
  for (int cpu = 0; cpu < 4; ++cpu) {
    set_source(frequency(cpu), std::to_string(100 + cpu) + "\n");
    wanted += ", cpu" + std::to_string(cpu) + "_freq=" + std::to_string(100 + cpu);
  }
  for (int i = 0; i < 17; ++i) {
    set_source(zone(i), std::to_string(i) + "\n");
    if (i < 11) wanted += ", tz_sensor" + std::to_string(i) + "=" + std::to_string(i);
  }
  wanted += ", pm8841_tz=11, pm8941_tz=12, pa_therm0=13, pa_therm1=14, emmc_therm=15, msm_therm=16";
  EXPECT_TRUE(eventually([&] {
    line = lines_of(directory).back();
    return line.substr(line.find(',')) == wanted;
  })) << line;
  EXPECT_GT(pauses(3), 0u);
}

TEST_F(Thermal, StopEndsTheLatestSamplerOnly) {
  Daemon daemon(log);
  send_commands({"STOPCPUTHERMAL", "CPUTHERMAL"});
  const std::string directory = current_directory() + "/kv_tsen_data";
  EXPECT_EQ(0u, directory.find("/data/corvex/KVBR_1--")) << "made, as there was none";
  usleep(1'100'000);  // a file is named by its second
  send_commands({"CPUTHERMAL"});
  ASSERT_EVENTUALLY(list(directory).size() == 2);
  send_commands({"STOPCPUTHERMAL", "STOPCPUTHERMAL"});
  EXPECT_EVENTUALLY(log.count("stop_logcat : 1, pid = ") > 0);
  const std::string first = directory + "/" + list(directory)[0];
  const std::string second = directory + "/" + list(directory)[1];
  const size_t first_size = read_file(first).size(), second_size = read_file(second).size();
  EXPECT_EVENTUALLY(
      (read_file(first).size() > first_size) + (read_file(second).size() > second_size) == 1);
  usleep(100'000);
  EXPECT_TRUE(read_file(first).size() == first_size || read_file(second).size() == second_size);
}

}  // namespace
}  // namespace corvexd::test
