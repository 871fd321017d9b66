// Runs one job of the daemon's code by itself, for whoever measures it from outside. Prints nothing
// but the job's result, and ends with status 0 when it is done.
#include <android-base/unique_fd.h>
#include <android/log.h>
#include <cutils/sockets.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/inotify.h>
#include <sys/socket.h>
#include <unistd.h>

#include <string>

#include "capture/node_reader.h"
#include "collect/artefact_mover.h"
#include "collect/file_observer.h"
#include "core/directory.h"
#include "core/exit.h"
#include "core/state.h"
#include "early/initial_log.h"
#include "fs_mgr/fs_mgr_fstab.h"
#include "service/control_socket.h"
#include "storage/copy.h"
#include "storage/delete.h"

using android::base::unique_fd;

namespace corvexd {
namespace {

bool error_logged = false;

void say_ready() {
  puts("ready");
  fflush(stdout);
}

int run_reader(char** arguments) {
  static int64_t rotation_size = strtoll(arguments[2], nullptr, 10);
  static PublishedPath destination;
  int32_t from_fd = -1, to_fd = -1;
  NodeReader reader = kQseeReader;
  reader.source = arguments[0];
  reader.output = &destination;
  reader.from_fd = &from_fd;
  reader.to_fd = &to_fd;
  reader.at_end = AtEnd::kStop;
  reader.rotation_size = [] { return rotation_size; };
  Path path = Path().append(arguments[1]);
  if (!path.fits()) return 1;
  destination.set(path);
  run_node_reader(reader);
  return error_logged ? 1 : 0;
}

int run_copy_file(char** arguments) { return copy_file(arguments[0], arguments[1]) == 1 ? 0 : 1; }

// The parent of the destination plays the log directory.
int run_copy_folder(char** arguments) {
  std::string source = std::string(arguments[0]) + "/", destination = arguments[1];
  while (destination.size() > 1 && destination.back() == '/') destination.pop_back();
  const size_t slash = destination.rfind('/');
  const std::string parent = slash == std::string::npos ? "." : destination.substr(0, slash);
  const std::string below = "/" + destination.substr(slash + 1) + "/";
  if (!open_directory(source.c_str()) || !open_directory(destination.c_str())) return 1;
  LOG_DIR.set(Path().append(parent.c_str()));
  copy_folder(source.c_str(), below.c_str());
  return 0;
}

int run_delete(char** arguments) {
  if (deleteLog(arguments[0]) != 0) return 1;
  Directory root = open_directory(arguments[0]);
  return root && next_entry(root) == nullptr ? 0 : 1;
}

int run_dirsize(char** arguments) {
  const int times = arguments[1] == nullptr ? 1 : atoi(arguments[1]);
  int32_t size = -1;
  for (int i = 0; i < times; ++i) size = getDirSize(arguments[0]);
  printf("%d\n", size);
  return size == -1 ? 1 : 0;
}

int run_fstab(char** arguments) {
  int entries = -1;
  for (int i = atoi(arguments[1]); i > 0; --i) {
    struct fstab* table = fs_mgr_read_fstab(arguments[0]);
    if (table == nullptr) return 1;
    entries = table->entry_count;
    fs_mgr_free_fstab(table);
  }
  printf("%d\n", entries);
  return 0;
}

// Every file that is closed after writing or moved in is taken for an artefact of that directory.
int run_watch(char** arguments) {
  LOG_ROOT = arguments[1];
  unique_fd inotify(inotify_init1(IN_CLOEXEC));
  if (inotify_add_watch(inotify, arguments[0], IN_CLOSE_WRITE | IN_MOVED_TO) == -1) {
    perror(arguments[0]);
    return 1;
  }
  say_ready();
  static char records[32768];
  for (ssize_t size; (size = read(inotify, records, sizeof records)) > 0;) {
    EventReader reader(records, size);
    for (Event event; reader.read(&event);) movefile(arguments[0], event.name);
  }
  return 1;
}

int run_socket(char** arguments) {
  listening_socket =
      socket_local_server(arguments[0], ANDROID_SOCKET_NAMESPACE_FILESYSTEM, SOCK_STREAM);
  if (listening_socket == -1) {
    perror(arguments[0]);
    return 1;
  }
  say_ready();
  serve_clients();
}

struct Job {
  const char* name;
  const char* arguments;
  int fewest, most;
  int (*run)(char** arguments);
};

constexpr Job kJobs[] = {
    {"reader", "SRC DST LIMIT", 3, 3, run_reader},
    {"copy_file", "SRC DST", 2, 2, run_copy_file},
    {"copy_folder", "SRC DST", 2, 2, run_copy_folder},
    {"delete", "ROOT", 1, 1, run_delete},
    {"dirsize", "ROOT [N]", 1, 2, run_dirsize},
    {"fstab", "FILE N", 2, 2, run_fstab},
    {"watch", "DIR ROOT", 2, 2, run_watch},
    {"socket", "PATH", 1, 1, run_socket},
};

}  // namespace
}  // namespace corvexd

int main(int argc, char** argv) {
  // Nobody reads what it says; what it costs to say it is not what is measured.
  __android_log_set_logger([](const struct __android_logger_data* data, const char*) {
    if (data->priority >= ANDROID_LOG_ERROR) corvexd::error_logged = true;
  });
  corvexd::isInDataPartition = 0;  // whoever measures keeps what is made
  for (const corvexd::Job& job : corvexd::kJobs) {
    if (argc < job.fewest + 2 || argc > job.most + 2 || strcmp(argv[1], job.name) != 0) continue;
    return job.run(argv + 2);
  }
  for (const corvexd::Job& job : corvexd::kJobs) {
    fprintf(stderr, "usage: bench_driver %s %s\n", job.name, job.arguments);
  }
  return 2;
}
