#include "simulator/device/user_map.h"

#include <android-base/file.h>
#include <fcntl.h>
#include <pwd.h>
#include <stdio.h>
#include <string.h>
#include <sys/wait.h>
#include <unistd.h>

#include <string>

namespace corvexd::sim {
namespace {

struct Range {
  unsigned long first = 0;
  unsigned long count = 0;
};

// This user's row in a table of "name-or-number:first:count".
Range find_range(const char* table) {
  struct passwd* user = getpwuid(getuid());
  std::string number = std::to_string(getuid());
  Range range;
  FILE* file = fopen(table, "re");
  char row[256];
  while (file != nullptr && fgets(row, sizeof row, file) != nullptr) {
    char* colon = strchr(row, ':');
    if (colon == nullptr) continue;
    *colon = '\0';
    if (number != row && (user == nullptr || strcmp(user->pw_name, row) != 0)) continue;
    if (sscanf(colon + 1, "%lu:%lu", &range.first, &range.count) == 2) break;
  }
  if (file != nullptr) fclose(file);
  return range;
}

// Only a program that the machine trusts may map more than one user.
bool map_range(const char* program, const char* table, pid_t child, unsigned own) {
  Range range = find_range(table);
  if (range.count == 0) return false;
  pid_t pid = fork();
  if (pid == 0) {
    std::string numbers[] = {std::to_string(child), std::to_string(own),
                             std::to_string(range.first), std::to_string(range.count)};
    execlp(program, program, numbers[0].c_str(), "0", numbers[1].c_str(), "1", "1",
           numbers[2].c_str(), numbers[3].c_str(), nullptr);
    _exit(127);
  }
  int status = 1;
  return pid > 0 && waitpid(pid, &status, 0) == pid && status == 0;
}

bool map_own(pid_t child, const char* map, unsigned own) {
  std::string directory = "/proc/" + std::to_string(child) + "/";
  std::string line = "0 " + std::to_string(own) + " 1\n";
  // A group of one's own may be mapped only where groups cannot be dropped.
  if (strcmp(map, "gid_map") == 0) {
    android::base::WriteStringToFile("deny", directory + "setgroups");
  }
  return android::base::WriteStringToFile(line, directory + map);
}

}  // namespace

bool map_users(pid_t child, bool* failed) {
  bool all_users = map_range("newuidmap", "/etc/subuid", child, getuid());
  bool all_groups = map_range("newgidmap", "/etc/subgid", child, getgid());
  *failed = (!all_users && !map_own(child, "uid_map", getuid())) ||
            (!all_groups && !map_own(child, "gid_map", getgid()));
  if (*failed) fprintf(stderr, "corvex-device: the device's root cannot be mapped: %m\n");
  return all_users && all_groups;
}

}  // namespace corvexd::sim
