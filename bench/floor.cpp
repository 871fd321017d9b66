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

bool is_dot(const char* name) { return strcmp(name, ".") == 0 || strcmp(name, "..") == 0; }

int create_at(int folder, const char* name, int flags, mode_t mode) {
  flags |= O_CREAT | O_CLOEXEC;
  int fd = openat(folder, name, flags | O_EXCL, mode);
  if (fd == -1) return openat(folder, name, flags, mode);
  fchmod(fd, mode);
  return fd;
}

int run_reader(char** arguments) {
  const char* path = arguments[1];
  const long limit = strtol(arguments[2], nullptr, 10);
  if (access(arguments[0], R_OK) != 0) return 1;
  int from = open(arguments[0], O_RDONLY | O_CLOEXEC);
  int to = create_at(AT_FDCWD, path, O_WRONLY, 0600);
  char block[kBlock];
  long total = 0;
  int count = 0;
  for (ssize_t size; (size = read(from, block, sizeof block)) > 0;) {
    if (write(to, block, size) != size || access(path, R_OK) != 0) return 1;
    total += size;
    if (total / limit <= count) continue;
    ++count;
    close(to);
    for (int i = count; i >= 1; --i) {
      char old_name[PATH_MAX], new_name[PATH_MAX];
      snprintf(old_name, sizeof old_name, i > 1 ? "%s.%d" : "%s", path, i - 1);
      snprintf(new_name, sizeof new_name, "%s.%d", path, i);
      rename(old_name, new_name);
    }
    to = create_at(AT_FDCWD, path, O_WRONLY, 0600);
  }
  return 0;
}

int copy_at(const char* source, int folder, const char* name) {
  int from = open(source, O_RDONLY | O_NONBLOCK | O_CLOEXEC);
  int to = create_at(folder, name, O_WRONLY | O_APPEND | O_NONBLOCK, 0644);
  char block[kBlock];
  for (ssize_t size; (size = read(from, block, sizeof block)) > 0;) {
    if (write(to, block, size) != size) return 1;
  }
  close(from);
  return close(to);
}

int run_copy_file(char** arguments) { return copy_at(arguments[0], AT_FDCWD, arguments[1]); }

int run_copy_folder(char** arguments) {
  DIR* source = opendir(arguments[0]);
  int folder = open(arguments[1], O_RDONLY | O_DIRECTORY | O_CLOEXEC);
  while (struct dirent* entry = readdir(source)) {
    char path[PATH_MAX];
    struct stat status;
    if (is_dot(entry->d_name)) continue;
    snprintf(path, sizeof path, "%s/%s", arguments[0], entry->d_name);
    if (stat(path, &status) != 0 || S_ISDIR(status.st_mode)) continue;
    if (copy_at(path, folder, entry->d_name) != 0) return 1;
  }
  return 0;
}

DIR* open_below(int folder, const char* name) {
  return fdopendir(openat(folder, name, O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
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

int run_delete(char** arguments) { return empty(opendir(arguments[0])); }

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
  for (int i = 0; i < times; ++i) size = size_of(opendir(arguments[0]));
  printf("%ld\n", size);
  return 0;
}

// Reading alone: what a line means is not asked.
int run_fstab(char** arguments) {
  int lines = 0;
  for (int i = atoi(arguments[1]); i > 0; --i) {
    FILE* file = fopen(arguments[0], "re");
    char line[kBlock];
    lines = 0;
    while (fgets(line, sizeof line, file) != nullptr) ++lines;
    fclose(file);
  }
  printf("%d\n", lines);
  return 0;
}

// As the mover does it: looks for the current directory, makes sure of each component of its path,
// looks at the artefact, and copies it.
int collect(const char* directory, const char* name, const char* root_path) {
  char current[PATH_MAX] = {}, source[PATH_MAX];
  DIR* root = opendir(root_path);
  while (struct dirent* entry = readdir(root)) {
    if (strstr(entry->d_name, "_current") == nullptr) continue;
    snprintf(current, sizeof current, "%s/%s/", root_path, entry->d_name);
  }
  closedir(root);
  for (char* slash = current; (slash = strchr(slash + 1, '/')) != nullptr; *slash = '/') {
    *slash = '\0';
    if (access(current, F_OK) != 0) return 1;
  }
  if (access(current, F_OK) != 0) return 1;
  int folder = open(current, O_PATH | O_DIRECTORY | O_CLOEXEC);
  DIR* from = opendir(directory);
  struct stat status;
  snprintf(source, sizeof source, "%s/%s", directory, name);
  int result = lstat(source, &status) == 0 ? copy_at(source, folder, name) : 1;
  closedir(from);
  close(folder);
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
