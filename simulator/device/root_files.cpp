#include "simulator/device/root_files.h"

#include <android-base/file.h>
#include <android-base/unique_fd.h>
#include <errno.h>
#include <fcntl.h>
#include <stdio.h>
#include <string.h>
#include <sys/sendfile.h>
#include <sys/stat.h>
#include <unistd.h>

using android::base::unique_fd;

namespace corvexd::sim {
namespace {

constexpr uid_t kRoot = 0;
constexpr uid_t kSystem = 1000;
constexpr uid_t kShell = 2000;
constexpr uid_t kMedia = 1023;

// Paths are relative to the device's root.
constexpr struct {
  const char* path;
  mode_t mode;
  uid_t owner;  // and group
} kDirectories[] = {
    {"proc", 0755, kRoot},
    {"sys", 0755, kRoot},
    {"dev", 0755, kRoot},
    {"usr", 0755, kRoot},
    {"etc", 0755, kRoot},
    {"system", 0755, kRoot},
    {"system/bin", 0755, kRoot},
    {"system/xbin", 0755, kRoot},
    {"vendor", 0755, kRoot},
    {"vendor/bin", 0755, kRoot},
    {"vendor/etc", 0755, kRoot},
    {"cache", 0770, kSystem},
    {"cache/recovery", 0770, kSystem},
    {"data", 0771, kSystem},
    {"data/anr", 0775, kSystem},
    {"data/coredump", 0771, kSystem},
    {"data/local", 0751, kRoot},
    {"data/local/tmp", 0771, kShell},
    {"data/media", 0770, kMedia},
    {"data/media/0", 0770, kMedia},
    {"data/media/0/Pictures", 0770, kMedia},
    {"data/media/0/Pictures/Screenshots", 0770, kMedia},
    {"data/misc", 01771, kSystem},
    {"data/misc/display", 0770, kSystem},
    {"data/system", 0775, kSystem},
    {"data/system/dropbox", 0700, kSystem},
    {"data/tombstones", 0771, kSystem},
    {"data/vendor", 0771, kSystem},
    {"data/vendor/media", 0770, kMedia},
    {"storage", 0755, kRoot},
    {"storage/emulated", 0755, kRoot},
    {"storage/emulated/0", 0777, kRoot},
};

constexpr struct {
  const char* path;
  const char* text;
} kFiles[] = {
    {"etc/passwd",
     "root:x:0:0::/data:/system/bin/sh\n"
     "system:x:1000:1000::/data:/system/bin/sh\n"
     "radio:x:1001:1001::/data:/system/bin/sh\n"
     "log:x:1007:1007::/data:/system/bin/sh\n"
     "media_rw:x:1023:1023::/data:/system/bin/sh\n"
     "shell:x:2000:2000::/data:/system/bin/sh\n"},
    {"etc/group",
     "root:x:0:\nsystem:x:1000:\nradio:x:1001:\nlog:x:1007:\nsdcard_rw:x:1015:\n"
     "media_rw:x:1023:\nshell:x:2000:\ncache:x:2001:\n"},
    {"etc/nsswitch.conf", "passwd: files\ngroup: files\nhosts: files\n"},
    {"etc/hosts", "127.0.0.1 localhost\n::1 localhost\n"},
    {"cache/recovery/last_log", "Starting recovery on a simulated device\n"},
};

constexpr struct {
  const char* from;  // in the build folder, or absolute
  const char* to;
} kPrograms[] = {
    {"corvexd", "system/bin/corvexd"},
    {"client/corvexctl", "system/bin/corvexctl"},
    {"simulator/corvex-init", "init"},
    {"simulator/logd", "system/bin/logd"},
    {"simulator/corvex-toolbox", "system/bin/corvex-toolbox"},
    {"simulator/programs/bugreport", "system/bin/bugreport"},
    {"simulator/programs/dumpsys", "system/bin/dumpsys"},
    {"simulator/programs/firmware", "system/bin/firmware"},
    {"simulator/programs/make_nodes", "system/bin/make_nodes"},
    {"simulator/programs/scenario", "system/bin/scenario"},
    {"simulator/programs/start_storage", "system/bin/start_storage"},
    {"simulator/programs/pktlogconf", "vendor/bin/pktlogconf"},
    {"simulator/programs/iwpriv", "vendor/bin/iwpriv"},
    // The machine may allow its own tcpdump, by its path, to write only where a device does not.
    {"/usr/bin/tcpdump", "system/xbin/tcpdump"},
};

constexpr struct {
  const char* path;
  const char* target;
} kLinks[] = {
    {"system/bin/sh", "/usr/bin/sh"},         {"system/bin/logcat", "corvex-toolbox"},
    {"system/bin/log", "corvex-toolbox"},     {"system/bin/getprop", "corvex-toolbox"},
    {"system/bin/setprop", "corvex-toolbox"},
};

// Replaces the copy as a whole: the old one may still be running somewhere.
bool copy_file(const std::string& from, const std::string& to, mode_t mode) {
  std::string fresh = to + ".new";
  unique_fd source(open(from.c_str(), O_RDONLY | O_CLOEXEC));
  if (source == -1) return report_failure(from);
  unique_fd target(open(fresh.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, mode));
  ssize_t count = target == -1 ? -1 : 1;
  while (count > 0) count = sendfile(target, source, nullptr, 1 << 20);
  if (count < 0 || rename(fresh.c_str(), to.c_str()) != 0) return report_failure(to);
  return true;
}

bool write_fstab(bool encrypted) {
  constexpr char kFstab[] = "vendor/etc/fstab.qcom";
  std::string text = "#<src> <mnt_point> <type> <mnt_flags> <fs_mgr_flags>\n";
  text += "/dev/block/bootdevice/by-name/system /system ext4 ro,barrier=1 wait,verify\n";
  text += "/dev/block/bootdevice/by-name/userdata /data ext4 nosuid,nodev,noauto_da_alloc ";
  text += encrypted ? "wait,check,forceencrypt=footer\n" : "wait,check,encryptable=footer\n";
  text += "/dev/block/bootdevice/by-name/cache /cache ext4 nosuid,nodev,barrier=1 wait,check\n";
  return android::base::WriteStringToFile(text, kFstab) || report_failure(kFstab);
}

// On a phone the data partition is not mounted yet as the first programs start. Here it always is,
// but the file by which they tell is not there before its time.
bool hide_layout_version() {
  constexpr char kLayoutVersion[] = "data/.layout_version";
  return unlink(kLayoutVersion) == 0 || errno == ENOENT || report_failure(kLayoutVersion);
}

}  // namespace

bool report_failure(const std::string& path) {
  fprintf(stderr, "corvex-device: %s: %m\n", path.c_str());
  return false;
}

bool make_root_files(bool encrypted) {
  for (const auto& directory : kDirectories) {
    if (mkdir(directory.path, directory.mode) != 0) {
      if (errno != EEXIST) return report_failure(directory.path);
      continue;
    }
    // An ordinary user's device may have no user but root: then everything is root's.
    if (chown(directory.path, directory.owner, directory.owner) != 0 && errno != EINVAL) {
      return report_failure(directory.path);
    }
    if (chmod(directory.path, directory.mode) != 0) return report_failure(directory.path);
  }
  for (const auto& file : kFiles) {
    if (access(file.path, F_OK) == 0) continue;
    if (!android::base::WriteStringToFile(file.text, file.path)) return report_failure(file.path);
  }
  if (!write_fstab(encrypted) || !hide_layout_version()) return false;
  for (const auto& link : kLinks) {
    if (symlink(link.target, link.path) != 0 && errno != EEXIST) return report_failure(link.path);
  }
  // Local time is the machine's, and so is the way to its libraries.
  for (const char* path : {"/etc/localtime", "/etc/ld.so.cache"}) {
    if (access(path, R_OK) == 0 && !copy_file(path, path + 1, 0644)) return false;
  }
  return true;
}

bool copy_programs(const std::string& build) {
  for (const auto& program : kPrograms) {
    std::string from = program.from[0] == '/' ? program.from : build + "/" + program.from;
    if (!copy_file(from, program.to, 0755)) return false;
  }
  return true;
}

}  // namespace corvexd::sim
