// What needs neither a device root nor properties or a log of its own, and so runs on a phone as
// well, on its processor and with its C library.
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/mman.h>
#include <sys/time.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <functional>
#include <new>

#include "capture/children.h"
#include "core/fixed_string.h"
#include "core/published_path.h"
#include "core/sleep.h"
#include "tests/files.h"

namespace corvexd::test {
namespace {

#ifdef CORVEX_SANITIZED
constexpr bool kSanitized = true;
#else
constexpr bool kSanitized = false;
#endif

TEST(Anywhere, PathBufferKnowsWhatDidNotFit) {
  FixedString<8> buffer;
  EXPECT_TRUE(buffer.append("1234").append("567").fits());
  EXPECT_FALSE(buffer.append("8").fits());
  EXPECT_STREQ("1234567", buffer.c_str());
  EXPECT_FALSE(buffer.append("").fits()) << "a cut text never fits again";
  EXPECT_TRUE(buffer.clear().append_format("%d", 1234567).fits());
  EXPECT_FALSE(buffer.clear().append("a").append_format("%s", "1234567").fits());
  EXPECT_STREQ("a123456", buffer.c_str());
}

// A path that lies across two pages, the second of which cannot be touched: whoever comes to that,
// in the middle of the text, finds out by a signal.
class TornPath {
 public:
  TornPath()
      : pages_(static_cast<char*>(
            mmap(nullptr, 2 * size_, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0))),
        path_(new (pages_ + size_ - 96) PublishedPath) {
    signal(SIGSEGV, [](int) {
      mprotect(torn->pages_ + size_, size_, PROT_READ | PROT_WRITE);
      torn->meanwhile_();
    });
    torn = this;
  }
  ~TornPath() {
    signal(SIGSEGV, SIG_DFL);
    munmap(pages_, 2 * size_);
  }

  // Has this done when the next reader or writer is half through.
  void tear(const std::function<void()>& meanwhile) {
    meanwhile_ = meanwhile;
    mprotect(pages_ + size_, size_, PROT_NONE);
  }
  PublishedPath* operator->() { return path_; }

 private:
  static inline TornPath* torn;
  static inline const long size_ = sysconf(_SC_PAGESIZE);

  char* pages_;
  PublishedPath* path_;
  std::function<void()> meanwhile_;
};

TEST(Anywhere, PublishedPathIsNeverAMixture) {
  const Path first = Path().append(std::string(199, 'a').c_str());
  const Path second = Path().append(std::string(190, 'b').c_str());
  TornPath path;
  EXPECT_STREQ("", path->get().c_str());
  path->set(first);
  path.tear([&] { path->set(second); });
  EXPECT_STREQ(second.c_str(), path->get().c_str()) << "written while it was read";

  if (kSanitized) return;  // the thread sanitizer holds a lock of its own while it stores a word
  path.tear([&] {
    const pid_t reader = fork();
    if (reader == 0) _exit(path->get().empty());
    usleep(20'000);
    EXPECT_EQ(0, waitpid(reader, nullptr, WNOHANG)) << "the writer is half through";
    kill(reader, SIGKILL);
    waitpid(reader, nullptr, 0);
  });
  path->set(first);
}

TEST(Anywhere, PauseLastsThoughSignalsInterruptIt) {
  signal(SIGALRM, [](int) {});
  const struct itimerval often = {{0, 1000}, {0, 1000}}, never = {};
  setitimer(ITIMER_REAL, &often, nullptr);
  const auto start = std::chrono::steady_clock::now();
  sleep_seconds(1);
  EXPECT_GE(std::chrono::steady_clock::now() - start, std::chrono::seconds(1));
  setitimer(ITIMER_REAL, &never, nullptr);
}

TEST(Anywhere, AChildThatEndsAtOnceIsFoundInItsSlot) {
  static ChildSlot slot;
  install_sigchld_handler();
  for (int i = 0; i < 300; ++i) {
    start_child(
        slot, [](const void*) {}, nullptr);
    ASSERT_EVENTUALLY(!slot.running) << i;
  }
}

}  // namespace
}  // namespace corvexd::test
