#include "storage/earlier_logs.h"

#include "core/fixed_string.h"
#include "core/state.h"
#include "storage/copy.h"

namespace corvexd {
namespace {

struct EarlierLogs {
  bool in_cache;  // below the cache log directory
  const char* source;
  const char* sub;
};

constexpr EarlierLogs kEarlierLogs[] = {
    {true, "log_before_initial/", "/log_before_initial/"},
    {false, "/data/anr/", "/anr/"},
    {false, "/data/system/dropbox/", "/anr/"},
    {true, "recovery/", "/recovery/"},
    {true, "lkmsg/", "/kmsg/"},
};

}  // namespace

void* copy_file_already_exist(void*) {
  for (const EarlierLogs& logs : kEarlierLogs) {
    const Path source = logs.in_cache ? cache_file(logs.source) : Path().append(logs.source);
    copy_folder(source.c_str(), logs.sub);
  }
  return nullptr;
}

}  // namespace corvexd
