#include "core/state.h"

#include <cutils/properties.h>
#include <string.h>

#include "core/log.h"

namespace corvexd {
namespace {

constexpr char kDataRoot[] = "/data/corvex";
constexpr char kDataPrefix[] = "/data/corvex/KVBR_";
constexpr char kSharedRoot[] = "/storage/emulated/0/corvex";
constexpr char kSharedPrefix[] = "/storage/emulated/0/corvex/KVBR_";

}  // namespace

std::atomic<const char*> LOG_ROOT{kDataRoot};
std::atomic<const char*> LOG_PATH{kDataPrefix};
std::atomic<uint8_t> isInDataPartition{1};
std::atomic<const char*> cache_path{"/cache/"};
PublishedPath LOG_DIR;
Path cache_file_path;

Path cache_file(const char* name) { return Path().append(cache_path).append(name); }

void checkLogPath() {
  char watchdog[PROPERTY_VALUE_MAX] = {};
  char path[PROPERTY_VALUE_MAX] = {};
  property_get("sys.debug.watchdog", watchdog, "false");
  property_get("persist.sys.corvex.path", path, "data");
  bool in_data = strcmp(watchdog, "false") == 0 && strcmp(path, "data") == 0;
  LOG_ROOT = in_data ? kDataRoot : kSharedRoot;
  LOG_PATH = in_data ? kDataPrefix : kSharedPrefix;
  isInDataPartition = in_data ? 1 : 0;
  log_info("corvexd watchdogProp : %s, log_path : %s \n", watchdog, path);
  log_info("corvexd LOG_ROOT : %s\n", LOG_ROOT.load());
}

}  // namespace corvexd
