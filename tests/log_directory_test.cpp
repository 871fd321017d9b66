#include "storage/log_directory.h"

#include <fnmatch.h>
#include <sys/mount.h>

#include "core/state.h"
#include "storage/capture_paths.h"
#include "storage/delete.h"
#include "storage/mkdirs.h"
#include "tests/device_root.h"

namespace corvexd::test {
namespace {

class LogDirectory : public DeviceTest {
 protected:
  LogDirectory() {
    checkLogPath();
    log.clear();
  }
};

TEST_F(LogDirectory, IsNumberedMarkedAndFilled) {
  set_property("ro.build.ota.versionname", "A.B.C");
  write_file("/cache/fileAfter911", "after");
  write_file("/cache/fileBefore911", "before");
  run("rmdir /data/corvex");
  EXPECT_EQ(0, createLogDirectory());
  const std::string first = LOG_DIR.get().c_str();
  const char* pattern =
      "/data/corvex/KVBR_1--20[0-9][0-9]-[01][0-9]-[0-3][0-9]-[0-2][0-9]-"
      "[0-5][0-9]-[0-6][0-9]_current";
  EXPECT_EQ(0, fnmatch(pattern, first.c_str(), 0)) << first;
  EXPECT_EQ((Texts{"boot_log", "fileAfter911", "fileBefore911", "versionNumber"}), list(first));
  EXPECT_EQ("A.B.C" + std::string(87, '\0'), read_file(first + "/versionNumber"));
  EXPECT_EQ("after", read_file(first + "/fileAfter911"));
  EXPECT_EQ("before", read_file(first + "/fileBefore911"));
  EXPECT_EQ(0600u, mode_of(first + "/versionNumber"));
  for (const std::string& path : {std::string("/data/corvex"), first, first + "/boot_log"}) {
    EXPECT_EQ(0755u, mode_of(path)) << path;
    EXPECT_EQ(owners_work(), is_systems(path)) << path;
  }
  EXPECT_EQ(owners_work(), is_systems(first + "/versionNumber"));
  const std::string made = "I/corvexd: Log Directory created successfully, path is ";
  EXPECT_EQ(
      (Texts{"E/corvexd: pdir is null! \n", "I/corvexd: log dir is " + first + " \n",
             made + "/data/corvex \n", made + first + " \n",
             "I/corvexd: vn is " + first + "/versionNumber \n",
             "E/corvexd: copy_file /cache/fileAfter911 '" + first + "/fileAfter911'",
             "E/corvexd: copy_file '" + first + "/fileAfter911'",
             "E/corvexd: copy_file /cache/fileBefore911 '" + first + "/fileBefore911'",
             "E/corvexd: copy_file '" + first + "/fileBefore911'", made + first + "/boot_log \n"}),
      log.lines({"fail to chown"}))
      << "but what is said without root";

  makeLogAbsolutePath();
  EXPECT_EQ(first + "/tcpdump", tcpdump_path.get().c_str());
  EXPECT_EQ(first + "/pre_bootloader.log", pre_bootloader_log_path.get().c_str());

  write_file("/data/corvex/KVBR_file", "");
  run("mkdir /data/corvex/my_KVBR_x");
  EXPECT_EQ(0, createLogDirectory());
  EXPECT_TRUE(log.has("corvexd: dir count is 3 \n"));
  EXPECT_EQ(0u, std::string(LOG_DIR.get().c_str()).find("/data/corvex/KVBR_3--"));
  EXPECT_STREQ((first + "/radio.log").c_str(), radio_log_path.get().c_str());
}

TEST_F(LogDirectory, EveryDirectoryLosesTheMark) {
  const std::string unfit = std::string(200, 'u') + "_current";
  run("cd /data/corvex && mkdir -p a_current './-b \n_current' c_currentABCD d_current d/full "
      "other " +
      unfit + " && touch file_current");
  renameLastDirectoryName();
  EXPECT_EQ((Texts{"-b \n", "a", "c_cur", "d", "d_current", "file_current", "other", unfit}),
            list("/data/corvex"));
  for (const char* line :
       {"corvexd: DIR NAME : other \n", "corvexd: NEW IS /data/corvex/a \n",
        "corvexd: OLD IS /data/corvex/a_current \n", "corvexd: NEW PATH IS /data/corvex/a\n",
        "corvexd: Rename failed! Error: Directory not empty\n"}) {
    EXPECT_TRUE(log.has(line)) << line;
  }
  EXPECT_EQ(3u, log.count("RENAME SUCCESSFULL!"));
  EXPECT_EQ(1u, log.count("too long"));
  run("rm -r /data/corvex");
  renameLastDirectoryName();
  EXPECT_TRUE(log.has("corvexd: Error: No such file or directory\n"));
}

TEST_F(LogDirectory, TheProcessEndsWhenItCannotBeUsed) {
  run("rmdir /data/corvex && touch /data/corvex");
  EXPECT_EQ(1, status_in_child(createLogDirectory));
  EXPECT_EQ(1u, log.count("corvexd: Directory create failed! Error: Not a directory\n"));
  EXPECT_EQ(1u, log.count("/versionNumber Error：Not a directory\n"));

  run("rm /data/corvex && mkdir /data/corvex");
  ASSERT_EQ(0, mount("full", "/data/corvex", "tmpfs", 0, "nr_blocks=1"));
  write_file("/data/corvex/filler", std::string(4096, 'f'));
  EXPECT_EQ(1, status_in_child(createLogDirectory));
  EXPECT_TRUE(
      log.has("corvexd: bytes_write is -1, versionNumber is existing now! Error: No space "
              "left on device \n"));
  EXPECT_EQ(Texts{"filler"}, list("/data/corvex")) << "or a full disk would fill with directories";
  umount("/data/corvex");
}

// A link is not the root that it leads to, whoever made it.
TEST_F(LogDirectory, NothingIsDoneInARootThatIsALink) {
  run("mkdir -p /data/elsewhere/KVBR_1_current && rmdir /data/corvex && "
      "ln -s elsewhere /data/corvex");
  renameLastDirectoryName();
  EXPECT_EQ(1, status_in_child(createLogDirectory));
  EXPECT_TRUE(log.has("corvexd: pdir is null! \n"));
  EXPECT_EQ(1u, log.count("/versionNumber Error：Not a directory\n"));
  EXPECT_EQ(-1, deleteLog("/data/corvex"));
  EXPECT_TRUE(log.has("corvexd: opendir /data/corvex  Not a directory \n "));
  EXPECT_EQ(-1, deleteLog("/data/corvex/"));
  EXPECT_EQ(-1, mkdirs("/data/corvex/new/directory"));
  EXPECT_EQ(Texts{"KVBR_1_current"}, list("/data/elsewhere"));
  EXPECT_FALSE(is_systems("/data/elsewhere"));
}

TEST_F(LogDirectory, MkdirsMakesWhatIsMissing) {
  EXPECT_EQ(0, mkdirs(""));
  EXPECT_EQ(0, mkdirs("/data/one/two/three"));
  EXPECT_EQ(0, mkdirs("/data/one/four/"));
  EXPECT_EQ(0, mkdirs("/data/one/two/three"));
  EXPECT_EQ((Texts{"four", "two"}), list("/data/one"));
  EXPECT_EQ(4u, log.count("created successfully"));
  write_file("/data/one/file", "");
  EXPECT_EQ(-1, mkdirs("/data/one/file/below"));
  EXPECT_EQ(0, mkdirs("/data/one/file")) << "what exists is left as it is";
  EXPECT_EQ(-1, mkdirs(("/data/one/new/file/" + std::string(300, 'x') + "/y").c_str()));
  EXPECT_TRUE(exists("/data/one/new/file")) << "what was made before a failure stays";
  EXPECT_EQ(-1, mkdirs(("/data/" + std::string(506, 'x')).c_str()));
}

}  // namespace
}  // namespace corvexd::test
