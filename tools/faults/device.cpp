#include "tools/faults/device.h"

#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <regex>

#include "tests/daemon.h"
#include "tests/device_root.h"
#include "tests/files.h"

namespace corvexd::faults {
namespace {

using test::list, test::read_file, test::run;

constexpr char kPartition[] = "/dev/block/platform/soc/624000.ufshc/by-name/reserve1";
constexpr const char* kRoots[] = {"/data/corvex", "/storage/emulated/0/corvex"};

constexpr char kDevice[] = R"sh(
rm -rf /trace /dev/block /etc/localtime
mkdir -p /data/corvex/KVBR_1--2020-01-01-00-00-00_current /data/tombstones /data/anr \
  /data/system/dropbox /data/misc/display /data/media/0/Pictures/Screenshots /data/coredump \
  /data/vendor/media /storage/emulated/0/corvex/earlier /vendor/bin /vendor/etc /cache/boot_log \
  /cache/log_before_initial /cache/recovery /cache/lkmsg /trace ${1%/*}
cd /dev/__properties__
for name in main system radio event kernel kernel.kmsg tcpdump qsee tz bootloader pre_bootloader qxdm
do printf yes > persist.sys.$name; done
printf true > persist.sys.assert.panic
printf 1 > vold.internalSD.mount
printf 1 > persist.sys.kernel.logsize
printf 3 > /data/.layout_version
head -c 40960 /dev/zero | tr '\0' r > $1
for file in /cache/boot_log/android_boot.log /cache/boot_log/kernel_boot.log.1 \
  /cache/recovery/last_log /cache/lkmsg/lkmsg \
  /data/corvex/KVBR_1--2020-01-01-00-00-00_current/old /cache/fileBefore911 /data/anr/earlier \
  /data/system/dropbox/earlier /storage/emulated/0/corvex/earlier/file; do
  printf 'end of the artefact' > $file
done
truncate -s 16M /cache/log_before_initial/android_initial.log.4
echo '/dev/data /data ext4 noatime wait,check' > /vendor/etc/fstab.qcom
cat > /system/bin/logcat <<'SH'
#!/bin/sh
[ "$1" = -c ] && exit 0
touch -d @1 "$2" # old enough for the watch over the log daemon to act
exec sleep 1000
SH
cat > /system/bin/getprop <<'SH'
#!/bin/sh
echo properties
SH
printf '#!/bin/sh\nexec sleep 1000\n' > /system/xbin/tcpdump
for name in /system/bin/dumpsys /system/bin/bugreport /vendor/bin/pktlogconf /vendor/bin/iwpriv; do
  cp /system/bin/getprop $name
done
chmod 755 /system/bin/* /system/xbin/* /vendor/bin/*
)sh";

// What is ours or the daemon's. What sets properties leaves a draft behind when the daemon ends in
// the middle of a request.
const std::regex kNotWatched(
    "/(usr|build|proc|real_proc|trace|probe|nodes|dev/(socket|__properties__|draft|block/.*/"
    "reserve1)|data/"
    "corvex|"
    "etc/localtime|data/anr/anr_late_|data/tombstones/tombstone_late_|storage/emulated/0/corvex|"
    "cache/(boot_log|log_before_initial)).*");

bool ends_with(const std::string& text, const std::string& end) {
  return text.size() >= end.size() && text.compare(text.size() - end.size(), end.size(), end) == 0;
}

}  // namespace

const std::string kArtefactStart(2500, 'a');
const std::string kArtefactEnd = "end of the artefact";

void make_device() {
  test::make_empty_device();
  test::write_file("/device.sh", kDevice);
  run(std::string("sh /device.sh ") + kPartition);
  unlink("/device.sh");
  test::make_nodes(kProgram);
}

// Its first 32 KiB are zeroed, block after block; the rest is nobody's business.
bool partition_is_sound() {
  const std::string content = read_file(kPartition);
  const size_t zeros = std::min(content.find_first_not_of('\0'), content.size());
  return content.size() == 40960 && zeros <= 32768 && zeros % 1024 == 0 &&
         content.find_first_not_of('r', zeros) == std::string::npos;
}

void look_at(const std::string& path, Files& files, bool all) {
  struct stat status;
  if ((!all && std::regex_match(path, kNotWatched)) || lstat(path.c_str(), &status) != 0) return;
  const bool is_folder = S_ISDIR(status.st_mode);
  std::string& facts = files[is_folder ? path + "/" : path];
  facts = "mode " + std::to_string(status.st_mode) + " owner " + std::to_string(status.st_uid) +
          ":" + std::to_string(status.st_gid);
  if (S_ISREG(status.st_mode)) facts += " content " + read_file(path);
  if (!is_folder) return;
  for (const std::string& name : list(path))
    look_at((path == "/" ? "" : path) + "/" + name, files, all);
}

void compare(const Files& before, const Files& after, std::vector<std::string>& problems) {
  for (const auto& [path, facts] : before) {
    auto found = after.find(path);
    if (found == after.end() || found->second != facts)
      problems.push_back((found == after.end() ? "removed: " : "changed: ") + path);
  }
  for (const auto& [path, facts] : after) {
    if (before.count(path) != 0) continue;
    problems.push_back("made: " + path);
    run("rm -rf '" + path + "'");  // for the next life
  }
}

Files read_logs() {
  static const std::regex mark("_current");
  Files found, logs;
  for (const char* root : kRoots) look_at(root, found, true);
  for (auto& [path, facts] : found) logs[std::regex_replace(path, mark, "")] = facts;
  return logs;
}

std::vector<std::string> marked_directories() {
  std::vector<std::string> marked;
  for (const std::string& name : list(kRoots[0])) {
    if (name.find("_current") != std::string::npos) marked.push_back(kRoots[0] + ("/" + name));
  }
  return marked;
}

void count_logs(const Files& logs, Achievements& achieved) {
  static const std::regex directory("/data/corvex/KVBR_[0-9]+--");
  static const std::regex time("[0-9]{4}(-[0-9]{1,2}){5}"), number("[0-9]+");
  for (const auto& [path, facts] : logs) {
    // Recorders and their copying begin together; which is first is chance. And a marker is no log.
    if (path.find("/log_before_initial/") != std::string::npos) continue;
    if (ends_with(path, "/.nomedia")) continue;
    std::string name = std::regex_replace(path, directory, "LOGS/");
    name = std::regex_replace(std::regex_replace(name, time, "TIME"), number, "#");
    ++achieved[name];
    if (!ends_with(facts, " content ")) ++achieved[name + " not empty"];
    if (ends_with(facts, kArtefactEnd)) ++achieved[name + " whole"];
  }
}

}  // namespace corvexd::faults
