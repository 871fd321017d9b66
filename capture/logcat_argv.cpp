#include "capture/logcat_argv.h"

#include <algorithm>
#include <initializer_list>

#include "capture/children.h"
#include "core/settings.h"

namespace corvexd {
namespace {

const char** append(const char** end, std::initializer_list<const char*> texts) {
  return std::copy(texts.begin(), texts.end(), end);
}

}  // namespace

LogcatArgv logcat_argv(const LogcatJob& job, const char* file) {
  LogcatArgv vector;
  const char** end =
      append(vector.arguments, {"logcat", "-f", file, "-r", job.size, "-n", job.count});
  for (const char* buffer : job.buffers) {
    if (buffer != nullptr) end = append(end, {"-b", buffer});
  }
  if (job.formatted) append(end, {"-v", lograw, loglevel, maskothers});
  return vector;
}

void exec_logcat(const LogcatJob& job, const char* file) {
  exec_program("/system/bin/logcat", logcat_argv(job, file).arguments);
}

}  // namespace corvexd
