#include "tests/files.h"

#include <dirent.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <fstream>
#include <iterator>

namespace corvexd::test {

std::string read_file(const std::string& path) {
  std::ifstream file(path, std::ios::binary);
  return {std::istreambuf_iterator<char>(file), std::istreambuf_iterator<char>()};
}

void write_file(const std::string& path, const std::string& content) {
  std::ofstream file(path, std::ios::binary);
  file << content << std::flush;
  EXPECT_TRUE(file.good()) << path;
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

std::vector<std::string> list(const std::string& path) {
  std::vector<std::string> names;
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

bool eventually(const std::function<bool()>& done) {
  for (int i = 0; i < 1000; ++i) {
    if (done()) return true;
    usleep(10'000);
  }
  return false;
}

}  // namespace corvexd::test
