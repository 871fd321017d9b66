#include "simulator/toolbox/logcat_options.h"

#include <log/log_id.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <unistd.h>

#include <string>

namespace corvexd::sim {
namespace {

constexpr uint32_t kDefaultBuffers = 1u << LOG_ID_MAIN | 1u << LOG_ID_SYSTEM | 1u << LOG_ID_CRASH;

bool complain(const char* problem, const char* argument) {
  fprintf(stderr, "logcat: %s \"%s\"\n", problem, argument);
  return false;
}

bool add_buffer(const char* name, uint32_t* buffers) {
  log_id_t id = android_name_to_log_id(name);
  if (id <= LOG_ID_CRASH || id == LOG_ID_KERNEL) {
    *buffers |= 1u << id;
    return true;
  }
  return complain("no buffer", name);
}

// A format, or one with modifiers as in "time,usec". An empty text changes nothing.
bool set_format(const char* text, AndroidLogFormat* format) {
  std::string rest = text;
  char* position = nullptr;
  for (char* word = strtok_r(rest.data(), ", ", &position); word != nullptr;
       word = strtok_r(nullptr, ", ", &position)) {
    AndroidLogPrintFormat value = android_log_formatFromString(word);
    if (value == FORMAT_OFF) return complain("no format", word);
    android_log_setPrintFormat(format, value);
  }
  return true;
}

// A decimal number from `least` to `most`.
template <typename Number>
bool set_number(const char* text, Number least, Number most, Number* number) {
  char* end;
  unsigned long long value = strtoull(text, &end, 10);
  if (text[0] < '0' || text[0] > '9' || *end != '\0' || value < static_cast<uint64_t>(least) ||
      value > static_cast<uint64_t>(most)) {
    return complain("no usable number", text);
  }
  *number = static_cast<Number>(value);
  return true;
}

bool take_option(int option, LogcatOptions* options) {
  switch (option) {
    case 'b':
      return add_buffer(optarg, &options->buffers);
    case 'v':
      return set_format(optarg, options->format.get());
    case 'f':
      options->file = optarg;
      return true;
    case 'r':
      return set_number<uint64_t>(optarg, 1, UINT32_MAX, &options->rotate_kib);
    case 'n':
      return set_number<int>(optarg, 1, 9999, &options->rotate_count);
    case 'c':
      return options->clear = true;
    case 'd':
      return options->dump = true;
    default:
      fprintf(stderr,
              "usage: logcat [-b BUFFER]... [-v FORMAT] [-f FILE [-r KIB] [-n COUNT]] [-c] [-d] "
              "[FILTER]...\n");
      return false;
  }
}

}  // namespace

bool parse_logcat_options(int argc, char** argv, LogcatOptions* options) {
  android_log_setPrintFormat(options->format.get(), FORMAT_THREADTIME);
  for (int option; (option = getopt(argc, argv, "b:v:f:r:n:cd")) != -1;) {
    if (!take_option(option, options)) return false;
  }
  for (int i = optind; i < argc; ++i) {
    if (argv[i][0] == '\0') continue;
    if (android_log_addFilterString(options->format.get(), argv[i]) != 0) {
      return complain("no filter", argv[i]);
    }
  }
  if (options->rotate_kib > 0 && options->file == nullptr) {
    fprintf(stderr, "logcat: -r needs -f\n");
    return false;
  }
  if (options->buffers == 0) options->buffers = kDefaultBuffers;
  return true;
}

}  // namespace corvexd::sim
