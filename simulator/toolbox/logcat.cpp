// logcat: prints the device's log, or records it into files.
#include <android/log.h>
#include <errno.h>
#include <log/log_id.h>
#include <log/log_read.h>
#include <poll.h>
#include <stdio.h>
#include <sys/socket.h>
#include <unistd.h>

#include <string>

#include "simulator/common/protocol.h"
#include "simulator/toolbox/kernel_log.h"
#include "simulator/toolbox/logcat_options.h"
#include "simulator/toolbox/output.h"
#include "simulator/toolbox/tools.h"

using android::base::unique_fd;

namespace corvexd::sim {
namespace {

constexpr int kReconnectPause = 100;  // milliseconds
constexpr uint32_t kKernelBuffer = 1u << LOG_ID_KERNEL;

class Logcat {
 public:
  explicit Logcat(const LogcatOptions& options) : options_(options) {}

  int run();

 private:
  bool wants_log_daemon() const { return (options_.buffers & ~kKernelBuffer) != 0; }

  int clear() const;
  void connect(ReadRequest::Operation operation);
  void print(struct log_msg* line);
  void print_waiting_lines(const struct pollfd polls[2]);

  const LogcatOptions& options_;
  Output output_;
  KernelLog kernel_log_;
  unique_fd log_daemon_;
  uint32_t begun_ = 0;  // buffers of which a line has been printed
};

int Logcat::clear() const {
  ReadRequest request = {ReadRequest::kClear, options_.buffers & ~kKernelBuffer};
  unique_fd fd = connect_to(kLogReadSocket, SOCK_SEQPACKET);
  char end;
  // The log daemon ends the connection when the buffers are empty.
  if (fd == -1 || send(fd, &request, sizeof request, MSG_NOSIGNAL) < 0 ||
      recv(fd, &end, sizeof end, 0) != 0) {
    fprintf(stderr, "logcat: the log cannot be cleared: %m\n");
    return 1;
  }
  if (options_.buffers & kKernelBuffer) {
    fprintf(stderr, "logcat: the kernel log is the machine's own and is left as it is\n");
  }
  return 0;
}

void Logcat::connect(ReadRequest::Operation operation) {
  ReadRequest request = {operation, options_.buffers & ~kKernelBuffer};
  log_daemon_ = connect_to(kLogReadSocket, SOCK_SEQPACKET);
  if (log_daemon_ != -1 && send(log_daemon_, &request, sizeof request, MSG_NOSIGNAL) < 0) {
    log_daemon_.reset();
  }
}

void Logcat::print(struct log_msg* line) {
  AndroidLogEntry entry;
  if (android_log_processLogBuffer(&line->entry, &entry) != 0) return;
  if (!android_log_shouldPrintLine(options_.format.get(), entry.tag, entry.priority)) return;
  uint32_t buffer = 1u << line->entry.lid;
  bool several = (options_.buffers & (options_.buffers - 1)) != 0;
  if (several && !(begun_ & buffer)) {
    output_.write_text(std::string("--------- beginning of ") +
                       android_log_id_to_name(static_cast<log_id_t>(line->entry.lid)) + "\n");
  }
  begun_ |= buffer;
  output_.write_entry(options_.format.get(), entry);
}

// Prints a line of each source that has one; a log daemon that has gone away is let go.
void Logcat::print_waiting_lines(const struct pollfd polls[2]) {
  struct log_msg line;
  if (polls[0].revents != 0) {
    ssize_t count = recv(log_daemon_, line.buf, sizeof line.buf - 1, 0);
    if (count >= static_cast<ssize_t>(sizeof line.entry)) print(&line);
    if (count == 0 || (count < 0 && errno != EINTR)) log_daemon_.reset();
  }
  if (polls[1].revents != 0 && kernel_log_.read_line(&line)) print(&line);
}

int Logcat::run() {
  if (options_.clear) return clear();
  if (options_.file != nullptr &&
      !output_.open_file(options_.file, options_.rotate_kib * 1024, options_.rotate_count)) {
    fprintf(stderr, "logcat: cannot open %s: %m\n", options_.file);
    return 1;
  }
  if ((options_.buffers & kKernelBuffer) && !kernel_log_.open()) {
    fprintf(stderr, "logcat: the kernel log cannot be read: %m\n");
  }
  if (options_.dump && wants_log_daemon()) {
    connect(ReadRequest::kDump);
    if (log_daemon_ == -1) fprintf(stderr, "logcat: the log daemon does not answer: %m\n");
    if (log_daemon_ == -1) return 1;
  }
  for (;;) {
    if (!options_.dump && wants_log_daemon() && log_daemon_ == -1) connect(ReadRequest::kStream);
    bool reconnect = !options_.dump && wants_log_daemon() && log_daemon_ == -1;
    struct pollfd polls[] = {{log_daemon_, POLLIN, 0}, {kernel_log_.fd(), POLLIN, 0}};
    int timeout = reconnect ? kReconnectPause : options_.dump && log_daemon_ == -1 ? 0 : -1;
    int ready = poll(polls, 2, timeout);
    if (ready > 0) print_waiting_lines(polls);
    if (ready == 0 && options_.dump) return 0;
  }
}

}  // namespace

int logcat_main(int argc, char** argv) {
  LogcatOptions options;
  if (!parse_logcat_options(argc, argv, &options)) return 1;
  return Logcat(options).run();
}

}  // namespace corvexd::sim
