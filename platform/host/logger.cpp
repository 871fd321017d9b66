// The Android log on Linux: every line goes as one datagram to the log daemon's socket.
#include <android/log.h>
#include <errno.h>
#include <stdio.h>
#include <string.h>
#include <sys/socket.h>
#include <sys/syscall.h>
#include <sys/uio.h>
#include <sys/un.h>
#include <time.h>
#include <unistd.h>

#include <atomic>

namespace {

constexpr char kTag[] = "corvexd";
constexpr size_t kMaxPayload = 4068;  // priority, tag and NUL, text and NUL together
constexpr time_t kFullQueueWait = 1;  // seconds

// Everything below may run inside a signal handler and in a child just forked, beside other
// threads: no lock, no allocation, nothing but this descriptor and this flag shared. The socket
// stays unconnected, so that each line finds the log daemon of its moment.
std::atomic<int> log_socket{-1};

// Set while the log daemon has its socket open and does not read. One line has then waited for it;
// the following ones do not wait again until one gets through.
std::atomic<bool> stalled{false};

struct __attribute__((packed)) Header {
  uint8_t buffer_id;
  uint16_t thread_id;
  uint32_t seconds;
  uint32_t nanoseconds;
};
static_assert(sizeof(Header) == 11, "the header is packed");

bool send_line(const struct msghdr& message) {
  int fd = log_socket.load(std::memory_order_relaxed);
  if (fd < 0) return false;
  struct timespec deadline;
  clock_gettime(CLOCK_MONOTONIC, &deadline);
  deadline.tv_sec += kFullQueueWait + 1;
  for (;;) {
    int flags = MSG_NOSIGNAL;
    if (stalled.load(std::memory_order_relaxed)) flags |= MSG_DONTWAIT;
    if (sendmsg(fd, &message, flags) >= 0) {
      stalled.store(false, std::memory_order_relaxed);
      return true;
    }
    if (errno != EINTR) break;
    struct timespec now;
    clock_gettime(CLOCK_MONOTONIC, &now);
    if (now.tv_sec >= deadline.tv_sec) break;
  }
  if (errno == EAGAIN || errno == EINTR) stalled.store(true, std::memory_order_relaxed);
  return false;
}

void write_to_stderr(int priority, const char* text, size_t length) {
  static constexpr char kLetters[] = "??VDIWEFS";
  char head[64];
  char letter = priority >= 0 && priority < 9 ? kLetters[priority] : '?';
  int head_length = snprintf(head, sizeof head, "%c/%-8s(%5d): ", letter, kTag, getpid());
  char line_end[] = "\n";
  size_t end_length = length > 0 && text[length - 1] == '\n' ? 0 : 1;
  struct iovec parts[] = {{head, static_cast<size_t>(head_length)},
                          {const_cast<char*>(text), length},
                          {line_end, end_length}};
  ssize_t ignored = writev(STDERR_FILENO, parts, 3);
  (void)ignored;
}

void log_line(const __android_logger_data* data, const char* text) {
  int saved_errno = errno;
  struct timespec now;
  clock_gettime(CLOCK_REALTIME, &now);
  int buffer_id = data->buffer_id < 0 ? 0 : data->buffer_id;
  Header header = {static_cast<uint8_t>(buffer_id), static_cast<uint16_t>(syscall(SYS_gettid)),
                   static_cast<uint32_t>(now.tv_sec), static_cast<uint32_t>(now.tv_nsec)};
  uint8_t priority = static_cast<uint8_t>(data->priority);
  size_t length = strnlen(text, kMaxPayload - sizeof priority - sizeof kTag - 1);
  char end = '\0';
  struct iovec parts[] = {{&header, sizeof header},
                          {&priority, sizeof priority},
                          {const_cast<char*>(kTag), sizeof kTag},
                          {const_cast<char*>(text), length},
                          {&end, sizeof end}};
  struct sockaddr_un address = {AF_UNIX, "/dev/socket/logdw"};
  struct msghdr message = {};
  message.msg_name = &address;
  message.msg_namelen = sizeof address;
  message.msg_iov = parts;
  message.msg_iovlen = 5;
  if (!send_line(message)) write_to_stderr(data->priority, text, length);
  errno = saved_errno;
}

__attribute__((constructor)) void set_up_logger() {
  int fd = socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0);
  // A datagram queue holds few lines; the kernel waits this long for room in a full one.
  struct timeval wait = {kFullQueueWait, 0};
  setsockopt(fd, SOL_SOCKET, SO_SNDTIMEO, &wait, sizeof wait);
  log_socket = fd;
  __android_log_set_logger(log_line);
  __android_log_set_minimum_priority(ANDROID_LOG_VERBOSE);
}

}  // namespace
