// A text of fixed capacity that knows when something did not fit.
#pragma once

#include <stdarg.h>
#include <stdio.h>
#include <string.h>

#include "core/log.h"

namespace corvexd {

// Holds a NUL-terminated text of at most N - 1 characters, on the stack or in static storage. A
// text that does not fit is cut, and fits() stays false until the next clear(). Ask it before using
// a composed path, so that no cut name is ever opened, renamed or removed.
template <size_t N>
class FixedString {
 public:
  FixedString& clear() {
    text_[0] = '\0';
    length_ = 0;
    fits_ = true;
    return *this;
  }

  FixedString& append(const char* text) { return append(text, strlen(text)); }

  FixedString& append(const char* text, size_t length) {
    if (length > N - 1 - length_) {
      length = N - 1 - length_;
      fits_ = false;
    }
    memcpy(text_ + length_, text, length);
    length_ += length;
    text_[length_] = '\0';
    return *this;
  }

  __attribute__((format(printf, 2, 3))) FixedString& append_format(const char* format, ...) {
    va_list arguments;
    va_start(arguments, format);
    int wanted = vsnprintf(text_ + length_, N - length_, format, arguments);
    va_end(arguments);
    if (wanted < 0 || static_cast<size_t>(wanted) > N - 1 - length_) fits_ = false;
    length_ += strlen(text_ + length_);
    return *this;
  }

  bool empty() const { return length_ == 0; }
  bool fits() const { return fits_; }
  const char* c_str() const { return text_; }

  // Like fits(), but a text that does not fit is reported in one error line.
  bool fits_or_log() const {
    if (!fits_) log_error("corvexd: too long, skipped: %s...\n", text_);
    return fits_;
  }

 private:
  char text_[N] = {};
  size_t length_ = 0;
  bool fits_ = true;
};

// The capacity of the daemon's paths.
constexpr size_t kPathSize = 200;
using Path = FixedString<kPathSize>;

// For paths that may be cut: an artefact with a very long name is kept under the part that fits.
using LongPath = FixedString<256>;

}  // namespace corvexd
