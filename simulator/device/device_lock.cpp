#include "simulator/device/device_lock.h"

#include <errno.h>
#include <fcntl.h>
#include <stdio.h>
#include <stdlib.h>
#include <sys/file.h>
#include <unistd.h>

using android::base::unique_fd;

namespace corvexd::sim {
namespace {

std::string lock_path(const std::string& root) { return root + "/.init_pid"; }

}  // namespace

unique_fd lock_device(const std::string& root) {
  unique_fd fd(open(lock_path(root).c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0644));
  if (fd != -1 && flock(fd, LOCK_EX | LOCK_NB) == 0 && ftruncate(fd, 0) == 0) return fd;
  if (fd != -1 && errno == EWOULDBLOCK) {
    fprintf(stderr, "corvex-device: a device runs on %s already\n", root.c_str());
  } else {
    fprintf(stderr, "corvex-device: %s: %m\n", lock_path(root).c_str());
  }
  return unique_fd();
}

bool publish_init(int lock, pid_t init) { return dprintf(lock, "%d\n", init) > 0; }

pid_t find_init(const std::string& root) {
  unique_fd fd(open(lock_path(root).c_str(), O_RDONLY | O_CLOEXEC));
  char text[16] = "";
  if (fd == -1 || flock(fd, LOCK_SH | LOCK_NB) == 0 || errno != EWOULDBLOCK) return 0;
  if (read(fd, text, sizeof text - 1) <= 0) return 0;
  return static_cast<pid_t>(atoi(text));
}

}  // namespace corvexd::sim
