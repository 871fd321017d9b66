#include "simulator/logd/readers.h"

#include <errno.h>
#include <string.h>
#include <sys/socket.h>

#include <algorithm>

using android::base::unique_fd;

namespace corvexd::sim {
namespace {

constexpr int kLinesAtOnce = 64;  // then the writers get their turn

}  // namespace

void Readers::add_to(std::vector<struct pollfd>* polls) const {
  polls->push_back({listener_, POLLIN, 0});
  for (const Reader& reader : readers_) {
    bool waiting = reader.asked && store_->has_more(reader.buffers, reader.position, reader.end);
    polls->push_back({reader.fd, static_cast<short>(waiting ? POLLIN | POLLOUT : POLLIN), 0});
  }
}

void Readers::serve(const struct pollfd* polls) {
  std::vector<Reader> kept;
  for (size_t i = 0; i < readers_.size(); ++i) {
    Reader& reader = readers_[i];
    short events = polls[i + 1].revents;
    bool keep = true;
    if (events & (POLLIN | POLLHUP | POLLERR)) keep = take_request(&reader);
    if (keep && (events & POLLOUT)) keep = send_lines(&reader);
    if (keep) kept.push_back(std::move(reader));
  }
  // At last, for a line that one of them was to get another may have cleared.
  kept.erase(std::remove_if(kept.begin(), kept.end(),
                            [this](const Reader& reader) { return is_done(reader); }),
             kept.end());
  readers_ = std::move(kept);
  if (polls[0].revents & POLLIN) accept_reader();
}

void Readers::accept_reader() {
  Reader reader;
  reader.fd = unique_fd(accept4(listener_, nullptr, nullptr, SOCK_CLOEXEC | SOCK_NONBLOCK));
  if (reader.fd != -1) readers_.push_back(std::move(reader));
}

// Whether the reader has got all that it asked for, or what is left of it.
bool Readers::is_done(const Reader& reader) const {
  return reader.asked && reader.ends &&
         !store_->has_more(reader.buffers, reader.position, reader.end);
}

// Answers whether the reader is still there.
bool Readers::take_request(Reader* reader) {
  ReadRequest request;
  ssize_t count = recv(reader->fd, &request, sizeof request, 0);
  if (count < 0) return errno == EAGAIN;
  if (count != sizeof request || reader->asked) return false;
  if (request.operation == ReadRequest::kClear) {
    store_->clear(request.buffers);
    return false;
  }
  reader->asked = true;
  reader->buffers = request.buffers;
  reader->ends = request.operation == ReadRequest::kDump;
  reader->end = store_->end();
  if (!reader->ends) memset(&reader->end, 0xff, sizeof reader->end);
  return true;
}

bool Readers::send_lines(Reader* reader) {
  for (int i = 0; i < kLinesAtOnce; ++i) {
    LogPosition position = reader->position;
    const std::string* line = store_->take(reader->buffers, &position, reader->end);
    if (line == nullptr) return true;
    if (send(reader->fd, line->data(), line->size(), MSG_NOSIGNAL) < 0) return errno == EAGAIN;
    reader->position = position;
  }
  return true;
}

}  // namespace corvexd::sim
