#include "capture/node_reader.h"

#include <fcntl.h>
#include <limits.h>
#include <signal.h>
#include <string.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include "core/settings.h"
#include "core/state.h"
#include "storage/capture_paths.h"
#include "tests/daemon.h"

namespace corvexd::test {
namespace {

constexpr char kPartition[] = "/dev/block/platform/soc/624000.ufshc/by-name/reserve1";

// Text in which every place is told from every other.
std::string numbered(size_t size) {
  std::string text;
  for (size_t i = 0; text.size() < size; ++i) text += std::to_string(i) + "\n";
  text.resize(size);
  return text;
}

class Reader : public DeviceTest {
 protected:
  Reader() {
    run("mkdir -p /data/log /dev/block/platform/soc/624000.ufshc/by-name");
    LOG_DIR.set(Path().append("/data/log"));
    makeLogAbsolutePath();
  }
  ~Reader() override {
    if (child_ > 0) kill(child_, SIGKILL);
  }

  // Runs the reader in a child, on another source when one is given.
  void start(NodeReader reader, const char* source = nullptr) {
    if (source != nullptr) reader.source = source;
    child_ = fork();
    if (child_ == 0) _exit((run_node_reader(reader), 1));
  }

  // The exit status of the child that ended, or -1 when a signal ended it.
  int end(int with_signal = 0) {
    if (with_signal != 0) kill(child_, with_signal);
    int status = 0;
    waitpid(child_, &status, 0);
    child_ = 0;
    return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
  }

  size_t descriptors() const { return list("/proc/" + std::to_string(child_) + "/fd").size(); }

  // A rotated series, the oldest file first, must be the source again.
  static void expect_source_in(const std::string& name) {
    run("cd /data/log && cat $(ls -rv " + name + "*) | cmp - /data/source");
  }

  pid_t child_ = 0;
};

TEST_F(Reader, FirmwareLogIsRotatedEveryTwentyMebibytes) {
  write_file("/data/source", numbered(45 << 20));
  start(kQseeReader, "/data/source");
  EXPECT_EVENTUALLY(exists("/data/log/qsee.log.2") &&
                    read_file("/data/log/qsee.log").size() == 5 << 20);
  EXPECT_EQ(-1, end(SIGTERM));
  EXPECT_EQ(3u, list("/data/log").size());
  EXPECT_EQ(20u << 20, read_file("/data/log/qsee.log.2").size());
  expect_source_in("qsee.log");
  EXPECT_EQ(0600u, mode_of("/data/log/qsee.log"));
  EXPECT_TRUE(log.has("total qsee bytes write 41943040,offset 2"));
}

TEST_F(Reader, KernelLogKeepsEveryByteOverHundredsOfRotations) {
  strcpy(kernel_logsize, "1x");
  write_file("/data/source", numbered(300'500));
  start(kKernelReader, "/data/source");
  EXPECT_EVENTUALLY(log.count("offset 293") == 1);
  usleep(50'000);
  EXPECT_LE(descriptors(), list("/proc/self/fd").size() + 2) << "its source and its output";
  EXPECT_EQ(-1, end(SIGTERM));
  EXPECT_EQ(294u, list("/data/log").size());
  expect_source_in("kernel.log");
  EXPECT_TRUE(log.has("corvexd: eof, kernel log process continue \n"));
  EXPECT_EQ(owners_work(), is_systems("/data/log/kernel.log.1"));
  EXPECT_FALSE(is_systems("/data/log/kernel.log")) << "a fresh file keeps the daemon's owner";
}

TEST_F(Reader, RotationPassesOverGapsAndGoesOnPastTwoGibibytes) {
  strcpy(kernel_logsize, "2097152");
  int total = INT_MAX;
  int count = 0;
  rotateKernelLog(&total, &count, 1);
  EXPECT_EQ(1, count);
  for (const char* size : {"0", "-5", "", "x"}) {
    strcpy(kernel_logsize, size);
    rotateKernelLog(&total, &count, 5000);
  }
  EXPECT_EQ(1, count);
  strcpy(kernel_logsize, "1");
  total = 4095;
  count = 3;
  write_file("/data/log/kernel.log.3", "3");
  write_file("/data/log/kernel.log.1", "1");
  write_file("/data/log/kernel.log", "0");
  rotateKernelLog(&total, &count, 1);
  EXPECT_EQ((Texts{"kernel.log", "kernel.log.1", "kernel.log.2", "kernel.log.4"}),
            list("/data/log"));
  EXPECT_EQ("1", read_file("/data/log/kernel.log.2"));
  EXPECT_EQ(0u, log.count("while rotating log files"));
  run("mkdir -p /data/log/kernel.log.5/full");
  total = 5119;
  rotateKernelLog(&total, &count, 1);
  EXPECT_TRUE(log.has("while rotating log files"));
  EXPECT_EQ("1", read_file("/data/log/kernel.log.3"));
}

TEST_F(Reader, NoFileOfTheSeriesLeadsOutOfIt) {
  write_file("/probe/target", "target");
  run("cd /data/log && ln -s /probe/target qsee.log && ln -s /probe/target kernel.log.1 && "
      "ln /probe/target kernel.log.3");
  write_file("/data/source", numbered(100));
  start(kQseeReader, "/data/source");
  EXPECT_EQ(1, end());
  EXPECT_TRUE(
      log.has("corvexd: Open /data/log/qsee.log Error Too many levels of symbolic links\n"));
  strcpy(kernel_logsize, "1");
  int total = 4095;
  int count = 3;
  rotateKernelLog(&total, &count, 1);
  EXPECT_EQ((Texts{"kernel.log", "kernel.log.2", "kernel.log.4", "qsee.log"}), list("/data/log"));
  EXPECT_EQ("target", read_file("/probe/target"));
  EXPECT_FALSE(is_systems("/probe/target"));
  run("mv /data/log /data/other && ln -s other /data/log && rm /data/other/kernel.log");
  EXPECT_EQ(1, status_in_child([&] { rotateKernelLog(&total, &count, 4096); }));
  EXPECT_EQ((Texts{"kernel.log.2", "kernel.log.4", "qsee.log"}), list("/data/other"));
}

TEST_F(Reader, ALostFileTakesOnlyTheWriteThatNoticedIt) {
  strcpy(kernel_logsize, "20480");
  mkfifo("/data/source", 0600);
  start(kKernelReader, "/data/source");
  int source = open("/data/source", O_WRONLY);
  auto feed = [source](const char* text) { EXPECT_GT(write(source, text, strlen(text)), 0); };
  feed("before");
  EXPECT_EVENTUALLY(read_file("/data/log/kernel.log") == "before");
  const size_t held = descriptors();
  unlink("/data/log/kernel.log");
  feed("lost");
  EXPECT_TRUE(
      log.has("corvexd: Kernel log node can not access: /data/log/kernel.log, errno: 2, No "
              "such file or directory\n"));
  feed("after");
  EXPECT_EVENTUALLY(read_file("/data/log/kernel.log") == "after");
  EXPECT_EQ(held, descriptors());
  run("rm -r /data/log");
  feed("gone");
  EXPECT_EQ(1, end());
  EXPECT_TRUE(log.has("corvexd: Open /data/log/kernel.log Error：No such file or directory\n"));
  close(source);
}

TEST_F(Reader, PreBootloaderLogIsCopiedOnceAndErased) {
  const std::string kib_1(1024, 'a');
  const std::string eof = "E/corvexd: eof, pre_bootloader log process continue \n";
  struct {
    std::string content;
    size_t copied;
    Texts lines;
  } rows[] = {
      {numbered(40 << 10), 32 << 10, {}},
      {'\0' + numbered(40 << 10), 0, {"E/reserve1 is null\n"}},
      {kib_1 + kib_1 + '\0' + kib_1, 2048, {"E/reserve1 is null\n"}},
      {numbered(5000), 5000, {eof}},
      {"", 0, {eof}},
  };
  for (const auto& row : rows) {
    write_file(kPartition, row.content);
    unlink("/data/log/pre_bootloader.log");
    log.clear();
    start(kPreBootloaderReader);
    EXPECT_EQ(1, end());
    EXPECT_EQ(row.content.substr(0, row.copied), read_file("/data/log/pre_bootloader.log"));
    std::string erased(32 << 10, '\0');
    if (row.content.size() > erased.size()) erased += row.content.substr(erased.size());
    EXPECT_EQ(erased, read_file(kPartition)) << "what lies beyond is not touched";
    EXPECT_EQ(row.lines, log.lines());
  }
  unlink(kPartition);
  ASSERT_EQ(0, symlink("/data", kPartition));
  start(kPreBootloaderReader);
  EXPECT_EQ(1, end());
  EXPECT_TRUE(log.has(std::string("corvexd: Open ") + kPartition + " Error Is a directory\n"));
}

TEST_F(Reader, BootloaderLogIsCopiedToItsEnd) {
  write_file("/data/source", numbered(3000));
  start(kBootloaderReader, "/data/source");
  EXPECT_EQ(1, end());
  EXPECT_EQ(numbered(3000), read_file("/data/log/bootloader.log"));
  EXPECT_TRUE(log.has("corvexd: eof, bootloader log process continue \n"));
  log.clear();
  start(kTzReader);
  EXPECT_EQ(1, end());
  EXPECT_EQ((Texts{"E/corvexd: tz log node can not be read: No such file or directory \n",
                   "E/corvexd: Open /proc/tzdbg/tz_log Error No such file or directory\n"}),
            log.lines());
  log.clear();
  start(kKernelReader, "/data/none");
  EXPECT_EQ(1, end());
  EXPECT_EQ(Texts{"E/corvexd: Kernel log node can not be read: No such file or directory \n"},
            log.lines());
  start(kBootloaderReader, "/data");
  EXPECT_EQ(1, end());
  EXPECT_TRUE(
      log.has("corvexd: bytes_read is -1, read bootloader log fail! Error: Is a directory "
              "\n"));
}

TEST_F(Reader, TheMachinesKernelLogIsCaptured) {
  int kernel = open("/dev/kmsg", O_WRONLY);
  if (kernel == -1 || !owners_work()) GTEST_SKIP() << "the kernel log needs root";
  switch_on({"kernel", "kernel.kmsg"});
  Daemon daemon(log);
  send_commands({"LOGBEGIN"});
  const std::string mark = "corvexd test line " + std::to_string(getpid());
  const std::string file = current_directory() + "/kernel.log";
  // The kernel may take its time to wake a reader for one line; a later line wakes it again.
  EXPECT_TRUE(eventually([&] {
    EXPECT_GT(write(kernel, mark.data(), mark.size()), 0);
    usleep(500'000);
    return read_file(file).find(";" + mark + "\n") != std::string::npos;
  }));
  close(kernel);
  EXPECT_TRUE(is_systems(file));
  send_commands({"LOGSTOP"});
}

}  // namespace
}  // namespace corvexd::test
