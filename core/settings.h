// The thirteen settings, read from system properties once when the daemon starts.
#pragma once

namespace corvexd {

// Texts as the properties hold them, never validated. Empty until loadSettings has run, which is
// before any thread that reads them is started; unchanged ever after.
extern char lograw[200];         // logcat's output format
extern char loglevel[200];       // logcat's filter specification
extern char maskothers[8];       // a further filter argument, passed even when empty
extern char android_logsize[8];  // sizes in KiB, counts in files
extern char android_lognum[8];
extern char event_logsize[8];
extern char event_lognum[8];
extern char kernel_logsize[8];
extern char kernel_lognum[8];
extern char radio_logsize[8];
extern char radio_lognum[8];
extern char tcpdump_logsize[8];  // millions of bytes
extern char tcpdump_lognum[8];

// Fills every setting. A value longer than its setting holds is refused with an error line in
// favour of the default: a number cut short would be another number.
void loadSettings();

}  // namespace corvexd
