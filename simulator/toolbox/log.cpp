// log [-p PRIORITY] [-t TAG] [-b BUFFER] TEXT...: writes one line to the device's log.
#include <android/log.h>
#include <log/log_id.h>
#include <log/log_read.h>
#include <stdio.h>
#include <string.h>
#include <sys/socket.h>
#include <sys/syscall.h>
#include <time.h>
#include <unistd.h>

#include <string>

#include "simulator/common/protocol.h"
#include "simulator/toolbox/tools.h"

namespace corvexd::sim {
namespace {

// The number behind a priority's letter; 0 when it is none.
int priority_of(const char* letter) {
  static constexpr char kLetters[] = "VDIWEFS";
  const char* found = strlen(letter) == 1 ? strchr(kLetters, letter[0] & ~0x20) : nullptr;
  return found != nullptr ? ANDROID_LOG_VERBOSE + static_cast<int>(found - kLetters) : 0;
}

// The log id of a buffer that programs write to; -1 when it is none.
int buffer_of(const char* name) {
  log_id_t id = android_name_to_log_id(name);
  return id >= LOG_ID_MIN && id <= LOG_ID_CRASH ? static_cast<int>(id) : -1;
}

int write_line(int buffer, int priority, const char* tag, const std::string& text) {
  struct timespec now;
  clock_gettime(CLOCK_REALTIME, &now);
  LogHeader header = {static_cast<uint8_t>(buffer), static_cast<uint16_t>(syscall(SYS_gettid)),
                      static_cast<uint32_t>(now.tv_sec), static_cast<uint32_t>(now.tv_nsec)};
  std::string payload(1, static_cast<char>(priority));
  payload.append(tag).push_back('\0');
  payload.append(text);
  if (payload.size() >= LOGGER_ENTRY_MAX_PAYLOAD) payload.resize(LOGGER_ENTRY_MAX_PAYLOAD - 1);
  payload.push_back('\0');

  android::base::unique_fd fd = connect_to(kLogWriteSocket, SOCK_DGRAM);
  std::string line(reinterpret_cast<const char*>(&header), sizeof header);
  line.append(payload);
  if (fd == -1 || send(fd, line.data(), line.size(), MSG_NOSIGNAL) < 0) {
    fprintf(stderr, "log: the log daemon does not take the line: %m\n");
    return 1;
  }
  return 0;
}

}  // namespace

int log_main(int argc, char** argv) {
  int buffer = LOG_ID_MAIN;
  int priority = ANDROID_LOG_INFO;
  const char* tag = "log";
  for (int option; (option = getopt(argc, argv, "+p:t:b:")) != -1;) {
    if (option == 'p') priority = priority_of(optarg);
    if (option == 't') tag = optarg;
    if (option == 'b') buffer = buffer_of(optarg);
    if (option == '?' || priority == 0 || buffer < 0) optind = argc;  // shows the usage
  }
  if (optind >= argc) {
    fprintf(stderr,
            "usage: log [-p v|d|i|w|e|f|s] [-t TAG] [-b main|system|radio|events|crash] TEXT...\n");
    return 1;
  }
  std::string text = argv[optind];
  for (int i = optind + 1; i < argc; ++i) text.append(" ").append(argv[i]);
  return write_line(buffer, priority, tag, text);
}

}  // namespace corvexd::sim
