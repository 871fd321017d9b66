// Control sockets on Linux; the installed <cutils/sockets.h> one knows only the device's way.
#include <cutils/sockets.h>
#include <errno.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/un.h>

int android_get_control_socket(const char* name) {
  char key[64];
  struct sockaddr_un expected = {AF_UNIX, ""};
  int key_length = snprintf(key, sizeof key, "%s%s", ANDROID_SOCKET_ENV_PREFIX, name);
  int path_length =
      snprintf(expected.sun_path, sizeof expected.sun_path, "%s/%s", ANDROID_SOCKET_DIR, name);
  if (key_length >= static_cast<int>(sizeof key) ||
      path_length >= static_cast<int>(sizeof expected.sun_path)) {
    errno = ENAMETOOLONG;
    return -1;
  }
  const char* text = getenv(key);
  if (text == nullptr || *text == '\0') {
    errno = ENOENT;
    return -1;
  }
  char* end;
  errno = 0;
  long number = strtol(text, &end, 10);
  if (*end != '\0' || errno != 0 || number < 0 || number > 0x7fffffff) {
    errno = EINVAL;
    return -1;
  }
  struct sockaddr_un bound = {};
  socklen_t size = sizeof bound;
  int fd = static_cast<int>(number);
  if (getsockname(fd, reinterpret_cast<struct sockaddr*>(&bound), &size) != 0) return -1;
  if (bound.sun_family != AF_UNIX ||
      strncmp(bound.sun_path, expected.sun_path, sizeof bound.sun_path) != 0) {
    errno = EADDRNOTAVAIL;
    return -1;
  }
  return fd;
}
