#include "tests/log_catcher.h"

#include <gtest/gtest.h>
#include <signal.h>
#include <string.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <algorithm>

#include "tests/files.h"

namespace corvexd::test {
namespace {

constexpr char kSocketPath[] = "/dev/socket/logdw";
constexpr size_t kHeaderSize = 11;

}  // namespace

void LogCatcher::start() {
  socket_ = socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0);
  struct sockaddr_un address = {AF_UNIX, ""};
  strcpy(address.sun_path, kSocketPath);
  ASSERT_EQ(0, bind(socket_, reinterpret_cast<sockaddr*>(&address), sizeof address));
  // A handler that interrupted the collector would wait for the collector to read what it logs.
  sigset_t all, earlier;
  sigfillset(&all);
  pthread_sigmask(SIG_BLOCK, &all, &earlier);
  collector_ = std::thread([this] { collect(); });
  pthread_sigmask(SIG_SETMASK, &earlier, nullptr);
}

void LogCatcher::stop() {
  if (socket_ == -1) return;
  shutdown(socket_, SHUT_RDWR);
  collector_.join();
  close(socket_);
  unlink(kSocketPath);
  socket_ = -1;
}

void LogCatcher::collect() {
  char record[8192];
  for (ssize_t size; (size = TEMP_FAILURE_RETRY(recv(socket_, record, sizeof record, 0))) > 0;) {
    if (size == 1) {
      caught_up_ = true;
      continue;
    }
    ASSERT_GT(size, static_cast<ssize_t>(kHeaderSize + 2));
    ASSERT_EQ('\0', record[size - 1]);
    const char* tag = record + kHeaderSize + 1;
    std::lock_guard<std::mutex> lock(mutex_);
    lines_.push_back({record[0], record[kHeaderSize], tag, tag + strlen(tag) + 1});
  }
}

// The socket keeps the order: what was sent before this mark has been collected after it.
void LogCatcher::catch_up() {
  caught_up_ = false;
  int fd = socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0);
  struct sockaddr_un address = {AF_UNIX, ""};
  strcpy(address.sun_path, kSocketPath);
  EXPECT_EQ(1, sendto(fd, "", 1, 0, reinterpret_cast<sockaddr*>(&address), sizeof address));
  close(fd);
  while (!caught_up_) usleep(100);
}

std::vector<LogLine> LogCatcher::lines() {
  catch_up();
  std::lock_guard<std::mutex> lock(mutex_);
  return lines_;
}

std::vector<std::string> LogCatcher::texts() {
  std::vector<std::string> texts;
  for (const LogLine& line : lines()) texts.push_back(line.text);
  return texts;
}

bool LogCatcher::has(const std::string& text) {
  return eventually([&] {
    std::vector<std::string> all = texts();
    return std::find(all.begin(), all.end(), text) != all.end();
  });
}

size_t LogCatcher::count(const std::string& part) {
  std::vector<std::string> all = texts();
  return std::count_if(all.begin(), all.end(), [&](const std::string& text) {
    return text.find(part) != std::string::npos;
  });
}

void LogCatcher::clear() {
  catch_up();
  std::lock_guard<std::mutex> lock(mutex_);
  lines_.clear();
}

}  // namespace corvexd::test
