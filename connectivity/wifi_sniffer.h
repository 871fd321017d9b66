// The Wi-Fi driver's packet log, switched by its command-line tools.
#pragma once

#include "capture/children.h"

namespace corvexd {

// The latest child of each job; it keeps its number when the child has ended.
extern ChildSlot sniff_set_pid;
extern ChildSlot sniff_start_pid;
extern ChildSlot sniff_stop_pid;

// Run the tools; a child of the same job that still runs is ended first. Main thread. The start
// takes about five seconds, the stop returns at once. The tools' exit status is ignored.
void wifi_snifflog_start();
void wifi_snifflog_stop();

}  // namespace corvexd
