#include "fs_mgr/fs_mgr_fstab.h"

#include <android-base/properties.h>
#include <stdio_ext.h>
#include <stdlib.h>
#include <sys/mount.h>
#include <sys/resource.h>
#include <unistd.h>

#include <functional>
#include <memory>
#include <sstream>
#include <utility>

#include "fs_mgr/fs_mgr_boot_config.h"
#include "tests/device_root.h"

namespace {

std::function<bool()> before_rewind;  // false: it fails

}  // namespace

// The C library's, for all of this program.
extern "C" int fseeko(FILE* file, off_t offset, int whence) {
  if (before_rewind) {
    __fpurge(file);  // what it holds of the content before
    if (!before_rewind()) return -1;
  }
  return fseeko64(file, offset, whence);
}

namespace corvexd::test {
namespace {

using Table = std::unique_ptr<fstab, decltype(&fs_mgr_free_fstab)>;

class Fstab : public DeviceTest {
 protected:
  Table read(const std::string& content) {
    write_file("/data/fstab", content);
    return {fs_mgr_read_fstab("/data/fstab"), fs_mgr_free_fstab};
  }
};

TEST_F(Fstab, EntriesAreRecords) {
  Table table = read(
      "# comment\n \t\r\n   # another\n"
      "/dev/block/by-name/userdata /data ext4 "
      "noatime,nosuid,nodev,barrier=1,,noauto_da_alloc wait,check,forceencrypt=footer\textra # x\n"
      "/dev/b\t \t/data/b vfat ro,unbindable,roomy,private voldmanaged=sdcard1:auto,notrim\r\n"
      "\xff\xfe /c swap defaults defaults");
  ASSERT_NE(nullptr, table);
  EXPECT_EQ(3, table->entry_count);
  EXPECT_STREQ("/data/fstab", table->source_path);
  const fstab_entry& data = table->entries[0];
  EXPECT_STREQ("/dev/block/by-name/userdata", data.mount_source);
  EXPECT_STREQ("ext4", data.fs_type);
  EXPECT_EQ(0x406u, data.mount_flags);
  EXPECT_STREQ("barrier=1,noauto_da_alloc", data.mount_options);
  EXPECT_EQ(0x403, data.fs_mgr_flags);
  EXPECT_STREQ("footer", data.key_location);
  EXPECT_EQ(-1, data.partition_number);
  EXPECT_EQ(-1, data.swap_priority);
  const fstab_entry& card = table->entries[1];
  EXPECT_EQ(0x60001u, card.mount_flags) << "a keyword is a prefix: roomy is ro";
  EXPECT_EQ(nullptr, card.mount_options);
  EXPECT_STREQ("sdcard1", card.label);
  EXPECT_EQ(0x1010, card.fs_mgr_flags);
  EXPECT_STREQ("\xff\xfe", table->entries[2].mount_source);

  EXPECT_EQ(&table->entries[0], fs_mgr_get_entry_for_mount_point(table.get(), "/data"));
  EXPECT_EQ(&table->entries[0], fs_mgr_get_entry_for_mount_point(table.get(), "/data/b"));
  EXPECT_EQ(nullptr, fs_mgr_get_entry_for_mount_point(table.get(), "/datax"));
  EXPECT_EQ(nullptr, fs_mgr_get_entry_for_mount_point(nullptr, "/data"));

  const std::string half(500, 'h'), unfit(1024 - 500 - 2, 'u');
  table = read("/dev/a /a ext4 " + half + "," + unfit + ",x=1 wait");
  EXPECT_EQ(half + ",x=1", table->entries[0].mount_options) << "options are kept whole";
}

// What an entry's fifth field has set, each thing behind a blank.
std::string parameters(const fstab_entry& e) {
  std::ostringstream text;
  text << std::hex << "0x" << e.fs_mgr_flags << std::dec;
  auto show = [&text](const char* name, auto value) {
    if (value) text << " " << name << ":" << value;
  };
  show("key", e.key_location);
  show("directory", e.key_directory);
  show("verity", e.verity_location);
  show("label", e.label);
  show("length", e.length);
  show("partition", e.partition_number + 1);
  show("swap", e.swap_priority + 1);
  show("streams", e.max_comp_streams);
  show("zram", e.zram_size);
  show("reserved", e.reserved_size);
  show("contents", e.file_contents_mode);
  show("names", e.file_names_mode);
  show("erase", e.erase_block_size);
  show("logical", e.logical_block_size);
  return text.str();
}

TEST_F(Fstab, OptionsSetTheirParameters) {
  const uint64_t memory = static_cast<uint64_t>(sysconf(_SC_PHYS_PAGES)) * 50 / 100 *
                          static_cast<uint64_t>(sysconf(_SC_PAGESIZE));
  const std::pair<const char*, std::string> rows[] = {
      {"encryptable=footer", "0x4 key:footer"},
      {"forceencrypt=a,forceencrypt=b=c", "0x400 key:b=c"},
      {"forcefdeorfbe=/m", "0x10000 key:/m contents:1 names:3"},
      {"fileencryption=ice", "0x2000 contents:2 names:3"},
      {"fileencryption=aes-256-xts:aes-256-heh", "0x2000 contents:1 names:4"},
      {"fileencryption=foo", "0x2000 names:3"},
      {"fileencryption=software:bar", "0x2000 contents:1"},
      {"verifyatboot,verify,encryptable", "0x80200"},
      {"verify=/v,keydirectory=/k", "0x4000200 directory:/k verity:/v"},
      {"voldmanaged=sdcard1", "0x10"},
      {"voldmanaged=l:010", "0x10 label:l partition:9"},
      {"length=-0x10", "0x20 length:-16"},
      {"length=99999999999999999999", "0x20 length:9223372036854775807"},
      {"swapprio=-5,max_comp_streams=0x4", "0x100080 swap:-4 streams:4"},
      {"zramsize=1048576", "0x100 zram:1048576"},
      {"zramsize=50%", "0x100 zram:" + std::to_string(static_cast<uint32_t>(memory))},
      {"reservedsize=128M", "0x200000 reserved:134217728"},
      {"reservedsize=7kM", "0x200000 reserved:7168"},
      {"reservedsize=3K", "0x200000 reserved:3072"},
      {"reservedsize=2m", "0x200000 reserved:2097152"},
      {"reservedsize=1G", "0x200000 reserved:1073741824"},
      {"reservedsize=5g", "0x200000 reserved:5368709120"},
      {"reservedsize=9T", "0x200000 reserved:9"},
      {"reservedsize=0x10", "0x200000"},
      {"eraseblk=0x1000,logicalblk=8192", "0x1800000 erase:4096 logical:8192"},
      {"eraseblk=2048,logicalblk=4097", "0x1800000"},
  };
  for (const auto& [options, expected] : rows) {
    Table table = read("/dev/a /a ext4 ro " + std::string(options));
    ASSERT_NE(nullptr, table);
    EXPECT_EQ(expected, parameters(table->entries[0])) << options;
  }
  EXPECT_EQ((Texts{"[libfs_mgr]Unknown file contents encryption mode: foo",
                   "[libfs_mgr]Unknown file names encryption mode: bar",
                   "[libfs_mgr]Warning: unknown flag encryptable",
                   "[libfs_mgr]Warning: voldmanaged= flag malformed"}),
            log.texts());
}

TEST_F(Fstab, WhatIsNoTableIsRefusedWithItsReason) {
  const std::string kReading = "[libfs_mgr]fs_mgr_read_fstab(): ";
  const std::pair<const char*, const char*> rows[] = {
      {"# nothing\n\n", "[libfs_mgr]No entries found in fstab"},
      {" x", "[libfs_mgr]Error parsing mount_point"},
      {"a b c d wait\n\fa b", "[libfs_mgr]Error parsing fs_type"},
      {"a b c", "[libfs_mgr]Error parsing mount_flags"},
      {"a b c ro,x=1 \n", "[libfs_mgr]Error parsing fs_mgr_options"},
      {"a b c d slotselect", "[libfs_mgr]Error updating for slotselect"},
  };
  for (const auto& [content, line] : rows) {
    log.clear();
    EXPECT_EQ(nullptr, read(content)) << content;
    EXPECT_EQ((Texts{line, kReading + "failed to load fstab from : '/data/fstab'"}), log.texts());
  }
  const size_t open_files = list("/proc/self/fd").size();
  EXPECT_EQ(nullptr, fs_mgr_read_fstab("/data/none"));
  EXPECT_EQ(nullptr, read("a b"));
  EXPECT_NE(nullptr, read("a b c d e"));
  EXPECT_EQ(open_files, list("/proc/self/fd").size());
  EXPECT_TRUE(log.has(kReading + "cannot open file: '/data/none': No such file or directory"));
}

TEST_F(Fstab, ASourceThatChangesIsNoTableUnlessItGrows) {
  const std::string one = "/dev/a /a ext4 ro wait\n", two = one + "/dev/b /b ext4 ro wait\n";
  const struct {
    std::string counted, parsed;
    int entries;
  } rows[] = {{one, two + two, 1}, {two, one, 0}, {one, "", 0}};
  for (const auto& row : rows) {
    before_rewind = [&] {
      write_file("/data/fstab", row.parsed);
      return true;
    };
    const Table table = read(row.counted);
    EXPECT_EQ(row.entries, table == nullptr ? 0 : table->entry_count) << row.parsed;
  }
  EXPECT_EQ(1u, log.count("[libfs_mgr]Tried to process more entries than counted"));
  before_rewind = [] { return false; };
  EXPECT_EQ(nullptr, read(one));
  before_rewind = nullptr;
}

// There is memory for the line, but not for a copy of its longest field, which is larger than what
// the C library may still hold in reserve.
TEST_F(Fstab, LackOfMemoryIsNoTable) {
#ifdef CORVEX_NOISY_MEMORY
  GTEST_SKIP() << "A sanitizer or an emulator takes memory of its own.";
#endif
  constexpr rlim_t kField = 70 << 20, kLine = 126 << 20;
  const std::pair<const char*, const char*> rows[] = {
      {"/dev/a ", " ext4 ro wait\n"},
      {"/dev/a /a ext4 ro verify=", "\n"},
      {"/dev/a /a ext4 ro voldmanaged=", ":1\n"},
      {"/dev/a /a ext4 ro fileencryption=", ":x\n"},
  };
  for (const auto& [start, end] : rows) {
    write_file("/data/fstab", start + std::string(kField, 'x') + end);
    EXPECT_EQ(0, status_in_child([] {
                const long pages = atol(read_file("/proc/self/statm").c_str());
                const rlim_t used = pages * sysconf(_SC_PAGESIZE);
                const struct rlimit memory = {used + kLine + kField / 2, RLIM_INFINITY};
                setrlimit(RLIMIT_AS, &memory);
                _exit(fs_mgr_read_fstab("/data/fstab") == nullptr ? 0 : 1);
              }))
        << start;
  }
}

class BootConfig : public DeviceTest {
 protected:
  BootConfig() {
    write_file("/data/cmdline", "");
    EXPECT_EQ(0, mount("/data/cmdline", "/proc/cmdline", nullptr, MS_BIND, nullptr));
    run("mkdir -p /data/dt");
  }
  ~BootConfig() override { umount2("/proc/cmdline", MNT_DETACH); }

  void set_device_tree(const std::string& compatible, const std::string& slot) {
    write_file("/data/dt/compatible", compatible);
    write_file("/data/dt/slot", slot);
  }
};

// The suffix as a fresh process finds it: the device-tree directory is found out only once.
std::string suffix_of(const std::string& command_line) {
  write_file("/data/cmdline", command_line);
  EXPECT_EQ(0, status_in_child([] { write_file("/data/suffix", fs_mgr_get_slot_suffix()); }));
  return read_file("/data/suffix");
}

TEST_F(BootConfig, TheFirstSourceThatKnowsWins) {
  const std::string dt = " androidboot.android_dt_dir=/data/dt";
  EXPECT_EQ("", suffix_of("quiet androidboot.slotx=c androidboot.slot androidboot.slot=a=b"));
  EXPECT_EQ("_a", suffix_of("x  androidboot.slot_suffix=_a\n"));
  EXPECT_EQ("_b",
            suffix_of("androidboot.slot_suffix=_a   androidboot.slot=b androidboot.slot=c\n"));
  set_device_tree(std::string("android,firmware\0", 17), std::string("d\0", 2));
  EXPECT_EQ("_d", suffix_of("x" + dt));
  EXPECT_EQ("_d", suffix_of("androidboot.slot=" + dt)) << "empty is no answer";
  EXPECT_EQ("_b", suffix_of("androidboot.slot=b" + dt));
  set_device_tree("android,firmware", std::string("d\0", 2));
  EXPECT_EQ("", suffix_of("x" + dt));
  set_device_tree(std::string("android,firmware\0", 17), "");
  EXPECT_EQ("", suffix_of("x" + dt));
  android::base::SetProperty("ro.boot.slot", "p");
  EXPECT_EQ("_p", suffix_of("androidboot.slot=b"));
}

TEST_F(BootConfig, SlotsAreAppendedToTheSourcesThatAskForThem) {
  write_file("/data/cmdline", "androidboot.slot=a\n");
  write_file("/data/fstab", "/dev/s /s ext4 ro slotselect,verify\n/dev/d /d ext4 ro wait\n");
  Table table(fs_mgr_read_fstab("/data/fstab"), fs_mgr_free_fstab);
  ASSERT_NE(nullptr, table);
  EXPECT_STREQ("/dev/s_a", table->entries[0].mount_source);
  EXPECT_STREQ("/dev/d", table->entries[1].mount_source);
}

}  // namespace
}  // namespace corvexd::test
