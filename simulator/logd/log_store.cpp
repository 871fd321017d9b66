#include "simulator/logd/log_store.h"

#include <log/log_read.h>
#include <string.h>

#include <algorithm>

#include "simulator/common/protocol.h"

namespace corvexd::sim {
namespace {

constexpr size_t kBufferLimit = 1024 * 1024;

bool is_older(const std::string& a, const std::string& b) {
  struct logger_entry first, second;
  memcpy(&first, a.data(), sizeof first);
  memcpy(&second, b.data(), sizeof second);
  return first.sec != second.sec ? first.sec < second.sec : first.nsec < second.nsec;
}

}  // namespace

void LogStore::Buffer::drop_oldest() {
  bytes -= lines.front().size();
  lines.pop_front();
  ++first;
}

void LogStore::add(const char* datagram, size_t size, const struct ucred& writer) {
  LogHeader header;
  // The least a payload holds is a priority and the ends of tag and text.
  if (size < sizeof header + 3) return;
  memcpy(&header, datagram, sizeof header);
  if (header.buffer >= kBufferCount) return;
  size_t length = std::min<size_t>(size - sizeof header, LOGGER_ENTRY_MAX_PAYLOAD);

  struct logger_entry entry = {};
  entry.len = static_cast<uint16_t>(length);
  entry.hdr_size = sizeof entry;
  entry.pid = writer.pid;
  entry.tid = header.thread;
  entry.sec = header.seconds;
  entry.nsec = header.nanoseconds;
  entry.lid = header.buffer;
  entry.uid = writer.uid;
  std::string line(reinterpret_cast<const char*>(&entry), sizeof entry);
  line.append(datagram + sizeof header, length);

  Buffer& buffer = buffers_[header.buffer];
  buffer.bytes += line.size();
  buffer.lines.push_back(std::move(line));
  while (buffer.bytes > kBufferLimit) buffer.drop_oldest();
}

const std::string* LogStore::take(uint32_t buffers, LogPosition* position,
                                  const LogPosition& end) const {
  const std::string* oldest = nullptr;
  int oldest_id = 0;
  for (int id = 0; id < kBufferCount; ++id) {
    const Buffer& buffer = buffers_[id];
    uint64_t& next = position->next[id];
    next = std::max(next, buffer.first);
    if ((buffers & 1u << id) == 0) continue;
    if (next >= std::min(end.next[id], buffer.first + buffer.lines.size())) continue;
    const std::string& line = buffer.lines[next - buffer.first];
    if (oldest != nullptr && !is_older(line, *oldest)) continue;
    oldest = &line;
    oldest_id = id;
  }
  if (oldest != nullptr) ++position->next[oldest_id];
  return oldest;
}

bool LogStore::has_more(uint32_t buffers, const LogPosition& position,
                        const LogPosition& end) const {
  LogPosition copy = position;
  return take(buffers, &copy, end) != nullptr;
}

void LogStore::clear(uint32_t buffers) {
  for (int id = 0; id < kBufferCount; ++id) {
    if ((buffers & 1u << id) == 0) continue;
    while (!buffers_[id].lines.empty()) buffers_[id].drop_oldest();
  }
}

LogPosition LogStore::end() const {
  LogPosition end;
  for (int id = 0; id < kBufferCount; ++id) {
    end.next[id] = buffers_[id].first + buffers_[id].lines.size();
  }
  return end;
}

}  // namespace corvexd::sim
