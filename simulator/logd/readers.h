// The readers of the log: each gets its lines as fast as it takes them.
#pragma once

#include <android-base/unique_fd.h>
#include <poll.h>

#include <vector>

#include "simulator/common/protocol.h"
#include "simulator/logd/log_store.h"

namespace corvexd::sim {

// Nothing waits here for a reader and nothing is kept for one but its place in the store: a reader
// that is too slow finds its oldest lines gone from the store, as on a device.
class Readers {
 public:
  // `listener` stays the caller's; `store` must live as long as this.
  Readers(int listener, LogStore* store) : listener_(listener), store_(store) {}

  // Adds what is to be waited for: the listener and one entry for each reader.
  void add_to(std::vector<struct pollfd>* polls) const;

  // Serves the readers from the answers to those entries, which begin at `polls`.
  void serve(const struct pollfd* polls);

 private:
  struct Reader {
    android::base::unique_fd fd;
    bool asked = false;
    uint32_t buffers = 0;
    LogPosition position = {};
    LogPosition end = {};
    bool ends = false;  // with the line before `end`
  };

  void accept_reader();
  bool is_done(const Reader& reader) const;
  bool take_request(Reader* reader);
  bool send_lines(Reader* reader);

  int listener_;
  LogStore* store_;
  std::vector<Reader> readers_;
};

}  // namespace corvexd::sim
