// The Android log on Linux: every line goes as one datagram to the log daemon's socket.
#include <android/log.h>
#include <errno.h>
#include <poll.h>
#include <signal.h>
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

// Everything below may run inside a signal handler and in a forked child of a program with threads:
// no lock, no allocation, and only these are shared. The sockets stay unconnected, so that each
// line reaches the log daemon that runs now. A datagram queue holds only a few lines. If it is
// full, the first socket waits a second for space, the second one a moment.
std::atomic<int> patient_socket{-1};
std::atomic<int> hurried_socket{-1};
constexpr struct timeval kPatience = {1, 0};
constexpr struct timeval kMoment = {0, 20'000};

// Set when a line could not be sent within its second: the log daemon does not read its socket.
// Until a line gets through again, the others wait for a moment only.
std::atomic<bool> stalled{false};

struct __attribute__((packed)) Header {
  uint8_t buffer_id;
  uint16_t thread_id;
  uint32_t seconds;
  uint32_t nanoseconds;
};
static_assert(sizeof(Header) == 11, "the header is packed");

bool is_past(const struct timespec& deadline) {
  struct timespec now;
  clock_gettime(CLOCK_MONOTONIC, &now);
  return now.tv_sec >= deadline.tv_sec;
}

bool send_line(const struct msghdr& message) {
  // Signals may interrupt the wait again and again, but not past this deadline.
  struct timespec deadline;
  clock_gettime(CLOCK_MONOTONIC, &deadline);
  deadline.tv_sec += 2;
  do {
    int fd = stalled ? hurried_socket : patient_socket;
    if (sendmsg(fd, &message, MSG_NOSIGNAL) >= 0) {
      stalled = false;
      return true;
    }
  } while (errno == EINTR && !is_past(deadline));
  if (errno == EAGAIN || errno == EINTR) stalled = true;
  return false;
}

// Writes to standard error, without waiting for a slow reader and without SIGPIPE if there is none.
void write_softly(const struct iovec* parts, int count) {
  struct pollfd ready = {STDERR_FILENO, POLLOUT, 0};
  if (poll(&ready, 1, 0) != 1 || (ready.revents & POLLOUT) == 0) return;
  sigset_t broken_pipe, earlier, pending;
  sigemptyset(&broken_pipe);
  sigaddset(&broken_pipe, SIGPIPE);
  pthread_sigmask(SIG_BLOCK, &broken_pipe, &earlier);
  sigpending(&pending);
  ssize_t written = writev(STDERR_FILENO, parts, count);
  if (written == -1 && errno == EPIPE && sigismember(&pending, SIGPIPE) == 0) {
    const struct timespec at_once = {0, 0};
    sigtimedwait(&broken_pipe, nullptr, &at_once);
  }
  pthread_sigmask(SIG_SETMASK, &earlier, nullptr);
}

// In logcat's brief form: every line of the text has the head.
void write_to_stderr(int priority, const char* text, size_t length) {
  static constexpr char kLetters[] = "??VDIWEFS";
  char head[64];
  char letter = priority >= 0 && priority < 9 ? kLetters[priority] : '?';
  int head_length = snprintf(head, sizeof head, "%c/%-8s(%5d): ", letter, kTag, getpid());
  char line_end[] = "\n";
  const char* const end = text + length;
  do {
    const char* next = static_cast<const char*>(memchr(text, '\n', end - text));
    size_t line_length = (next == nullptr ? end : next) - text;
    struct iovec parts[] = {{head, static_cast<size_t>(head_length)},
                            {const_cast<char*>(text), line_length},
                            {line_end, 1}};
    write_softly(parts, 3);
    text = next == nullptr ? end : next + 1;
  } while (text < end);
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

int open_log_socket(const struct timeval& wait) {
  int fd = socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0);
  setsockopt(fd, SOL_SOCKET, SO_SNDTIMEO, &wait, sizeof wait);
  return fd;
}

__attribute__((constructor)) void set_up_logger() {
  patient_socket = open_log_socket(kPatience);
  hurried_socket = open_log_socket(kMoment);
  __android_log_set_logger(log_line);
  __android_log_set_minimum_priority(ANDROID_LOG_VERBOSE);
}

}  // namespace
