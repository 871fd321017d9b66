// The watch over the platform's log daemon.
#pragma once

namespace corvexd {

// Thread body: while the capture that ran when the thread started goes on, checks every minute
// whether the android log still grows; when it has not for five minutes, asks init to restart the
// log daemon and this daemon. Ends when it finds the capture stopped.
void* log_file_observer(void*);

}  // namespace corvexd
