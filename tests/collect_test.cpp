// What is collected while persistent capture is on.
#include <fcntl.h>
#include <signal.h>
#include <string.h>
#include <sys/inotify.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <functional>
#include <map>
#include <mutex>
#include <set>
#include <sstream>
#include <thread>

#include "collect/artefact_mover.h"
#include "collect/file_observer.h"
#include "core/state.h"
#include "storage/copy.h"
#include "storage/current_directory.h"
#include "storage/log_directory.h"
#include "tests/daemon.h"
#include "tests/device_root.h"
#include "tests/files.h"
#include "tests/property_service.h"

namespace corvexd::test {
namespace {

#ifdef CORVEX_NOISY_MEMORY
constexpr long kMemoryNoise = 100'000;  // KiB
#else
constexpr long kMemoryNoise = 64;
#endif

class Collect : public DeviceTest {
 protected:
  Collect() {
    run("mkdir -p /data/tombstones /data/anr /data/system/dropbox /data/misc/display "
        "/data/media/0/Pictures /data/coredump /data/vendor/media");
    write_script("/system/bin/dumpsys", "echo dumped $1");
    set_property("persist.sys.assert.panic", "true");
  }

  PropertyService service;
};

// A daemon that has its watches: what happens before, nobody sees.
class Observer : public Daemon {
 public:
  explicit Observer(LogCatcher& log, const char* program = "/build/tests/corvexd_fast")
      : Daemon(log, program) {
    const std::string count =
        "[ $(cat /proc/" + std::to_string(pid()) + "/fdinfo/* | grep -c inotify.wd) = 8 ]";
    EXPECT_EVENTUALLY(system(count.c_str()) == 0) << "one directory is missing";
  }
};

// Every file below a directory, by its path in it without the names that are times.
std::map<std::string, std::string> files_below(const std::string& directory) {
  std::map<std::string, std::string> files;
  for (const std::string& name : list(directory)) {
    const std::string path = directory + "/" + name;
    struct stat status;
    if (lstat(path.c_str(), &status) != 0) continue;
    const std::string shown = name.rfind("20", 0) == 0 && name.size() == 19 ? "TIME" : name;
    if (!S_ISDIR(status.st_mode)) {
      files[shown] = read_file(path);
      continue;
    }
    for (const auto& [below, content] : files_below(path)) files[shown + "/" + below] += content;
  }
  return files;
}

// One event as the kernel tells it, its name cut to 16 bytes or filled up.
std::string record(uint32_t mask, const std::string& name) {
  struct inotify_event event = {};
  event.mask = mask;
  event.len = 16;
  return std::string(reinterpret_cast<char*>(&event), sizeof event) +
         (name + std::string(16, '\0')).substr(0, 16);
}

TEST_F(Collect, EveryArtefactComesToItsPlace) {
  make_nodes();
  Observer daemon(log, kDaemonWithNodes);
  const std::string current = current_directory();
  size_t seconds = pauses(1);
  struct {
    const char* commands;  // as the producers make the artefact
    Texts places;          // path:content below the log directory
  } rows[] = {
      {"echo t > /data/tombstones/tombstone_core_00", {"tombstones/TIME/tombstone_core_00:t\n"}},
      {"echo a > /data/anr/anr_1",
       {"anr/TIME/anr_1:a\n", "anr/TIME/dumpsys_input:dumped input\n\n",
        "anr/TIME/transactions:proc_transactions", "anr/TIME/transaction_log:proc_transaction_log",
        "anr/TIME/state:proc_state"}},
      {"echo A > /data/anr/anr_1", {"anr/TIME/anr_1:A\n"}},
      {"echo b > /data/anr/x_html.gz; echo c > /data/anr/BATTERY_trace_html.gz",
       {"x_html.gz:b\n", "BatteryHistory/BATTERY_trace_html.gz:c\n"}},
      {"echo d > /data/d; mv /data/d /data/system/dropbox/e; sleep 0.5; echo f > /data/d; "
       "mv /data/d /data/system/dropbox/e",
       {"dropbox/e:d\nf\n"}},
      {"mkdir /data/media/0/Pictures/Screenshots; sleep 0.5; cd "
       "/data/media/0/Pictures/Screenshots; "
       "echo 1 > Screenshot_1; sleep 0.5; echo 2 > Screenshot_1",
       {"Screenshots/Screenshot_1:2\n"}},
      {"echo g > '/data/coredump/!core 1'", {"coredump/!core 1:g\n"}},
      {"mkdir /data/misc/display/raw_dir", {}},
      {"echo h > /data/vendor/media/i.264; echo j > /data/vendor/media/k.yuv",
       {"media/TIME/i.264:h\n", "media/TIME/k.yuv:j\n"}},
      {"echo n > /data/tombstones/other; echo o > /data/m; mv /data/m /data/anr/m", {}},
  };
  std::set<std::string> paths = {"fileAfter911", "getprop.txt", "versionNumber", "dropbox/m"};
  for (const auto& row : rows) {
    run(row.commands);
    for (const std::string& place : row.places) {
      const std::string path = place.substr(0, place.find(':'));
      const std::string content = place.substr(place.find(':') + 1);
      paths.insert(path);
      EXPECT_TRUE(eventually([&] {
        auto files = files_below(current);
        return files.count(path) == 1 && files[path] == content;
      })) << place
          << " is " << files_below(current)[path];
    }
  }
  auto collected = [&] {
    std::set<std::string> found;
    for (const auto& [path, content] : files_below(current)) found.insert(path);
    return found;
  };
  EXPECT_EVENTUALLY(collected() == paths) << testing::PrintToString(collected());
  EXPECT_EQ(seconds += 3, pauses(1)) << "for two names of traces and the directory named raw";
  write_file("/data/misc/display/raw_1", "r");
  EXPECT_EVENTUALLY(files_below(current)["rawdata/raw_1/raw_1"] == "rr")
      << "once for its creation, once for its modification";
  EXPECT_EQ(seconds += 2, pauses(1));
  EXPECT_EQ("0", property("debug.sf.dump"));
  EXPECT_EQ(0644u, mode_of("/data/corvex/.nomedia"));
  EXPECT_EQ(owners_work(), is_systems("/data/corvex/.nomedia"));
  EXPECT_TRUE(log.has("corvexd: open file failure. /data/system/dropbox/m"))
      << "a move is taken for dropbox's, whatever directory it came into";

  // A path is cut to what fits its 255 characters.
  const std::string long_name = "tombstone_" + std::string(200, 'n');
  const size_t kept = 255 - current.size() - strlen("/tombstones/yyyy-mm-dd-hh-mm-ss/");
  write_file("/data/tombstones/" + long_name, "long");
  EXPECT_EVENTUALLY(files_below(current)["tombstones/TIME/" + long_name.substr(0, kept)] == "long");

  set_property("persist.sys.assert.panic", "false");
  log.clear();
  run("echo u > /data/tombstones/tombstone_01");
  usleep(100'000);
  EXPECT_EQ(0u, log.count("tombstone_01"));
}

TEST_F(Collect, ABurstOfTombstonesIsCollectedWhole) {
  Observer daemon(log);
  auto memory = [&] {
    std::string status = read_file("/proc/" + std::to_string(daemon.pid()) + "/status");
    return atol(status.c_str() + status.find("RssAnon:") + strlen("RssAnon:"));
  };
  auto content = [](int i) { return std::string(3000, static_cast<char>('a' + i % 26)); };
  long kilobytes = 0;
  for (int i = 0; i < 2000; ++i) {
    write_file("/data/tombstones/tombstone_" + std::to_string(i), content(i));
    if (i > 0) continue;
    ASSERT_TRUE(log.has("corvexd: filepath is /data/tombstones, filename is tombstone_0 \n"));
    kilobytes = memory();
  }
  ASSERT_EVENTUALLY(log.count("corvexd: copy_file '") >= 2000);
  EXPECT_LE(memory(), kilobytes + kMemoryNoise);
  auto files = files_below(current_directory() + "/tombstones");
  EXPECT_EQ(2000u, files.size());
  for (int i = 0; i < 2000; ++i) {
    EXPECT_EQ(content(i), files["TIME/tombstone_" + std::to_string(i)]);
  }
}

TEST_F(Collect, NothingButFilesOfTheWatchedDirectoriesIsCollected) {
  write_file("/probe/secret", "secret");
  Observer daemon(log);
  const std::string current = current_directory();
  log.clear();
  kill(daemon.pid(), SIGSTOP);  // who makes a directory fills it later
  run("cd /data; ln -s /probe/new corvex/.nomedia; mkdir -p raw_dir/below coredump/elsewhere; "
      "echo r > raw_dir/file; ln -s /probe/secret raw_dir/link; mv raw_dir misc/display; "
      "mkdir misc/display/raw_dir_2; mv misc/display/raw_dir/* misc/display/raw_dir_2; "
      "mkdir media/0/Pictures/Screenshots; cd coredump; ln -s /probe/secret core_link; ln "
      "/probe/secret core_hard; "
      "mkfifo core_fifo; ln -s elsewhere core_folder; echo core > core_file");
  kill(daemon.pid(), SIGCONT);
  EXPECT_EVENTUALLY(files_below(current)["coredump/core_file"] == "core\n");
  for (const char* name : {"core_link", "core_hard", "core_folder"}) {
    EXPECT_TRUE(log.has(std::string("corvexd: open file failure. /data/coredump//") + name));
  }
  EXPECT_EQ((Texts{"core_fifo", "core_file", "core_folder", "core_hard", "core_link"}),
            list(current + "/coredump"));
  EXPECT_TRUE(log.has("corvexd: open file failure. /data/misc/display//raw_dir_2/link"));
  EXPECT_EQ("r\n", files_below(current)["rawdata/raw_dir_2/file"]);
  EXPECT_EQ((Texts{"file", "link"}), list(current + "/rawdata/raw_dir_2"));
  write_file("/data/media/0/Pictures/Screenshots/Screenshot_1", "shot");
  EXPECT_EVENTUALLY(files_below(current)["Screenshots/Screenshot_1"] == "shot");
  EXPECT_FALSE(exists("/probe/new"));
  // What a link of a watched directory's name leads to is not a watched directory.
  run("mv /data/tombstones /data/true && ln -s /probe /data/tombstones && echo > /data/true/x && "
      "mv /data/true/x /data/true/tombstone_x && echo t >> /data/true/tombstone_x");
  EXPECT_TRUE(log.has("corvexd: Error: Not a directory\n"));
  for (const auto& [name, content] : files_below(current)) EXPECT_NE("secret", content) << name;

  // Where the copies go is no less suspect.
  run("rm -r " + current + "/coredump && ln -s /probe " + current + "/coredump");
  write_file("/data/coredump/core_last", "last");
  EXPECT_TRUE(log.has("corvexd: open file failure. " + current + "/coredump/core_last"));
  EXPECT_FALSE(exists("/probe/core_last"));
}

TEST_F(Collect, WhatHasNoPlaceIsSaid) {
  checkLogPath();
  EXPECT_EQ(-1, movefile("/data/coredump/", "core"));
  EXPECT_TRUE(log.has("corvexd: no current log directory for core\n"));
  run("mkdir /data/corvex/" + std::string(190, 'u') + "_current");
  log.clear();
  EXPECT_EQ(-1, movefile("/data/coredump/", "core"));
  EXPECT_EQ(1u, log.count("corvexd: too long, skipped: /data/corvex/uuu"));
  run("mkdir /data/corvex/a_current");
  EXPECT_EQ(0, movefile("/data/misc/display/", std::string(240, 'r').c_str()));
  EXPECT_EQ(1u, log.count("corvexd: open file failure. /data/misc/display//rrr"));

  LOG_DIR.set(Path());
  ObserverState state;
  const std::string created = record(IN_CREATE, "anr_1");
  handle_events(state, created.data(), created.size());
  copy_folder("/data/anr/", "/anr/");
  EXPECT_FALSE(exists("/anr")) << "before the first capture";
}

// The listing has an order of its own.
TEST_F(Collect, OfTwoMarksEachJobTakesItsOwn) {
  write_script("/system/bin/bugreport", "");
  Observer daemon(log);
  run("cd /data/corvex && mkdir a_current b_current && ls -U | grep _current > /probe/marked");
  Texts marked;
  std::istringstream listing(read_file("/probe/marked"));
  for (std::string name; listing >> name;) marked.push_back("/data/corvex/" + name + "/");
  ASSERT_EQ(3u, marked.size());
  send_commands({"BUGREPORT", "CPUTHERMAL"});
  write_file("/data/coredump/core_1", "core");
  EXPECT_EVENTUALLY(exists(marked[2] + "coredump/core_1"));
  EXPECT_EVENTUALLY(exists(marked[0] + "kv_tsen_data"));
  run("ls " + marked[0] + "*-BUGREPORT.log");
}

TEST_F(Collect, AHangingDumpHoldsUpNobody) {
  write_script("/system/bin/bugreport", "until [ -e /probe/go_on ]; do sleep 0.01; done");
  write_script("/system/bin/getprop", "exec sleep 600");
  write_script("/system/bin/dumpsys", "exec sleep 600");
  Observer daemon(log);
  const int client = connect_to_daemon();
  send_all(client, message("BUGREPORT"));
  EXPECT_TRUE(log.has("print buf--BUGREPORT \n"));
  write_file("/data/anr/anr_1", "trace");
  write_file("/data/coredump/core_1", "core");
  const std::string current = current_directory();
  EXPECT_EVENTUALLY(files_below(current)["coredump/core_1"] == "core");
  EXPECT_EVENTUALLY(files_below(current)["anr/TIME/anr_1"] == "trace");
  close(client);
  write_file("/probe/go_on", "");
  EXPECT_EQ("CLEANFAILED", send_commands({"LOGBEGIN", "DELETELOG"}));
  EXPECT_EQ(1u, log.count("corvexd: shell_cmd is getprop > "));
  EXPECT_EQ(1u, log.count("corvexd: anr_input is /system/bin/dumpsys input | xargs -0 echo > " +
                          current + "/anr/"));
  run("pkill -KILL sleep");
}

// Between its creation and its end it can be exchanged for a link.
TEST_F(Collect, ATraceIsNoLink) {
  checkLogPath();
  write_file("/probe/secret", "secret");
  createLogDirectory();
  ObserverState state;
  state.anr_directory.append(LOG_DIR.get().c_str()).append("/");
  run("ln -s /probe/secret /data/anr/anr_1");
  const std::string closed = record(IN_CLOSE_WRITE, "anr_1");
  handle_events(state, closed.data(), closed.size());
  EXPECT_TRUE(log.has("corvexd: open file failure. /data/anr//anr_1"));
  EXPECT_EQ("", read_file(current_directory() + "/anr_1"));
}

TEST_F(Collect, ATraceThatACaptureComesBetweenIsKept) {
  write_script("/system/bin/dumpsys", "sleep 0.2; echo dumped $1");
  Observer daemon(log);
  const std::string first = current_directory();
  const int trace = open("/data/anr/anr_1", O_WRONLY | O_CREAT, 0644);
  EXPECT_EVENTUALLY(files_below(first).count("anr/TIME/state") == 1);
  send_commands({"LOGBEGIN"});
  EXPECT_EQ(5, write(trace, "trace", 5));
  close(trace);
  const std::string unmarked = first.substr(0, first.size() - strlen("_current"));
  EXPECT_TRUE(eventually([&] {
    auto files = files_below(unmarked);
    return files["anr/TIME/anr_1"] == "trace" && files["anr/TIME/dumpsys_input"] != "";
  }));
  EXPECT_FALSE(exists(first));
}

// Whoever looks for the mark and makes something below it waits while the mark is held, and then
// finds it where it is by now.
TEST_F(Collect, NobodyMakesAnythingWhileTheMarkPasses) {
  checkLogPath();
  write_file("/data/coredump/core", "core");
  const std::string mark = "/data/corvex/a_current", next = "/data/corvex/b_current";
  struct {
    const char* job;
    std::function<void()> body;
    std::string starts_with;
  } rows[] = {{"move", [] { movefile("/data/coredump/", "core"); }, mark},
              {"copy", [] { copy_folder("/data/coredump/", "/anr/"); }, mark},
              {"provide", [] { provide_current_directory(); }, ""},
              {"begin", [] { begin_log_directory(); }, mark},
              {"trace",
               [] {
                 ObserverState state;
                 const std::string created = record(IN_CREATE, "anr_1");
                 handle_events(state, created.data(), created.size());
               },
               mark}};
  for (const auto& row : rows) {
    run("rm -rf /data/corvex/*");
    if (row.starts_with != "") mkdir(row.starts_with.c_str(), 0755);
    LOG_DIR.set(Path().append(mark.c_str()));
    std::unique_lock<std::mutex> lock(current_directory_mutex);
    std::thread job(row.body);
    usleep(30'000);
    EXPECT_EQ(row.starts_with == "" ? 0u : 1u, list("/data/corvex").size()) << row.job;
    EXPECT_EQ(Texts{}, list(mark)) << row.job;
    rename(mark.c_str(), "/data/corvex/a");
    mkdir(next.c_str(), 0755);
    LOG_DIR.set(Path().append(next.c_str()));
    lock.unlock();
    job.join();
    EXPECT_EQ(Texts{}, list("/data/corvex/a")) << row.job;
    EXPECT_EQ(std::string(row.job) == "begin", exists("/data/corvex/b")) << row.job;
  }
}

TEST_F(Collect, EventRecordsAreNotTrusted) {
  std::string records;
  for (const char* name : {"sixteen_letters!", "whole", "torn"})
    records += record(IN_MOVED_TO, name);
  ObserverState state;
  for (size_t size = 0; size < records.size(); ++size) {
    std::vector<char> exact(records.c_str(), records.c_str() + size);  // a read past it shows
    handle_events(state, exact.data(), exact.size());
  }
  EXPECT_EQ(64u, log.count("filename is sixteen_letters! \n"));
  EXPECT_EQ(32u, log.count("filename is whole \n"));
  EXPECT_EQ(0u, log.count("filename is torn"));
}

}  // namespace
}  // namespace corvexd::test
