// The floor under the daemon's jobs: for each, no more than the system calls that it cannot do
// without, on the same arguments as bench_driver takes.
#include <dirent.h>
#include <fcntl.h>
#include <limits.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/inotify.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <unistd.h>

#include <string>

namespace {

constexpr size_t kBlock = 1024;
constexpr int kStep = O_PATH | O_DIRECTORY | O_CLOEXEC;
constexpr int kSafely = O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC;

bool is_dot(const char* name) { return strcmp(name, ".") == 0 || strcmp(name, "..") == 0; }

// Opens the directory in which the last component of a path lies. Others can write there, and an
// open of the whole path would go wherever they lead it; so each step is a directory and no link.
int reach(const char* path, const char** name) {
  int folder = open(*path == '/' ? "/" : ".", kStep);
  path += strspn(path, "/");
  while (const char* slash = strchr(path, '/')) {
    char step[NAME_MAX + 1];
    snprintf(step, sizeof step, "%.*s", static_cast<int>(slash - path), path);
    int next = openat(folder, step, kStep | O_NOFOLLOW);
    close(folder);
    folder = next;
    path = slash + 1;
  }
  *name = path;
  return folder;
}

// A file that is there already may be another's that somebody has linked to here: it is looked at.
// A new one is to have exactly the mode, and what the umask takes from it only fchmod gives back.
int create_at(int folder, const char* name, int flags, mode_t mode) {
  flags |= O_CREAT | kSafely;
  int fd = openat(folder, name, flags | O_EXCL, mode);
  if (fd != -1) {
    fchmod(fd, mode);
    return fd;
  }
  struct stat status;
  fd = openat(folder, name, flags, mode);
  return fstat(fd, &status) == 0 && S_ISREG(status.st_mode) && status.st_nlink == 1 ? fd : -1;
}

int create(const char* path, int flags, mode_t mode) {
  const char* name;
  int folder = reach(path, &name);
  int fd = create_at(folder, name, flags, mode);
  close(folder);
  return fd;
}

bool is_source(const struct stat& status) {
  return S_ISFIFO(status.st_mode) || (S_ISREG(status.st_mode) && status.st_nlink == 1);
}

// Looked at once it is open: before that, something else could still take its name.
int open_source(int folder, const char* name) {
  struct stat status;
  int fd = openat(folder, name, O_RDONLY | kSafely);
  return fstat(fd, &status) == 0 && is_source(status) ? fd : -1;
}

DIR* open_below(int folder, const char* name) {
  return fdopendir(openat(folder, name, O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
}

DIR* list(const char* path) {
  const char* name;
  int folder = reach(path, &name);
  DIR* directory = open_below(folder, name);
  close(folder);
  return directory;
}

// Renames each file of a series to the next number and begins it anew.
int rotate(const char* path, int count) {
  const char* name;
  int folder = reach(path, &name);
  for (int i = count; i >= 1; --i) {
    char old_name[PATH_MAX], new_name[PATH_MAX];
    snprintf(old_name, sizeof old_name, i > 1 ? "%s.%d" : "%s", name, i - 1);
    snprintf(new_name, sizeof new_name, "%s.%d", name, i);
    renameat(folder, old_name, folder, new_name);
  }
  int fd = create_at(folder, name, O_WRONLY, 0600);
  close(folder);
  return fd;
}

int run_reader(char** arguments) {
  const char* path = arguments[1];
  const long limit = strtol(arguments[2], nullptr, 10);
  if (access(arguments[0], R_OK) != 0) return 1;
  int from = open(arguments[0], O_RDONLY | O_CLOEXEC);
  int to = create(path, O_WRONLY, 0600);
  char block[kBlock];
  long total = 0;
  int count = 0;
  for (ssize_t size; (size = read(from, block, sizeof block)) > 0;) {
    if (write(to, block, size) != size || access(path, R_OK) != 0) return 1;
    total += size;
    if (total / limit <= count) continue;
    ++count;
    close(to);
    to = rotate(path, count);
  }
  return 0;
}

int copy(int from_folder, const char* from_name, int to_folder, const char* to_name) {
  int from = open_source(from_folder, from_name);
  int to = create_at(to_folder, to_name, O_WRONLY | O_APPEND, 0644);
  // Of a FIFO, which need have no end, only as much is copied as it can hold. Whether this is one
  // and how much that is, the kernel tells in one call.
  const int capacity = fcntl(from, F_GETPIPE_SZ);
  long left = capacity == -1 ? LONG_MAX : capacity;
  char block[kBlock];
  for (ssize_t size; left > 0 && (size = read(from, block, sizeof block)) > 0; left -= size) {
    if (write(to, block, size) != size) return 1;
  }
  close(from);
  return close(to);
}

int run_copy_file(char** arguments) {
  const char *from_name, *to_name;
  int from = reach(arguments[0], &from_name);
  int to = reach(arguments[1], &to_name);
  return copy(from, from_name, to, to_name);
}

int run_copy_folder(char** arguments) {
  DIR* source = list(arguments[0]);
  const int from = dirfd(source);
  int to = dirfd(list(arguments[1]));
  while (struct dirent* entry = readdir(source)) {
    struct stat status;
    if (is_dot(entry->d_name)) continue;
    // What has vanished since the listing leaves no empty copy; a link may lead to a directory.
    bool is_file = fstatat(from, entry->d_name, &status, 0) == 0 && !S_ISDIR(status.st_mode);
    if (is_file && copy(from, entry->d_name, to, entry->d_name) != 0) return 1;
  }
  return 0;
}

int empty(DIR* directory) {
  while (struct dirent* entry = readdir(directory)) {
    struct stat status;
    const int folder = dirfd(directory);
    if (is_dot(entry->d_name)) continue;
    if (fstatat(folder, entry->d_name, &status, AT_SYMLINK_NOFOLLOW) != 0) return 1;
    if (!S_ISDIR(status.st_mode)) {
      if (unlinkat(folder, entry->d_name, 0) != 0) return 1;
      continue;
    }
    if (faccessat(folder, entry->d_name, W_OK, 0) != 0) return 1;
    if (empty(open_below(folder, entry->d_name)) != 0) return 1;
    if (unlinkat(folder, entry->d_name, AT_REMOVEDIR) != 0) return 1;
  }
  return closedir(directory);
}

int run_delete(char** arguments) { return empty(list(arguments[0])); }

long size_of(DIR* directory) {
  long total = 0;
  while (struct dirent* entry = readdir(directory)) {
    struct stat status;
    if (is_dot(entry->d_name)) continue;
    if (entry->d_type == DT_DIR) {
      total += size_of(open_below(dirfd(directory), entry->d_name));
    } else if (fstatat(dirfd(directory), entry->d_name, &status, AT_SYMLINK_NOFOLLOW) == 0) {
      total += status.st_size;
    }
  }
  closedir(directory);
  return total;
}

int run_dirsize(char** arguments) {
  const int times = arguments[1] == nullptr ? 1 : atoi(arguments[1]);
  long size = 0;
  for (int i = 0; i < times; ++i) size = size_of(list(arguments[0]));
  printf("%ld\n", size);
  return 0;
}

// Reading alone, twice as the table is made when the lines have been counted: what a line means is
// not asked.
int run_fstab(char** arguments) {
  int lines = 0;
  for (int i = atoi(arguments[1]); i > 0; --i) {
    FILE* file = fopen(arguments[0], "re");
    char line[kBlock];
    for (int pass = 0; pass < 2; ++pass) {
      lines = 0;
      fseeko(file, 0, SEEK_SET);
      while (fgets(line, sizeof line, file) != nullptr) ++lines;
    }
    fclose(file);
  }
  printf("%d\n", lines);
  return 0;
}

// Looks for the current directory and copies the artefact into it, from the directory in which it
// was seen.
int collect(const char* directory, const char* name, const char* root_path) {
  char current[NAME_MAX + 1] = {};
  DIR* root = list(root_path);
  while (struct dirent* entry = readdir(root)) {
    if (strstr(entry->d_name, "_current") != nullptr) strcpy(current, entry->d_name);
  }
  closedir(root);
  char target[PATH_MAX];
  snprintf(target, sizeof target, "%s/%s/%s", root_path, current, name);
  const char *target_name, *directory_name;
  int to = reach(target, &target_name);
  int above = reach(directory, &directory_name);
  int from = openat(above, directory_name, O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC);
  close(above);
  // A directory's files would be copied instead.
  struct stat status;
  if (fstatat(from, name, &status, AT_SYMLINK_NOFOLLOW) != 0 || S_ISDIR(status.st_mode)) return 1;
  int result = copy(from, name, to, target_name);
  close(from);
  close(to);
  return result;
}

int run_watch(char** arguments) {
  int inotify = inotify_init1(IN_CLOEXEC);
  if (inotify_add_watch(inotify, arguments[0], IN_CLOSE_WRITE | IN_MOVED_TO) == -1) return 1;
  puts("ready");
  fflush(stdout);
  static char records[32768];
  for (ssize_t size; (size = read(inotify, records, sizeof records)) > 0;) {
    struct inotify_event event;
    for (char* next = records; next < records + size; next += sizeof event + event.len) {
      memcpy(&event, next, sizeof event);
      if (event.len > 0) collect(arguments[0], next + sizeof event, arguments[1]);
    }
  }
  return 1;
}

struct sockaddr_un address_of(const char* path) {
  struct sockaddr_un address = {AF_UNIX, {}};
  strncpy(address.sun_path, path, sizeof address.sun_path - 1);
  return address;
}

int run_socket(char** arguments) {
  const struct sockaddr_un address = address_of(arguments[0]);
  int listening = socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
  unlink(arguments[0]);
  if (bind(listening, reinterpret_cast<const struct sockaddr*>(&address), sizeof address) != 0 ||
      listen(listening, 5) != 0) {
    return 1;
  }
  puts("ready");
  fflush(stdout);
  for (;;) {
    int connection = accept4(listening, nullptr, nullptr, SOCK_CLOEXEC);
    unsigned short length;
    char command[kBlock];
    while (read(connection, &length, sizeof length) == sizeof length &&
           read(connection, command, length) == length) {
    }
    shutdown(connection, SHUT_RDWR);
    close(connection);
  }
}

// The other end of a socket job: so many connections of ten commands that nobody knows.
int run_client(char** arguments) {
  const struct sockaddr_un address = address_of(arguments[0]);
  std::string ten;
  for (int i = 0; i < 10; ++i) ten.append("\x04\0NONE", 6);
  for (int i = atoi(arguments[1]); i > 0; --i) {
    int fd = socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
    char end;
    if (connect(fd, reinterpret_cast<const struct sockaddr*>(&address), sizeof address) != 0 ||
        write(fd, ten.data(), ten.size()) != static_cast<ssize_t>(ten.size()) ||
        shutdown(fd, SHUT_WR) != 0 || read(fd, &end, 1) != 0) {
      return 1;
    }
    close(fd);
  }
  return 0;
}

// A node of which each read gives one record: lines of 128 bytes, as the kernel log's are long.
int run_records(char** arguments) {
  int fifo = open(arguments[0], O_WRONLY | O_CLOEXEC);
  if (fcntl(fifo, F_SETFL, O_DIRECT) == -1) return 1;
  char record[128];
  memset(record, 'r', sizeof record);
  record[sizeof record - 1] = '\n';
  for (int i = atoi(arguments[1]); i > 0; --i) {
    if (write(fifo, record, sizeof record) != sizeof record) return 1;
  }
  return 0;
}

struct Job {
  const char* name;
  int fewest;
  int (*run)(char** arguments);
};

constexpr Job kJobs[] = {
    {"reader", 3, run_reader},
    {"copy_file", 2, run_copy_file},
    {"copy_folder", 2, run_copy_folder},
    {"delete", 1, run_delete},
    {"dirsize", 1, run_dirsize},
    {"fstab", 2, run_fstab},
    {"watch", 2, run_watch},
    {"socket", 1, run_socket},
    {"client", 2, run_client},
    {"records", 2, run_records},
};

}  // namespace

int main(int argc, char** argv) {
  for (const Job& job : kJobs) {
    if (argc >= job.fewest + 2 && strcmp(argv[1], job.name) == 0) return job.run(argv + 2);
  }
  return 2;
}
