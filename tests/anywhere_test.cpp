// What needs neither a device root nor properties or a log of its own, and so runs on a phone as
// well, on its processor and with its C library.
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/time.h>

#include <atomic>
#include <chrono>
#include <thread>

#include "capture/children.h"
#include "core/path_buffer.h"
#include "core/pause.h"
#include "core/published_path.h"
#include "tests/files.h"

namespace corvexd::test {
namespace {

TEST(Anywhere, PathBufferKnowsWhatDidNotFit) {
  PathBuffer<8> buffer;
  EXPECT_TRUE(buffer.append("1234").append("567").fits());
  EXPECT_FALSE(buffer.append("8").fits());
  EXPECT_STREQ("1234567", buffer.c_str());
  EXPECT_FALSE(buffer.append("").fits()) << "a cut text never fits again";
  EXPECT_TRUE(buffer.clear().append_format("%d", 1234567).fits());
  EXPECT_FALSE(buffer.clear().append("a").append_format("%s", "1234567").fits());
  EXPECT_STREQ("a123456", buffer.c_str());
}

TEST(Anywhere, PublishedPathIsNeverAMixture) {
  PublishedPath path;
  EXPECT_STREQ("", path.get().c_str());
  std::atomic<bool> done{false};
  std::thread reader([&] {
    while (!done) {
      std::string text = path.get().c_str();
      for (char c : text) ASSERT_EQ(text[0], c) << text;
    }
  });
  for (int i = 0; i < 20'000; ++i) {
    path.set(Path().append(std::string(i % 200, static_cast<char>('a' + i % 26)).c_str()));
  }
  done = true;
  reader.join();
}

TEST(Anywhere, PauseLastsThoughSignalsInterruptIt) {
  signal(SIGALRM, [](int) {});
  const struct itimerval often = {{0, 1000}, {0, 1000}}, never = {};
  setitimer(ITIMER_REAL, &often, nullptr);
  const auto start = std::chrono::steady_clock::now();
  pause_seconds(1);
  EXPECT_GE(std::chrono::steady_clock::now() - start, std::chrono::seconds(1));
  setitimer(ITIMER_REAL, &never, nullptr);
}

TEST(Anywhere, AChildThatEndsAtOnceIsFoundInItsSlot) {
  static ChildSlot slot;
  handle_ended_children();
  for (int i = 0; i < 300; ++i) {
    start_child(
        slot, [](const void*) {}, nullptr);
    ASSERT_TRUE(eventually([] { return !slot.running; })) << i;
  }
}

}  // namespace
}  // namespace corvexd::test
