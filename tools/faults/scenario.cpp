#include "tools/faults/scenario.h"

#include <errno.h>
#include <fcntl.h>
#include <stdio.h>
#include <sys/socket.h>
#include <time.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <functional>
#include <map>
#include <memory>
#include <regex>
#include <set>
#include <thread>

#include "tests/device_root.h"
#include "tests/files.h"
#include "tests/log_catcher.h"
#include "tests/property_service.h"

namespace corvexd::faults {
namespace {

using namespace test;  // NOLINT(google-build-using-namespace): the device and its helpers

constexpr char kTombstones[] = "LOGS/TIME/tombstones/TIME/";  // as achievements
constexpr char kTraceFolder[] = "LOGS/TIME/anr/TIME/";
constexpr int kWaitingLooks = 3;
constexpr int kLookPeriod = 10'000;  // microseconds
constexpr int kWatches = 9;
constexpr long kTenYears = 315'360'000;
constexpr int kDisturbances = 6;  // of one run

// What may be set, each property with its value.
const std::regex kSettings(
    "log\\.tag\\..*=(VERBOSE|INFO)|persist\\.oem\\.nfc\\.debug=1|oem\\.after\\.clear=false|"
    "debug\\.sf\\.dump=0|ctl\\.start=diag_mdlog_start|ctl\\.restart=(logd|logd-reinit|corvexd)");

// Ten years ahead of UTC, which shows in the names: a zone's file with one offset and no change.
std::string far_zone() {
  std::string file = "TZif" + std::string(40, '\0');
  file[39] = 1;  // one kind of time
  file[43] = 4;  // characters of names
  return file + std::string("\x12\xcc\x03\x00\0\0FAR\0", 10);
}

bool has_come(const std::string& achievement) {
  usleep(10'000);
  Achievements achieved;
  count_logs(read_logs(), achieved);
  return achieved.count(achievement) != 0;
}

// Never waits for ever. A start may wait for ever for what can never be opened: an impatient client
// then sends nothing more.
class Client {
 public:
  Client(TracedDaemon& daemon, std::vector<std::string>& problems, int patience = kPatience)
      : daemon_(daemon), problems_(problems), patience_(patience) {}

  // Sends the command over a connection of its own and returns what came back until the daemon
  // ended it.
  std::string send(const std::string& command) {
    if (gave_up_ || !connect()) return "";
    const std::string bytes = message(command);
    ::send(fd_, bytes.data(), bytes.size(), MSG_NOSIGNAL);
    shutdown(fd_, SHUT_WR);
    std::string reply;
    auto has_ended = [&] {
      char buffer[64];
      ssize_t count = recv(fd_, buffer, sizeof buffer, MSG_DONTWAIT);
      if (count > 0) reply.append(buffer, count);
      // Children of a daemon that was killed keep its connections open.
      return count == -1 && errno == EAGAIN ? daemon_.has_ended() : count <= 0;
    };
    if (!eventually(has_ended, kPatience)) problems_.push_back("hangs at " + command);
    close(fd_);
    return reply;
  }

 private:
  bool connect() {
    gave_up_ = !eventually([&] { return (fd_ = try_to_connect()) != -1 || daemon_.has_ended(); },
                           patience_);
    if (gave_up_ && patience_ == kPatience) problems_.emplace_back("does not serve");
    return fd_ != -1;
  }

  TracedDaemon& daemon_;
  std::vector<std::string>& problems_;
  const int patience_;
  bool gave_up_ = false;
  int fd_ = -1;
};

class Scenario {
 public:
  Scenario(const Fault* fault, const std::string& traced, Run& run, Files& outside)
      : mode_(fault == nullptr ? Mode::kFail : fault->mode),
        run_(run),
        outside_(outside),
        daemon_(std::make_unique<TracedDaemon>(fault, traced)),
        client_(*daemon_, run.problems,
                fault != nullptr && fault->lasting ? kPatience / 4 : kPatience) {}

  void play() {
    for (const char* node :
         {"/nodes/kmsg", "/nodes/proc/tzdbg/qsee_log", "/nodes/proc/tzdbg/tz_log"}) {
      nodes_.push_back(open(node, O_RDWR | O_CLOEXEC));
    }
    client_.send("CHANGEPATH");  // carried out once the start and its capture are behind it
    wait_for([&] { return watches(); });
    beside_others(&Scenario::until_delete);
    beside_others(&Scenario::after_delete);
    settle();
    run_.calls = daemon_->let_go();
    look_after_it();
    for (int fd : nodes_) close(fd);  // not sooner: a reader whose source has ended reads on and on
  }

 private:
  // Takes steps. While a delay keeps one of the daemon's threads from going on, others have it do
  // something: an artefact and a trace arrive, and a command.
  void beside_others(void (Scenario::*steps)()) {
    std::atomic<bool> done{mode_ != Mode::kDelay};
    std::vector<std::string> arrived, problems;
    std::thread others([&] {
      Client client(*daemon_, problems);
      for (char number = 'a'; number < 'a' + kDisturbances && !done;) {
        if (daemon_->is_held_up()) disturb(client, number++, arrived);
      }
    });
    (this->*steps)();
    done = true;
    others.join();
    run_.problems.insert(run_.problems.end(), problems.begin(), problems.end());
    for (const std::string& wanted : arrived) {
      if (!eventually([&] { return is_deleted_ || has_come(wanted); }, kPatience))
        run_.problems.push_back("loses what arrived meanwhile: " + wanted);
    }
    see_what_was_achieved();
  }

  static void disturb(Client& client, char number, std::vector<std::string>& arrived) {
    const std::string tombstone = std::string("tombstone_late_") + number;
    const std::string trace = std::string("anr_late_") + number;
    int fd = open(("/data/anr/" + trace).c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0644);
    dprintf(fd, "%s", kArtefactStart.c_str());
    write_file("/data/tombstones/" + tombstone, kArtefactStart + kArtefactEnd);
    client.send("LOGBEGIN");
    dprintf(fd, "%s", kArtefactEnd.c_str());
    close(fd);
    arrived.push_back(kTombstones + tombstone + " whole");
    arrived.push_back(kTraceFolder + trace + " whole");
  }

  void until_delete() {
    feed_nodes();
    make_artefacts();
    int trace = open("/data/anr/anr_open", O_WRONLY | O_CREAT | O_CLOEXEC, 0644);
    dprintf(trace, "%s", kArtefactStart.c_str());
    send_all({"CACHECLEAR", "BUGREPORT", "WIFI_SNIFFLOG_START", "OEM_GPS_DEBUG_ENABLE",
              "OEM_BT_DEBUG_ENABLE", "OEM_NFC_DEBUG_DISABLE"});
    settle();  // its recorders, too, have begun then
    send_all({"LOGSTOP"});
    write_file("/etc/localtime", far_zone());
    send_all({"LOGBEGIN"});
    dprintf(trace, "%s", kArtefactEnd.c_str());
    close(trace);
    look_at("/data/anr/anr_open", outside_);
    send_all({"CPUTHERMAL", "WIFI_SNIFFLOG_STOP", "WIFI_SNIFFLOG_START"});
    feed_nodes();
    finish_artefacts("tombstone_last");
    send_all({"STOPCPUTHERMAL", "LOGSTOP"});
  }

  // The thermal record is then the first to need a log directory.
  void after_delete() {
    known_.clear();
    is_deleted_ = true;
    ++run_.achieved["deletion answered " + client_.send("DELETELOG")];
    if (read_logs().count("/data/corvex/KVBR_1--2020-01-01-00-00-00/old") == 0)
      ++run_.achieved["what was deleted is gone"];
    send_all({"CPUTHERMAL"});
    finish_artefacts("tombstone_after");
    send_all({"STOPCPUTHERMAL"});
  }

  void feed_nodes() {
    const std::string block(2500, 'k');
    for (int node : nodes_) dprintf(node, "%s", block.c_str());
  }

  void make_artefacts() {
    for (const char* path :
         {"/data/tombstones/tombstone_00", "/data/anr/anr_1", "/data/anr/BATTERY_html.gz",
          "/data/media/0/Pictures/Screenshots/Screenshot_1", "/data/coredump/core.1",
          "/data/misc/display/raw_1", "/data/vendor/media/yuv_1", "/data/anr/anr_1"}) {
      make_artefact(path);
    }
    make_artefact("/data/system/entry");
    outside_.erase("/data/system/entry");
    rename("/data/system/entry", "/data/system/dropbox/entry");
    look_at("/data/system/dropbox/entry", outside_);
  }

  void make_artefact(const std::string& path) {
    write_file(path, kArtefactStart + kArtefactEnd);
    look_at(path, outside_);
  }

  // Waits until the last artefact and the thermal record are there, if they ever are.
  void finish_artefacts(const std::string& tombstone) {
    make_artefact("/data/tombstones/" + tombstone);
    for (const std::string& wanted : {kTombstones + tombstone + " whole",
                                      std::string("LOGS/TIME/kv_tsen_data/#_# not empty")}) {
      wait_for([&] { return has_come(wanted); });
    }
    settle();
  }

  void send_all(const std::vector<const char*>& commands) {
    for (const char* command : commands) {
      check_known(read_logs());
      client_.send(command);
    }
  }

  // No log directory is lost but by deletion.
  void check_known(const Files& logs) {
    for (const std::string& path : known_) {
      // A listing may miss what is renamed meanwhile.
      if (logs.count(path) != 0 || read_logs().count(path) != 0) continue;
      run_.problems.push_back("loses the directory " + path);
    }
    known_.clear();
    for (const auto& [path, content] : logs) {
      if (std::count(path.begin(), path.end(), '/') == 4 && path.back() == '/') known_.insert(path);
    }
  }

  void see_what_was_achieved() {
    const Files logs = read_logs();
    check_known(logs);
    count_logs(logs, run_.achieved);
    if (marked_directories().size() == 1) ++run_.achieved["one mark"];
    const time_t there = time(nullptr) + kTenYears;
    const std::string year = "--" + std::to_string(gmtime(&there)->tm_year + 1900);
    for (const std::string& path : known_) {
      if (holds(path, year.c_str())) ++run_.achieved["a name in the new zone"];
    }
  }

  // Waits for what may never be when calls fail.
  void wait_for(const std::function<bool()>& done) {
    eventually([&] { return done() || daemon_->has_ended(); },
               mode_ == Mode::kFail ? 1 : kPatience);
  }

  bool watches() {
    static const std::regex watch("inotify wd:");
    std::string facts;
    const std::string folder = "/proc/" + std::to_string(daemon_->pid()) + "/fdinfo/";
    for (const std::string& fd : list(folder)) facts += read_file(folder + fd);
    return std::distance(std::sregex_iterator(facts.begin(), facts.end(), watch), {}) == kWatches;
  }

  // Waits until each of its threads has been seen waiting, and more than once: a busy machine makes
  // all of them look busy now and then, but only one that spins always.
  bool settle() {
    std::map<std::string, int> seen_waiting;
    auto all_wait = [&] {
      usleep(kLookPeriod);
      bool all = true;
      for (const auto& [task, state] : daemon_->tasks()) {
        const bool waits = state != 'R' && state != 'D' && state != 't';
        all = (seen_waiting[task] += waits) >= kWaitingLooks && all;
      }
      return all;
    };
    return eventually(all_wait, kPatience);
  }

  // Untraced and undisturbed it carries out commands, if need be after init has started it again.
  void look_after_it() {
    bool starts_again = daemon_->has_ended() || mode_ == Mode::kKill;
    run_.status = daemon_->status();
    if (starts_again) daemon_->end();  // its children too
    const Files before = read_logs();
    if (starts_again) daemon_ = std::make_unique<TracedDaemon>(nullptr, "");
    Client client(*daemon_, run_.problems);
    if (starts_again) client.send("CHANGEPATH");
    client.send("LOGBEGIN");
    const Files after = read_logs();
    check_known(after);
    for (const auto& [path, content] : before) {
      auto found = after.find(path);
      if (!starts_again || (found != after.end() && found->second == content)) continue;
      run_.problems.push_back("started again, it changes or loses " + path);
    }
    const std::vector<std::string> marked = marked_directories();
    if (marked.size() != 1) {
      run_.problems.push_back(std::to_string(marked.size()) + " directories bear the mark");
    } else if (read_file(marked[0] + "/versionNumber").size() != 92) {
      run_.problems.emplace_back("does not begin a capture any more");
    }
    client.send("LOGSTOP");
    if (client.send("DELETELOG") != "CLEANSUCCESS") {
      run_.problems.emplace_back("does not delete logs any more");
    }
    if (!settle()) run_.problems.emplace_back("is busy without end");
  }

  const Mode mode_;
  Run& run_;
  Files& outside_;  // what was made for it to find is added
  std::unique_ptr<TracedDaemon> daemon_;
  Client client_;
  std::vector<int> nodes_;
  std::set<std::string> known_;  // log directories
  bool is_deleted_ = false;      // and with them what arrived
};

}  // namespace

Run run_scenario(const Fault* fault, const std::string& traced) {
  Run run;
  make_device();
  LogCatcher log;
  log.start();
  PropertyService service;
  Files before, after;
  look_at("/", before);
  Scenario(fault, traced, run, before).play();
  look_at("/", after);
  compare(before, after, run.problems);
  for (const auto& [key, value] : service.requests()) {
    if (!std::regex_match(key + "=" + value, kSettings))
      run.problems.push_back("sets " + key + " to " + value);
  }
  if (!partition_is_sound()) run.problems.emplace_back("the partition is neither log nor zeros");
  run.log = log.texts();
  return run;
}

}  // namespace corvexd::faults
