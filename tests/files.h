// The file system, processes and sockets as the tests handle them.
#pragma once

#include <sys/types.h>

#include <functional>
#include <string>
#include <vector>

namespace corvexd::test {

using Texts = std::vector<std::string>;

std::string read_file(const std::string& path);
std::string read_to_end(int fd);
void write_file(const std::string& path, const std::string& content);
void write_script(const std::string& path, const std::string& commands);
bool exists(const std::string& path);
mode_t mode_of(const std::string& path);
bool is_systems(const std::string& path);  // owner and group 1000

// The names in a directory, sorted, without "." and "..".
Texts list(const std::string& path);

// Runs a shell command; a failure fails the test.
void run(const std::string& command);

// Runs this in a child; its exit status, 0 when it returns, -1 when a signal ended it.
int status_in_child(const std::function<void()>& body);

std::vector<pid_t> children_of(pid_t pid);

// Whether the process has ended, be it as a zombie.
bool has_ended(pid_t pid);

// A socket of this type with this path; it does not listen yet.
int bound_socket(int type, const char* path);

// Asks `done` until it is true, for so many seconds at most; whether it came to that.
bool eventually(const std::function<bool()>& done, int seconds = 10);
#define EXPECT_EVENTUALLY(...) EXPECT_TRUE(eventually([&] { return __VA_ARGS__; }))
#define ASSERT_EVENTUALLY(...) ASSERT_TRUE(eventually([&] { return __VA_ARGS__; }))

}  // namespace corvexd::test
