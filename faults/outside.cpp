#include "faults/outside.h"

#include <sys/stat.h>

#include <set>

#include "faults/places.h"
#include "tests/files.h"

namespace corvexd::faults {
namespace {

bool is_ours_or_the_daemons(const std::string& path) {
  static const std::set<std::string> paths = {"/usr",
                                              "/build",
                                              "/proc",
                                              "/daemon_proc",
                                              "/real_proc",
                                              kJail,
                                              "/trace",
                                              "/probe",
                                              "/nodes",
                                              "/dev/socket",
                                              "/data/corvex",
                                              "/storage/emulated/0/corvex",
                                              "/dev/__properties__",
                                              "/cache/boot_log",
                                              "/cache/log_before_initial",
                                              kPartition};
  return paths.count(path) != 0;
}

}  // namespace

void look_at(const std::string& path, Outside& outside) {
  // What sets properties leaves a draft behind when the daemon ends in the middle of a request.
  if (is_ours_or_the_daemons(path) || path.rfind("/dev/draft.", 0) == 0) return;
  struct stat status;
  if (lstat(path.c_str(), &status) != 0) return;
  std::string facts = "mode " + std::to_string(status.st_mode) + " owner " +
                      std::to_string(status.st_uid) + ":" + std::to_string(status.st_gid);
  if (S_ISREG(status.st_mode)) facts += " content " + test::read_file(path);
  outside[path] = facts;
  if (!S_ISDIR(status.st_mode)) return;
  for (const std::string& name : test::list(path)) {
    look_at((path == "/" ? "" : path) + "/" + name, outside);
  }
}

void compare(const Outside& before, const Outside& after, std::vector<std::string>& problems) {
  for (const auto& [path, facts] : before) {
    auto found = after.find(path);
    if (found == after.end()) {
      problems.push_back("removed: " + path);
    } else if (found->second != facts) {
      problems.push_back("changed: " + path);
    }
  }
  for (const auto& [path, facts] : after) {
    if (before.count(path) != 0) continue;
    problems.push_back("made: " + path);
    test::run("rm -rf '" + path + "'");  // for the next life
  }
}

}  // namespace corvexd::faults
