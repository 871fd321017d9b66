#include "tests/files.h"

#include <dirent.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <string.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <sys/wait.h>
#include <time.h>
#include <unistd.h>

#include <algorithm>
#include <fstream>
#include <iterator>

namespace corvexd::test {

// What cannot be read, as the state of a process that has just ended, is empty.
std::string read_file(const std::string& path) {
  int fd = open(path.c_str(), O_RDONLY | O_CLOEXEC);
  std::string content = read_to_end(fd);
  close(fd);
  return content;
}

std::string read_to_end(int fd) {
  std::string all;
  char buffer[65536];
  for (ssize_t count; (count = read(fd, buffer, sizeof buffer)) > 0;) all.append(buffer, count);
  return all;
}

void write_file(const std::string& path, const std::string& content) {
  std::ofstream file(path, std::ios::binary);
  file << content << std::flush;
  EXPECT_TRUE(file.good()) << path;
}

void write_script(const std::string& path, const std::string& commands) {
  write_file(path, "#!/bin/sh\n" + commands + "\n");
  EXPECT_EQ(0, chmod(path.c_str(), 0755));
}

bool exists(const std::string& path) { return access(path.c_str(), F_OK) == 0; }

mode_t mode_of(const std::string& path) {
  struct stat status = {};
  EXPECT_EQ(0, stat(path.c_str(), &status)) << path;
  return status.st_mode & 07777;
}

bool is_systems(const std::string& path) {
  struct stat status = {};
  return stat(path.c_str(), &status) == 0 && status.st_uid == 1000 && status.st_gid == 1000;
}

Texts list(const std::string& path) {
  Texts names;
  DIR* directory = opendir(path.c_str());
  if (directory == nullptr) return names;
  while (struct dirent* entry = readdir(directory)) {
    std::string name = entry->d_name;
    if (name != "." && name != "..") names.push_back(name);
  }
  closedir(directory);
  std::sort(names.begin(), names.end());
  return names;
}

void run(const std::string& command) { EXPECT_EQ(0, system(command.c_str())) << command; }

int status_in_child(const std::function<void()>& body) {
  pid_t child = fork();
  if (child == 0) {
    body();
    _exit(0);
  }
  int status = 0;
  EXPECT_EQ(child, waitpid(child, &status, 0));
  return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
}

std::vector<pid_t> children_of(pid_t pid) {
  const std::string number = std::to_string(pid);
  std::ifstream numbers("/proc/" + number + "/task/" + number + "/children");
  return {std::istream_iterator<pid_t>(numbers), {}};
}

// A zombie has an empty command line.
bool has_ended(pid_t pid) { return read_file("/proc/" + std::to_string(pid) + "/cmdline").empty(); }

int bound_socket(int type, const char* path) {
  int fd = socket(AF_UNIX, type | SOCK_CLOEXEC, 0);
  struct sockaddr_un address = {AF_UNIX, ""};
  strcpy(address.sun_path, path);
  unlink(path);
  EXPECT_EQ(0, bind(fd, reinterpret_cast<sockaddr*>(&address), sizeof address)) << path;
  return fd;
}

bool eventually(const std::function<bool()>& done, int seconds) {
  for (const time_t end = time(nullptr) + seconds; time(nullptr) <= end; usleep(2000)) {
    if (done()) return true;
  }
  return false;
}

}  // namespace corvexd::test
