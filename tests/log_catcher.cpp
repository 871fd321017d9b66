#include "tests/log_catcher.h"

#include <gtest/gtest.h>
#include <signal.h>
#include <string.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <algorithm>

namespace corvexd::test {
namespace {

const struct sockaddr_un kAddress = {AF_UNIX, "/dev/socket/logdw"};
constexpr size_t kHeaderSize = 11;
constexpr char kLetters[] = "??VDIWEF";  // of the priorities

bool holds(const std::string& text, const std::string& part) {
  return text.find(part) != std::string::npos;
}

}  // namespace

void LogCatcher::start() {
  socket_ = bound_socket(SOCK_DGRAM, kAddress.sun_path);
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
  unlink(kAddress.sun_path);
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
    lines_.push_back({kLetters[record[kHeaderSize] & 7], '/'});
    lines_.back() += tag + strlen(tag) + 1;
  }
}

// The socket keeps the order: what was sent before this mark has been collected after it.
void LogCatcher::catch_up() {
  caught_up_ = false;
  EXPECT_EQ(1, sendto(socket_, "", 1, 0, reinterpret_cast<const struct sockaddr*>(&kAddress),
                      sizeof kAddress));
  while (!caught_up_) usleep(100);
}

Texts LogCatcher::texts(const Texts& ignored) {
  Texts all = lines(ignored);
  for (std::string& line : all) line.erase(0, 2);
  return all;
}

Texts LogCatcher::lines(const Texts& ignored) {
  catch_up();
  std::lock_guard<std::mutex> lock(mutex_);
  Texts kept;
  std::copy_if(lines_.begin(), lines_.end(), std::back_inserter(kept), [&](const auto& line) {
    return std::none_of(ignored.begin(), ignored.end(),
                        [&](const auto& part) { return holds(line, part); });
  });
  return kept;
}

bool LogCatcher::has(const std::string& text) {
  return eventually([&] {
    Texts all = texts();
    return std::find(all.begin(), all.end(), text) != all.end();
  });
}

size_t LogCatcher::count(const std::string& part) {
  Texts all = texts();
  return std::count_if(all.begin(), all.end(), [&](const auto& text) { return holds(text, part); });
}

void LogCatcher::clear() {
  catch_up();
  std::lock_guard<std::mutex> lock(mutex_);
  lines_.clear();
}

}  // namespace corvexd::test
