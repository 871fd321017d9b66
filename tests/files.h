// The file system as the tests handle it.
#pragma once

#include <sys/types.h>

#include <functional>
#include <string>
#include <vector>

namespace corvexd::test {

std::string read_file(const std::string& path);
void write_file(const std::string& path, const std::string& content);
bool exists(const std::string& path);
mode_t mode_of(const std::string& path);
bool is_systems(const std::string& path);  // owner and group 1000

// The names in a directory, sorted, without "." and "..".
std::vector<std::string> list(const std::string& path);

// Runs a shell command; a failure fails the test.
void run(const std::string& command);

// Asks `done` until it is true, for ten seconds at most; whether it came to that.
bool eventually(const std::function<bool()>& done);

}  // namespace corvexd::test
