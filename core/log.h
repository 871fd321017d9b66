// The daemon's diagnostics: one line of the Android log each, with the tag "corvexd".
#pragma once

namespace corvexd {

// Write one line at the priority of the name. The text goes out as it is formatted, line end or
// none; errno is left as it was. Safe on any thread, in signal handlers and in a child before it
// execs: no lock, no allocation (so formats hold only %s, %d and their like).
void log_debug(const char* format, ...) __attribute__((format(printf, 1, 2)));
void log_info(const char* format, ...) __attribute__((format(printf, 1, 2)));
void log_error(const char* format, ...) __attribute__((format(printf, 1, 2)));

}  // namespace corvexd
