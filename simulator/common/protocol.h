// What the programs of the simulated device agree on: sockets, properties and log lines.
#pragma once

#include <android-base/unique_fd.h>
#include <stddef.h>
#include <stdint.h>

namespace corvexd::sim {

constexpr char kPropertyDirectory[] = "/dev/__properties__";
constexpr char kPropertySocket[] = "/dev/socket/property_service";
constexpr uint32_t kPropertySetRequest = 0x00020001;
constexpr size_t kMaxPropertyValue = 91;

constexpr char kLogWriteSocket[] = "/dev/socket/logdw";
constexpr char kLogReadSocket[] = "/dev/socket/logdr";

// In front of each line written to the log: then come the priority, the tag and the text.
struct __attribute__((packed)) LogHeader {
  uint8_t buffer;
  uint16_t thread;
  uint32_t seconds;
  uint32_t nanoseconds;
};

// What a reader of the log sends first, once. Streams and dumps answer one logger_entry with its
// payload per packet, and a dump ends with the connection; a clear ends it when it is done.
struct ReadRequest {
  enum Operation : uint32_t { kStream, kDump, kClear };
  uint32_t operation;
  uint32_t buffers;  // one bit for each log id
};

// Connects to a socket of the device. Holds no descriptor on failure (errno says why).
android::base::unique_fd connect_to(const char* path, int type);

// Makes a socket at a path, whatever stood there before. Holds no descriptor on failure.
android::base::unique_fd bind_at(const char* path, int type);

}  // namespace corvexd::sim
