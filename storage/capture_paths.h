// The files of a capture in its log directory.
#pragma once

#include "core/published_path.h"

namespace corvexd {

// Empty until the first makeLogAbsolutePath; then in the log directory of that moment.
extern PublishedPath android_log_path;
extern PublishedPath radio_log_path;
extern PublishedPath event_log_path;
extern PublishedPath kernel_log_path;
extern PublishedPath qsee_log_path;
extern PublishedPath tz_log_path;
extern PublishedPath tcpdump_path;
extern PublishedPath bootloader_log_path;
extern PublishedPath pre_bootloader_log_path;

// Sets the nine paths from LOG_DIR. Main thread.
void makeLogAbsolutePath();

}  // namespace corvexd
