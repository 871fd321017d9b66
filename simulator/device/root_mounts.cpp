#include "simulator/device/root_mounts.h"

#include <android-base/unique_fd.h>
#include <errno.h>
#include <fcntl.h>
#include <limits.h>
#include <stdio.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include "simulator/device/root_files.h"

using android::base::unique_fd;

namespace corvexd::sim {
namespace {

// All of these are the host's; paths into the device's root lack the leading slash.
constexpr const char* kHostDirectories[] = {
    "/usr", "/bin", "/sbin", "/lib", "/lib64", "/etc/alternatives", "/sys"};

constexpr struct {
  const char* path;
  int access;  // as which it must open here to be of any use
} kDevices[] = {
    {"/dev/null", O_RDWR},     {"/dev/zero", O_RDWR},      {"/dev/full", O_RDWR},
    {"/dev/random", O_RDONLY}, {"/dev/urandom", O_RDONLY}, {"/dev/kmsg", O_RDONLY},
    {"/dev/tty", O_PATH},
};

constexpr struct {
  const char* path;
  const char* target;
} kLinks[] = {
    {"dev/fd", "/proc/self/fd"},       {"dev/stdin", "/proc/self/fd/0"},
    {"dev/stdout", "/proc/self/fd/1"}, {"dev/stderr", "/proc/self/fd/2"},
    {"dev/ptmx", "pts/ptmx"},
};

// The host's directory as it is there: the same link, or the directory itself, read-only.
bool show_host_directory(const char* path) {
  const char* inside = path + 1;
  char target[PATH_MAX];
  ssize_t length = readlink(path, target, sizeof target - 1);
  if (length > 0) {
    target[length] = '\0';
    return symlink(target, inside) == 0 || errno == EEXIST || report_failure(path);
  }
  if (access(path, F_OK) != 0) return true;
  struct mount_attr read_only = {};
  read_only.attr_set = MOUNT_ATTR_RDONLY;
  mkdir(inside, 0755);
  return (mount(path, inside, nullptr, MS_BIND | MS_REC, nullptr) == 0 &&
          mount_setattr(AT_FDCWD, inside, AT_RECURSIVE, &read_only, sizeof read_only) == 0) ||
         report_failure(path);
}

bool show_device(const char* path, int access) {
  const char* inside = path + 1;
  if (unique_fd(open(path, access | O_NONBLOCK | O_CLOEXEC)) == -1) return true;
  unique_fd node(open(inside, O_WRONLY | O_CREAT | O_CLOEXEC, 0666));
  return mount(path, inside, nullptr, MS_BIND, nullptr) == 0 || report_failure(path);
}

bool make_devices() {
  if (mount("tmpfs", "dev", "tmpfs", MS_NOSUID, "mode=755") != 0) return report_failure("dev");
  for (const auto& device : kDevices) {
    if (!show_device(device.path, device.access)) return false;
  }
  for (const char* directory : {"dev/socket", "dev/pts"}) {
    if (mkdir(directory, 0755) != 0) return report_failure(directory);
  }
  for (const auto& link : kLinks) {
    if (symlink(link.target, link.path) != 0) return report_failure(link.path);
  }
  return mount("devpts", "dev/pts", "devpts", MS_NOSUID | MS_NOEXEC, "newinstance,ptmxmode=0666") ==
             0 ||
         report_failure("dev/pts");
}

}  // namespace

bool mount_root(const std::string& root) {
  // No mount made from here on may show up on the host.
  return (mount(nullptr, "/", nullptr, MS_REC | MS_PRIVATE, nullptr) == 0 &&
          mount(root.c_str(), root.c_str(), nullptr, MS_BIND | MS_REC, nullptr) == 0 &&
          chdir(root.c_str()) == 0) ||
         report_failure(root);
}

bool mount_rest_and_enter() {
  for (const char* path : kHostDirectories) {
    if (!show_host_directory(path)) return false;
  }
  if (mount("proc", "proc", "proc", MS_NOSUID | MS_NODEV | MS_NOEXEC, nullptr) != 0) {
    return report_failure("proc");
  }
  if (!make_devices()) return false;
  // The old root ends up on top of the new one, and is taken away there.
  return (syscall(SYS_pivot_root, ".", ".") == 0 && umount2(".", MNT_DETACH) == 0 &&
          chdir("/") == 0) ||
         report_failure("the new root");
}

}  // namespace corvexd::sim
