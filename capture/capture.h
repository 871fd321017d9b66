// The start and the end of a capture.
#pragma once

namespace corvexd {

// Passes the mark of the current log directory to a new one and starts a capture into it. Main
// thread.
void begin_capture();

// Starts a capture into LOG_DIR: dumps the properties, starts the thread that copies earlier logs
// and every recorder whose switch is on. Main thread. Returns after about two seconds and waits for
// no recorder; one that could not be started is missing from this capture. A capture that already
// runs goes on beside it, and "LOGSTOP" no longer reaches its recorders.
void executeLogcat();

// Ends the recorders of the latest capture whose switches are on, with SIGTERM. Main thread.
// Returns at once; the others keep running.
void stopLogcat();

}  // namespace corvexd
