// Safe access to files where other users can write: output, sources of copies, owners.
#pragma once

#include <android-base/unique_fd.h>
#include <sys/types.h>

namespace corvexd {

// All of these: close-on-exec, never waiting for the other end of a FIFO; the caller owns the
// descriptor, which is -1 with errno set on failure.

// Open a file for writing, with open(2)'s `flags` and O_CREAT. It is a regular file that bears no
// other name, and no link is followed to it; anything else is a failure. A file that it creates has
// exactly `mode`; the umask neither counts nor changes.
android::base::unique_fd open_output(const char* path, int flags, mode_t mode);
android::base::unique_fd open_output_at(int folder, const char* name, int flags, mode_t mode);

// The same for the output of a program, as a shell opens it: emptied, and created with what the
// umask leaves of 0666.
android::base::unique_fd open_program_output(const char* path);
android::base::unique_fd open_program_output_at(int folder, const char* name);

// Which symbolic links may lead to a source: none, or those that the daemon's own user has made, if
// they name a file and not a directory on the way.
enum class Links { kNone, kOwn };

// Opens a file to be copied: a regular file that bears no other name, or a FIFO.
android::base::unique_fd open_source_at(int folder, const char* name, Links links);

// Give an open file or directory, or a regular file by its name, to the system user while the log
// root lies in the data partition; elsewhere do nothing. 0, or -1 with errno set.
int give_to_system(int fd);
int give_to_system_at(int folder, const char* name);

}  // namespace corvexd
