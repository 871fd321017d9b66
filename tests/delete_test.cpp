#include "storage/delete.h"

#include <fcntl.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <functional>
#include <string>

#include "tests/device_root.h"

namespace {

std::function<void(const std::string& name)> before_access;

}  // namespace

// The C library's, for all of this program.
extern "C" int faccessat(int folder, const char* name, int mode, int flags) noexcept {
  if (before_access) before_access(name);
  return static_cast<int>(syscall(SYS_faccessat2, folder, name, mode, flags));
}

namespace corvexd::test {
namespace {

using Delete = DeviceTest;

TEST_F(Delete, EmptiesTheRootAndNothingElse) {
  run("mkdir -p /data/corvex/KVBR_1/anr /data/corvex/KVBR_2_current/boot_log /data/outside");
  run("touch /data/corvex/KVBR_1/anr/trace '/data/corvex/-rf \n' /data/outside/kept");
  ASSERT_EQ(0, symlink("/data/outside", "/data/corvex/KVBR_1/link"));
  ASSERT_EQ(0, symlink("/data/gone", "/data/corvex/dangling"));
  EXPECT_EQ(0, deleteLog("/data/corvex/"));
  EXPECT_TRUE(list("/data/corvex").empty());
  EXPECT_TRUE(exists("/data/outside/kept"));
  EXPECT_EQ(-1, deleteLog("/data/none"));
  EXPECT_TRUE(log.has("corvexd: opendir /data/none  No such file or directory \n "));
  EXPECT_EQ(0, remove_file("/data/none")) << "gone is what was asked for";
  EXPECT_TRUE(log.has("corvexd: can't stat '/data/none' No such file or directory "));
}

TEST_F(Delete, GoesOnPastWhatCannotBeRemoved) {
  run("mkdir -p /data/corvex/a/read_only /data/corvex/b/mounted && touch /data/corvex/a/file");
  ASSERT_EQ(0, mount("x", "/data/corvex/a/read_only", "tmpfs", MS_RDONLY, nullptr));
  ASSERT_EQ(0, mount("x", "/data/corvex/b/mounted", "tmpfs", 0, nullptr));
  EXPECT_EQ(0, deleteLog("/data/corvex"));
  EXPECT_EQ((Texts{"a", "b"}), list("/data/corvex"));
  EXPECT_EQ(Texts{"read_only"}, list("/data/corvex/a"));
  EXPECT_TRUE(log.has("corvexd: descend into directory '/data/corvex/a/read_only'? "));
  EXPECT_TRUE(log.has("corvexd: can't remove '/data/corvex/a'"));
  EXPECT_TRUE(log.has("corvexd: can't remove '/data/corvex/b/mounted'"));
  EXPECT_TRUE(log.has("corvexd: can't remove '/data/corvex/b'"));
  EXPECT_EQ(-1, remove_file("/data/corvex/b"));
  EXPECT_EQ(0, remove_file("/data/corvex/a/read_only")) << "left in place is not a failure";
  umount("/data/corvex/a/read_only");
  umount("/data/corvex/b/mounted");
}

TEST_F(Delete, EmptiesLargeAndDeepTrees) {
  run("mkdir -p /data/corvex/large && cd /data/corvex/large && seq 20000 | xargs touch");
  // One-letter directories, as many as a path of 1023 characters can name; then one more.
  std::string deep = "/data/corvex/deep";
  while (deep.size() + 2 <= 1023) deep += "/d";
  run("mkdir -p " + deep);
  EXPECT_EQ(0, deleteLog("/data/corvex"));
  EXPECT_EQ(Texts{}, list("/data/corvex"));
  run("mkdir -p " + deep + "/d /data/corvex/other");
  EXPECT_EQ(-1, remove_file("/data/corvex/deep"));
  EXPECT_EQ(1u, log.count("corvexd: too long, skipped: /data/corvex/deep/d/"));
  EXPECT_EQ(0, remove_file("/data/corvex/other"));
}

// Between the look at an entry and its opening somebody puts a link in its place.
TEST_F(Delete, NobodyCanLeadTheWalkOutOfTheRoot) {
  run("mkdir -p /data/corvex/entry /data/outside && touch /data/outside/kept && "
      "ln -s /data/outside /data/link");
  int swaps = 0;
  before_access = [&](const std::string& name) {
    if (name != "entry" || ++swaps > 1) return;
    renameat2(AT_FDCWD, "/data/link", AT_FDCWD, "/data/corvex/entry", RENAME_EXCHANGE);
  };
  EXPECT_EQ(0, deleteLog("/data/corvex"));
  before_access = nullptr;
  EXPECT_EQ(1, swaps);
  EXPECT_EQ(Texts{"kept"}, list("/data/outside"));
}

}  // namespace
}  // namespace corvexd::test
