#include "storage/copy.h"

#include <fcntl.h>
#include <signal.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <sys/time.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <thread>

#include "core/state.h"
#include "storage/earlier_logs.h"
#include "tests/device_root.h"

namespace corvexd::test {
namespace {

class Copy : public DeviceTest {
 protected:
  Copy() {
    run("mkdir -p /data/log /data/from");
    LOG_DIR.set(Path().append("/data/log"));
  }
};

TEST_F(Copy, AppendsWithTheFilesMode) {
  std::string content(3000, 'a');
  content += '\0';
  write_file("/data/from/a", content);
  EXPECT_EQ(1, copy_file("/data/from/a", "/data/log/a"));
  EXPECT_EQ(1, copy_file("/data/from/a", "/data/log/a"));
  EXPECT_EQ(content + content, read_file("/data/log/a"));
  EXPECT_EQ(0644u, mode_of("/data/log/a")) << "whatever the umask";
  EXPECT_EQ(077u, umask(077)) << "the umask is the children's too";
  EXPECT_EQ(owners_work(), is_systems("/data/log/a"));
}

TEST_F(Copy, SaysWhatCouldNotBeOpened) {
  EXPECT_EQ(-1, copy_file("/data/from/none", "/data/log/b"));
  EXPECT_TRUE(log.has("corvexd: open file failure. /data/from/none"));
  EXPECT_EQ("", read_file("/data/log/b"));
  EXPECT_TRUE(exists("/data/log/b")) << "the destination is opened before the source is judged";
  EXPECT_EQ(-1, copy_file("/data/log/b", "/data/log"));
  EXPECT_TRUE(log.has("corvexd: open file failure. /data/log"));
  EXPECT_EQ(-1, copy_file("/data/none", "/none/c"));
  EXPECT_TRUE(log.has("corvexd: open file failure. /data/none, /none/c"));
}

TEST_F(Copy, NeitherAFifoNorAFullDiskHoldsItUp) {
  mkfifo("/data/from/fifo", 0600);
  EXPECT_EQ(1, copy_file("/data/from/fifo", "/data/log/fifo"));
  int both_ends = open("/data/from/fifo", O_RDWR);
  ASSERT_EQ(4, write(both_ends, "text", 4));
  EXPECT_EQ(1, copy_file("/data/from/fifo", "/data/log/fifo"));
  EXPECT_EQ("text", read_file("/data/log/fifo"));
  // One that is filled up as fast as it is read has no end.
  std::atomic<bool> done{false};
  std::thread feeder([&] {
    const std::string page(4096, 'f');
    while (!done) write(both_ends, page.data(), page.size());
  });
  usleep(20'000);
  signal(SIGALRM, [](int) { usleep(1000); });  // the one who copies is the slower
  const struct itimerval often = {{0, 100}, {0, 100}}, never = {};
  setitimer(ITIMER_REAL, &often, nullptr);
  EXPECT_EQ(1, copy_file("/data/from/fifo", "/data/log/endless"));
  setitimer(ITIMER_REAL, &never, nullptr);
  EXPECT_LE(read_file("/data/log/endless").size(), 65536u) << "what it held";
  done = true;
  fcntl(both_ends, F_SETFL, O_NONBLOCK);
  read_to_end(both_ends);  // the feeder may be waiting for room
  feeder.join();
  close(both_ends);
  mkfifo("/data/log/sink", 0600);
  EXPECT_EQ(-1, copy_file("/data/log/fifo", "/data/log/sink"));
  run("mkdir /data/log/full");
  ASSERT_EQ(0, mount("full", "/data/log/full", "tmpfs", 0, "nr_blocks=1"));
  write_file("/data/from/large", std::string(8192, 'x'));
  EXPECT_EQ(1, copy_file("/data/from/large", "/data/log/full/copy")) << "only the copy is lost";
  umount("/data/log/full");
}

TEST_F(Copy, LinksOfOthersLeadNowhere) {
  write_file("/probe/secret", "secret");
  run("cd /data/from && ln -s /probe/secret own && ln -s /probe/secret others && "
      "ln -s others through_others && ln -s ../../data/from/own through_own && "
      "ln -s /dev/zero device && echo secret > /probe/linked && ln /probe/linked second_name && "
      "echo plain > plain");
  if (!owners_work()) run("rm /data/from/*others");
  lchown("/data/from/others", 10001, 10001);
  run("ln -s /probe/secret /data/log/link");
  copy_folder("/data/from/", "/sub/");
  EXPECT_EQ("secret", read_file("/data/log/sub/own"));
  EXPECT_EQ("plain\n", read_file("/data/log/sub/plain"));
  EXPECT_EQ("secret", read_file("/data/log/sub/through_own"));
  for (const char* name : {"others", "through_others", "second_name"}) {
    EXPECT_EQ("", read_file(std::string("/data/log/sub/") + name)) << name;
  }
  EXPECT_EQ("", read_file("/data/log/sub/device")) << "a device has no end";
  EXPECT_TRUE(log.has("corvexd: open file failure. /data/from/device"));
  EXPECT_EQ(owners_work(), log.count("open file failure. /data/from/others") == 1);
  EXPECT_EQ(-1, copy_file("/data/from/plain", "/data/log/link"));
  EXPECT_EQ(-1, copy_file("/data/from/plain", "/dev/full"));
  EXPECT_EQ("secret", read_file("/probe/secret"));

  run("rm -r /data/log/sub && ln -s /probe /data/log/sub && ln -s /data/from /cache/recovery");
  log.clear();
  copy_folder("/data/from/", "/sub/");
  EXPECT_TRUE(log.has("corvexd: fail to mkdir"));
  copy_folder("/cache/recovery/", "/recovery/");
  EXPECT_FALSE(exists("/probe/plain") || exists("/data/log/recovery"));
}

TEST_F(Copy, FolderTakesEveryPlainFileWhateverItsName) {
  const Texts names = {" blank ", "-rf", "line\nend", std::string(180, 'n')};
  for (const std::string& name : names) write_file("/data/from/" + name, name);
  run("mkdir /data/from/dir && echo x > /data/from/dir/x");
  run("cd /data/from && ln -s dir link_to_dir && ln -s ' blank ' link_to_file && ln -s gone dead");
  write_file("/data/from/" + std::string(255, 'z'), "does not fit");
  std::string folder = "/data/from/";
  copy_folder(folder.data(), "/sub/");
  Texts expected = names;
  expected.push_back("link_to_file");
  std::sort(expected.begin(), expected.end());
  EXPECT_EQ(expected, list("/data/log/sub"));
  for (const std::string& name : names) EXPECT_EQ(name, read_file("/data/log/sub/" + name));
  EXPECT_EQ(0777u, mode_of("/data/log/sub"));
  EXPECT_TRUE(log.has("corvexd : copy folder /data/from/ : /sub/"));
  EXPECT_EQ(1u, log.count("too long"));
  EXPECT_EQ(owners_work(), is_systems("/data/log/sub"));

  copy_folder("/data/none/", "/other/");
  EXPECT_EQ(Texts{"sub"}, list("/data/log"));
  LOG_DIR.set(Path().append("/data/gone"));
  copy_folder(folder.data(), "/sub/");
  EXPECT_TRUE(log.has("corvexd: fail to mkdir"));
}

TEST_F(Copy, EarlierLogsLandInTheirFolders) {
  const char* rows[][3] = {
      {"/cache/log_before_initial/android_initial.log", "initial",
       "/data/log/log_before_initial/android_initial.log"},
      {"/cache/lkmsg/last", "kernel", "/data/log/kmsg/last"},
      {"/cache/recovery/last", "recovery", "/data/log/recovery/last"},
      {"/data/anr/trace", "trace", "/data/log/anr/trace"},
      {"/data/system/dropbox/entry", "entry", "/data/log/anr/entry"},
  };
  for (const auto& [from, content, to] : rows) {
    run(std::string("mkdir -p $(dirname ") + from + ")");
    write_file(from, content);
  }
  copy_file_already_exist(nullptr);
  for (const auto& [from, content, to] : rows) EXPECT_EQ(content, read_file(to)) << from;
  EXPECT_EQ((Texts{"anr", "kmsg", "log_before_initial", "recovery"}), list("/data/log"));
}

}  // namespace
}  // namespace corvexd::test
