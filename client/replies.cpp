#include "client/replies.h"

#include <stdio.h>
#include <string.h>

namespace corvexd {
namespace {

const char kSuccess[] = "CLEANSUCCESS";
const char kFailed[] = "CLEANFAILED";

bool is_start_of(const std::string& text, const char* reply) {
  return strncmp(text.c_str(), reply, text.size()) == 0;
}

}  // namespace

bool Replies::receive(const char* data, size_t size) {
  pending_.append(data, size);
  while (true) {
    if (take(kSuccess)) continue;
    if (!take(kFailed)) break;
    any_failed_ = true;
  }
  return is_start_of(pending_, kSuccess) || is_start_of(pending_, kFailed);
}

bool Replies::take(const char* reply) {
  const size_t length = strlen(reply);
  if (pending_.compare(0, length, reply) != 0) return false;
  pending_.erase(0, length);
  ++count_;
  puts(reply);
  // A reader at the other end of a pipe sees it now, though the connection may last for minutes.
  fflush(stdout);
  return true;
}

}  // namespace corvexd
