// System properties on Linux: one file each, set through the property service.
#include <android-base/properties.h>
#include <android-base/unique_fd.h>
#include <cutils/properties.h>
#include <dirent.h>
#include <errno.h>
#include <fcntl.h>
#include <limits.h>
#include <stdint.h>
#include <stdio.h>
#include <string.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

using android::base::unique_fd;

namespace {

constexpr char kDirectory[] = "/dev/__properties__";
constexpr uint32_t kSetRequest = 0x00020001;
constexpr time_t kServiceWait = 5;  // seconds, for a service that takes no word or gives none

// Reads the property's value into `value` (PROPERTY_VALUE_MAX bytes); returns its length, 0 when
// it is unset.
int read_value(const char* key, char* value) {
  value[0] = '\0';
  char path[sizeof kDirectory + NAME_MAX + 1];
  int length = snprintf(path, sizeof path, "%s/%s", kDirectory, key);
  if (length >= static_cast<int>(sizeof path) || strchr(key, '/') != nullptr) return 0;
  unique_fd fd(open(path, O_RDONLY | O_CLOEXEC | O_NONBLOCK));
  if (fd == -1) return 0;
  ssize_t count = TEMP_FAILURE_RETRY(read(fd, value, PROPERTY_VALUE_MAX - 1));
  if (count < 0) count = 0;
  value[count] = '\0';
  return static_cast<int>(strlen(value));
}

bool send_all(int fd, const void* data, size_t size) {
  const char* rest = static_cast<const char*>(data);
  while (size > 0) {
    ssize_t count = TEMP_FAILURE_RETRY(send(fd, rest, size, MSG_NOSIGNAL));
    if (count <= 0) return false;
    rest += count;
    size -= count;
  }
  return true;
}

bool send_text(int fd, const char* text) {
  uint32_t length = strlen(text);
  return send_all(fd, &length, sizeof length) && send_all(fd, text, length);
}

__attribute__((constructor)) void fill_base_properties() {
  DIR* directory = opendir(kDirectory);
  if (directory == nullptr) return;
  char value[PROPERTY_VALUE_MAX];
  while (struct dirent* entry = readdir(directory)) {
    if (strncmp(entry->d_name, "ro.", 3) != 0) continue;
    if (read_value(entry->d_name, value) > 0) android::base::SetProperty(entry->d_name, value);
  }
  closedir(directory);
}

}  // namespace

int property_get(const char* key, char* value, const char* default_value) {
  int length = read_value(key, value);
  if (length > 0 || default_value == nullptr) return length;
  length = static_cast<int>(strnlen(default_value, PROPERTY_VALUE_MAX - 1));
  memcpy(value, default_value, length);
  value[length] = '\0';
  return length;
}

int property_set(const char* key, const char* value) {
  unique_fd fd(socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
  if (fd == -1) return -1;
  struct timeval wait = {kServiceWait, 0};
  setsockopt(fd, SOL_SOCKET, SO_SNDTIMEO, &wait, sizeof wait);
  setsockopt(fd, SOL_SOCKET, SO_RCVTIMEO, &wait, sizeof wait);
  const struct sockaddr_un address = {AF_UNIX, "/dev/socket/property_service"};
  const struct sockaddr* service = reinterpret_cast<const struct sockaddr*>(&address);
  if (TEMP_FAILURE_RETRY(connect(fd, service, sizeof address)) != 0) return -1;
  uint32_t request = kSetRequest;
  if (!send_all(fd, &request, sizeof request) || !send_text(fd, key) || !send_text(fd, value)) {
    return -1;
  }
  uint32_t result = 1;
  if (TEMP_FAILURE_RETRY(recv(fd, &result, sizeof result, MSG_WAITALL)) != sizeof result) return -1;
  return result == 0 ? 0 : -1;
}
