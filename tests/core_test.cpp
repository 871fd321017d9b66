#include "core/settings.h"

#include <errno.h>
#include <fcntl.h>
#include <signal.h>
#include <stdlib.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <time.h>
#include <unistd.h>

#include <atomic>

#include "core/directory.h"
#include "core/files.h"
#include "core/local_time.h"
#include "core/state.h"
#include "tests/device_root.h"
#include "thermal/thermal_sampler.h"

namespace {

std::atomic<time_t> time_now{0};  // 0: as it is

}  // namespace

// The C library's, for all of this program.
extern "C" time_t time(time_t* result) noexcept {
  struct timespec now = {time_now, 0};
  if (now.tv_sec == 0) clock_gettime(CLOCK_REALTIME, &now);
  if (result != nullptr) *result = now.tv_sec;
  return now.tv_sec;
}

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
  EXPECT_EQ(1u, log.count("persist.sys.radio.lognum is too long"));
  run("rm /dev/__properties__/*");
  loadSettings();
  const Texts defaults = {lograw,         loglevel,      maskothers,   android_logsize,
                          android_lognum, event_logsize, event_lognum, kernel_logsize,
                          kernel_lognum,  radio_logsize, radio_lognum, tcpdump_logsize,
                          tcpdump_lognum};
  EXPECT_EQ((Texts{"threadtime", "*:V", "", "20480", "30", "20480", "5", "20480", "5", "20480", "5",
                   "100", "3"}),
            defaults);
}

TEST_F(Core, LogRootFollowsItsTwoProperties) {
  struct {
    const char* watchdog;
    const char* path;
    bool in_data;
  } rows[] = {{"", "", true},      {"false", "data", true}, {"true", "data", false},
              {"", "Data", false}, {"", "data ", false},    {"false", "sdcard", false},
              {"", "", true}};
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

// What somebody may have put where the daemon is to write, and what becomes of the daemon's opening
// it. The target, which stands outside, keeps its content and its owner.
TEST_F(Core, AnOutputIsARegularFileThatNoLinkLeadsTo) {
  struct {
    const char* planted;
    int error;
  } rows[] = {{"ln -s /probe/target out", ELOOP},
              {"ln -s /probe/none out", ELOOP},
              {"ln /probe/target out", EMLINK},
              {"mkfifo out", ENXIO},
              {"mkdir out", EISDIR},
              {"ln -s /dev/full out", ELOOP},
              {"echo mine > out", 0},
              {"true", 0}};
  write_file("/probe/target", "target");
  run("mkdir /data/out");
  for (const auto& row : rows) {
    run(std::string("cd /data/out && rm -rf out && ") + row.planted);
    for (auto* open_it :
         {+[] { return open_output("/data/out/out", O_WRONLY | O_APPEND, 0640).release(); },
          +[] { return open_program_output("/data/out/out").release(); }}) {
      const int fd = open_it();
      EXPECT_EQ(row.error, fd == -1 ? errno : 0) << row.planted;
      close(fd);
    }
    if (row.error == 0) {
      EXPECT_EQ("", read_file("/data/out/out")) << "a program's begins empty";
    }
    EXPECT_FALSE(exists("/probe/none"));
    EXPECT_EQ("target", read_file("/probe/target"));
    give_to_system_at(open_folder("/data/out"), "out");
    EXPECT_FALSE(is_systems("/probe/target")) << row.planted;
  }
  EXPECT_EQ(0640u, mode_of("/data/out/out")) << "whatever the umask";
  unlink("/data/out/out");
  open_program_output("/data/out/out");
  EXPECT_EQ(0600u, mode_of("/data/out/out")) << "as the umask has it";
  EXPECT_EQ(owners_work(), give_to_system_at(open_folder("/data/out"), "out") == 0);
  EXPECT_EQ(owners_work(), is_systems("/data/out/out"));

  mkfifo("/data/out/pipe", 0600);
  const int reader = open("/data/out/pipe", O_RDONLY | O_NONBLOCK);
  EXPECT_EQ(-1, open_output("/data/out/pipe", O_WRONLY, 0600)) << "nor one that somebody reads";
  close(reader);
}

TEST_F(Core, NamesTellTheLocalTime) {
  struct {
    time_t now;
    const char* zone;
    const char* name;
    std::string record;  // a thermal record's name
    std::string line;    // and what its first line begins with
  } rows[] = {
      {1772717829, "<-0930>9:30", "2026-03-05-04-07-09", "202635_479", "202635_4:7:9"},
      {1798795799, "<-0930>9:30", "2026-12-31-23-59-59", "20261231_235959", "20261231_23:59:59"},
      {1798740900, "<+0545>-5:45", "2027-01-01-00-00-00", "202711_000", "202711_0:0:0"}};
  for (const auto& row : rows) {
    setenv("TZ", row.zone, 1);
    time_now = row.now;
    EXPECT_STREQ(row.name, local_timestamp().c_str());
    run("rm -rf /data/thermal && mkdir /data/thermal");
    const pid_t sampler = fork();
    if (sampler == 0) record_cpux_thermal("/data/thermal/", 0);
    EXPECT_EVENTUALLY(
        read_file("/data/thermal/" + row.record).rfind("datetime=" + row.line + ",", 0) == 0)
        << row.line;
    kill(sampler, SIGKILL);
    waitpid(sampler, nullptr, 0);
  }
  time_now = 0;
  unsetenv("TZ");
}

TEST_F(Core, ADirectoryThatCannotBeListedIsClosed) {
#ifdef CORVEX_NOISY_MEMORY
  GTEST_SKIP() << "A sanitizer or an emulator takes memory of its own.";
#endif
  EXPECT_EQ(0, status_in_child([] {
              const struct rlimit none = {0, 0};
              setrlimit(RLIMIT_AS, &none);
              void* volatile last;
              do last = malloc(1);
              while (last != nullptr);
              const int lowest = dup(0);
              close(lowest);
              _exit(open_directory("/data") == nullptr && dup(0) == lowest && dup(0) == lowest + 1
                        ? 0
                        : 1);
            }));
}

TEST_F(Core, NoStepOnTheWayIsALink) {
  run("mkdir -p /data/real/below && ln -s real /data/link && ln -s /data/real /cache/link");
  EXPECT_NE(-1, open_folder("/data/real//below/"));
  EXPECT_EQ(-1, open_folder("/data/link"));
  EXPECT_EQ(-1, open_folder("/data/link/"));
  EXPECT_EQ(-1, open_folder("/data/link/below"));
  EXPECT_EQ(-1, open_output("/cache/link/file", O_WRONLY, 0600));
  EXPECT_EQ(Texts{"below"}, list("/data/real"));
  EXPECT_EQ(-1, open_folder(("/data/" + std::string(256, 'x') + "/y").c_str()));
  EXPECT_EQ(ENAMETOOLONG, errno);
  run("mv /cache /cache_of_data && ln -s cache_of_data /cache && mkdir /cache/logs");
  EXPECT_NE(-1, open_folder("/cache/logs")) << "but above what only the system can replace";
  run("rm /cache && rm -r /cache_of_data");
}

}  // namespace
}  // namespace corvexd::test
