// Preloaded, has a program ask for its session whenever it allocates, which none of the daemon's
// jobs does: whoever counts the program's system calls counts its allocations with them, those that
// the C library makes for it included.
#include <errno.h>
#include <stddef.h>
#include <sys/syscall.h>
#include <unistd.h>

extern "C" {

// What the C library does behind the names that are taken below; its own names are reserved.
void* libc_malloc(size_t size) asm("__libc_malloc");
void* libc_calloc(size_t count, size_t size) asm("__libc_calloc");
void* libc_realloc(void* memory, size_t size) asm("__libc_realloc");

}  // extern "C"

namespace {

void tell() {
  const int saved_errno = errno;
  syscall(SYS_getsid, 0);
  errno = saved_errno;
}

}  // namespace

extern "C" {

void* malloc(size_t size) {
  tell();
  return libc_malloc(size);
}

void* calloc(size_t count, size_t size) {
  tell();
  return libc_calloc(count, size);
}

void* realloc(void* memory, size_t size) {
  tell();
  return libc_realloc(memory, size);
}

}  // extern "C"
