#include "faults/verdict.h"

#include <errno.h>
#include <string.h>

#include <algorithm>
#include <map>
#include <regex>

namespace corvexd::faults {

std::string callers(const Call& call) {
  std::string all;
  for (const std::string& function : call.functions) all = function + " " + all;
  return all;
}

namespace {

// What a failed call must lead to. The first row that fits counts; where none does, the daemon
// just goes on.
struct Consequence {
  const char* call;      // its name, a pattern
  const char* path;      // a pattern
  const char* function;  // in whose run it was made; may be null
  // %p is the call's path, %n the name that it ends in, %e the error, * anything; null for none.
  const char* line;
  bool ends = false;  // the daemon ends with status 1
  bool repeats_interrupted = false;
};

const Consequence kConsequences[] = {
    {"getsockname", ".*", "open_control_socket", "Failed to get socket from environment: %e\n",
     true},
    {"listen", ".*", nullptr, "Listen on socket failed: %e\n", true},
    {"accept4", ".*", nullptr, "Accept failed: %e\n"},
    {"read", "socket:.*|UNIX.*", nullptr, "corvexd: read error: %e\n", false, true},
    {"openat", "/vendor/etc/fstab.qcom", nullptr,
     "[libfs_mgr]fs_mgr_read_fstab(): cannot open file: '%p': %e"},
    {"openat|read", "/data/.layout_version", nullptr,
     "corvexd: installd fs upgrade not yet complete. Waiting...\n"},

    {"openat", ".*/versionNumber", nullptr, "corvexd: Open %p Error：%e\n", true},
    {"write", ".*/versionNumber", nullptr,
     "corvexd: bytes_write is -1, versionNumber is existing now! Error: %e \n", true, true},
    {"openat", "/.*/corvex", "renameLastDirectoryName", "corvexd: Error: %e\n"},
    {"openat", "/.*/corvex", "createLogDirectory", "corvexd: pdir is null! \n"},
    {"openat", "/.*/corvex", "deleteLog", "corvexd: opendir %p  %e \n "},
    {"openat", ".*", "mkdirs", nullptr},
    {"openat", "/.*/corvex|/data/.*", "movefile.*open_directory", "corvexd: Error: %e\n"},
    {"rename", "/data/corvex/KVBR_.*_current", nullptr, "corvexd: Rename failed! Error: %e\n"},
    {"rename", "/cache/boot_log/.*", nullptr, "corvexd: Rename %p failed! Error: %e\n"},
    {"rename", ".*/kernel.log.*", nullptr, "while rotating log files"},
    {"mkdir", "/data/corvex/.*/", nullptr, "corvexd: fail to mkdir"},
    {"mkdir", "/.*/KVBR_[^/]*", "createLogDirectory",
     "corvexd: Directory create failed! Error: %e\n", true},
    {"mkdir", ".*", "mkdirs", "corvexd: Directory create failed! Error: %e\n"},
    {"chown",
     ".*/(kv_tsen_data|tombstones(/.*)?|media(/.*)?|dropbox|rawdata(/.*)?|Screenshots|"
     "coredump|BatteryHistory|anr/.*)",
     "mkdirs", "corvexd: fail to chown, path is %p \n"},
    {"openat", ".*", "copy_file_at\\(", "corvexd: open file failure. */%n"},

    {"unlinkat", ".*", nullptr, "corvexd: can't remove '%p'"},
    {"newfstatat", "/data/corvex/.*|/storage/.*", "deleteLog", "corvexd: can't stat '%p' %e "},
    {"unlink", ".*/anr/.*", nullptr, "corvexd: can't remove %p'"},
    {"unlink", "/cache/.*", nullptr, "corvexd: can't remove %p \n"},

    {"access", "/dev/kmsg", nullptr, "corvexd: Kernel log node can not be read: %e \n"},
    {"access", "/proc/tzdbg/qsee_log", nullptr, "corvexd: qsee log node can not be read: %e \n"},
    {"access", "/proc/tzdbg/tz_log", nullptr, "corvexd: tz log node can not be read: %e \n"},
    {"access", "/proc/bootloader_log", nullptr,
     "corvexd: bootloader log node can not be read: %e \n"},
    {"access", "/dev/block/.*", nullptr, "corvexd: pre_bootloader log node can not be read: %e \n"},
    {"access", ".*/qsee.log", nullptr, "corvexd: qsee log node can not access: %p \n"},
    {"access", ".*/tz.log", nullptr, "corvexd: tz log node can not access: %p \n"},
    {"access", ".*/bootloader.log", nullptr, "corvexd: bootloader log node can not access: %p \n"},
    {"access", ".*/pre_bootloader.log", nullptr,
     "corvexd: pre_bootloader log node can not access: %p \n"},
    {"openat", "/dev/kmsg|.*_current/kernel.log", nullptr, "corvexd: Open %p Error*%e\n"},
    {"openat", "/proc/tzdbg/.*|/proc/bootloader_log|/dev/block/.*|.*/(qsee|tz|.*bootloader).log",
     nullptr, "corvexd: Open %p Error %e\n"},
    {"read", "/nodes/kmsg", nullptr,
     "corvexd: bytes_read is -1, read kernel log fail! Error: %e \n"},
    {"read", "/nodes/qsee_log", nullptr,
     "corvexd: bytes_read is -1, read qsee log fail! Error: %e \n"},
    {"read", "/nodes/tz_log", nullptr, "corvexd: bytes_read is -1, read tz log fail! Error: %e \n"},
    {"read", "/nodes/bootloader_log", nullptr,
     "corvexd: bytes_read is -1, read bootloader log fail! Error: %e \n"},
    {"read", "/dev/block/.*", nullptr,
     "corvexd: bytes_read is -1, read pre_bootloader log fail! Error: %e \n"},
    {"write", ".*/kernel.log", nullptr,
     "corvexd: bytes_write is -1, write kernel log fail! Error: %e \n"},
    {"write", ".*/qsee.log", nullptr,
     "corvexd: bytes_write is -1, write qsee log fail! Error: %e \n"},
    {"write", ".*/tz.log", nullptr, "corvexd: bytes_write is -1, write tz log fail! Error: %e \n"},
    {"write", ".*/bootloader.log", nullptr,
     "corvexd: bytes_write is -1, write bootloader log fail! Error: %e \n"},
    {"write", ".*/pre_bootloader.log|/dev/block/.*", nullptr,
     "corvexd: bytes_write is -1, write pre_bootloader log fail! Error: %e \n"},

    {"inotify_init1", ".*", nullptr, "corvexd: Inotify init failed: %e"},
    {"read", "anon_inode:inotify", nullptr, "corvexd: Inotify read failed: %e", false, true},
    {"clone", ".*", "getBugreport", "corvexd: Bugreport process fork error: %e"},
    {"clone", ".*", "cacheClear", "corvexd: Clear process fork error: %e"},
};

bool matches(const std::string& text, const char* pattern) {
  return std::regex_match(text, std::regex(pattern));
}

const Consequence* find_consequence(const Call& call) {
  for (const Consequence& row : kConsequences) {
    if (!matches(call.name, row.call) || !matches(call.path, row.path)) continue;
    if (row.function != nullptr && !std::regex_search(callers(call), std::regex(row.function)))
      continue;
    return &row;
  }
  return nullptr;
}

std::string fill_in(const char* line, const Call& call) {
  const std::string name = call.path.substr(call.path.rfind('/') + 1);
  std::string text = line;
  for (const auto& [mark, value] :
       {std::pair{"%p", call.path}, std::pair{"%n", name}, std::pair{"%e", call.error}}) {
    size_t at = text.find(mark);
    if (at != std::string::npos) text.replace(at, 2, value);
  }
  return text;
}

bool is_in(const std::vector<std::string>& log, const std::string& line) {
  const size_t star = line.find('*');
  const std::string start = line.substr(0, star);
  const std::string end = star == std::string::npos ? "" : line.substr(star + 1);
  return std::any_of(log.begin(), log.end(), [&](const std::string& text) {
    size_t at = text.find(start);
    return at != std::string::npos && text.find(end, at + start.size()) != std::string::npos;
  });
}

void judge_call(const Call& call, Life& life, bool* may_end) {
  if (!call.injected || call.error.empty()) return;
  const Consequence* row = find_consequence(call);
  if (row == nullptr || row->line == nullptr ||
      (row->repeats_interrupted && call.error == strerror(EINTR)))
    return;
  // Ended together with the daemon, a thread says nothing more.
  if (life.status == 1 && !row->ends) return;
  const std::string line = fill_in(row->line, call);
  if (!is_in(life.log, line)) {
    life.problems.push_back("lacks the line \"" + line + "\"");
  }
  if (!row->ends) return;
  *may_end = true;
  if (life.status == -1) life.problems.push_back("goes on after \"" + line + "\"");
}

// Where the start waits, with pauses, as long as it must.
bool is_waiting(const Call& call) {
  return call.path == "/data/.layout_version" ||
         callers(call).find("corvexd::wait_for_data_partition") != std::string::npos;
}

// One that does not take no for an answer uses up all the refusals there are.
void judge_stubbornness(Life& life) {
  std::map<std::string, int> refusals;
  for (const Call& call : life.calls) {
    if (!call.injected || is_waiting(call)) continue;
    const std::string place = call.name + " of " + call.path + " in " + callers(call);
    if (++refusals[place] == kShieldCalls / 2) {
      life.problems.push_back("repeats " + place + " without end");
    }
  }
}

}  // namespace

void judge(Life& life) {
  judge_stubbornness(life);
  bool may_end = false;
  for (const Call& call : std::vector<Call>(life.calls)) judge_call(call, life, &may_end);
  if (life.status != -1 && (life.status != 1 || !may_end)) {
    life.problems.push_back("ends with status " + std::to_string(life.status));
  }
}

}  // namespace corvexd::faults
