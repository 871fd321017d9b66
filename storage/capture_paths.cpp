#include "storage/capture_paths.h"

#include "core/state.h"

namespace corvexd {

PublishedPath android_log_path;
PublishedPath radio_log_path;
PublishedPath event_log_path;
PublishedPath kernel_log_path;
PublishedPath qsee_log_path;
PublishedPath tz_log_path;
PublishedPath tcpdump_path;
PublishedPath bootloader_log_path;
PublishedPath pre_bootloader_log_path;

namespace {

struct CapturePath {
  PublishedPath* path;
  const char* suffix;
};

constexpr CapturePath kCapturePaths[] = {
    {&android_log_path, "/android.log"},
    {&radio_log_path, "/radio.log"},
    {&event_log_path, "/event.log"},
    {&kernel_log_path, "/kernel.log"},
    {&qsee_log_path, "/qsee.log"},
    {&tz_log_path, "/tz.log"},
    {&tcpdump_path, "/tcpdump"},
    {&bootloader_log_path, "/bootloader.log"},
    {&pre_bootloader_log_path, "/pre_bootloader.log"},
};

}  // namespace

void makeLogAbsolutePath() {
  const Path directory = LOG_DIR.get();
  for (const CapturePath& row : kCapturePaths) row.path->set(Path(directory).append(row.suffix));
}

}  // namespace corvexd
