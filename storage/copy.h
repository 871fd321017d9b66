// The two copies that the whole daemon uses.
#pragma once

namespace corvexd {

// Appends the content of `src` to `dst`, which is created with mode 0644 when missing and given to
// the system user while the log root lies in the data partition. A FIFO or device is read as far as
// it can be without waiting. Any thread. Returns 1 when both could be opened, -1 otherwise
// (logged); what a read or write error in the middle leaves stays.
int copy_file(const char* src, const char* dst);

// The same to the file `name` in the open directory `folder`; `dst` is its path for the log.
int copy_file_at(int folder, const char* name, const char* src, const char* dst);

// Copies every entry of `src_dir` that is not a directory into LOG_DIR + `sub`, which is made (one
// level) when missing. Both names end in "/". Any thread; LOG_DIR is read once, at the start. What
// cannot be copied is logged and passed over.
void copy_folder(const char* src_dir, const char* sub);

}  // namespace corvexd
