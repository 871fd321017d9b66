#include "simulator/init/services.h"

#include <fcntl.h>
#include <signal.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <time.h>
#include <unistd.h>

#include "simulator/common/protocol.h"

using android::base::unique_fd;

namespace corvexd::sim {
namespace {

constexpr int64_t kLeastBetweenStarts = 1000;  // milliseconds
constexpr size_t kMaxSockets = 2;
constexpr gid_t kSystem = 1000;

struct ServiceSocket {
  const char* name;  // at /dev/socket, and in the service's environment
  int type;
  mode_t mode;
  bool names_writers;  // each datagram comes with its writer's process and user
};

int64_t milliseconds_now() {
  struct timespec now;
  clock_gettime(CLOCK_MONOTONIC, &now);
  return now.tv_sec * 1000 + now.tv_nsec / 1000000;
}

}  // namespace

enum class Runs { kFromBoot, kOnceAtBoot, kWhenAsked };  // the first is started again when it ends

struct ServiceDefinition {
  const char* name;
  const char* const arguments[6];
  Runs runs;
  ServiceSocket sockets[kMaxSockets];
};

namespace {

constexpr ServiceDefinition kServices[] = {
    {"logd",
     {"/system/bin/logd"},
     Runs::kFromBoot,
     {{"logdw", SOCK_DGRAM | SOCK_NONBLOCK, 0222, true}, {"logdr", SOCK_SEQPACKET, 0666, false}}},
    {"firmware", {"/system/bin/firmware"}, Runs::kFromBoot, {}},
    // With a /proc of its own, in which the firmware's nodes are.
    {"corvexd",
     {"/usr/bin/unshare", "--mount", "/system/bin/sh", "-c",
      "mount --bind /dev/nodes/proc /proc && exec /system/bin/corvexd"},
     Runs::kFromBoot,
     {{"corvexd", SOCK_STREAM, 0660, false}}},
    {"start_storage", {"/system/bin/start_storage"}, Runs::kOnceAtBoot, {}},
    {"logd-reinit",
     {"/system/bin/log", "-t", "logd-reinit", "log buffers kept as they are"},
     Runs::kWhenAsked,
     {}},
    {"diag_mdlog_start",
     {"/system/bin/log", "-t", "diag_mdlog", "diagnostic logging asked for"},
     Runs::kWhenAsked,
     {}},
};

unique_fd make_socket(const ServiceSocket& socket) {
  std::string path = std::string("/dev/socket/") + socket.name;
  unique_fd fd = bind_at(path.c_str(), socket.type);
  int on = 1;
  if (fd == -1 || chmod(path.c_str(), socket.mode) != 0 ||
      (socket.names_writers && setsockopt(fd, SOL_SOCKET, SO_PASSCRED, &on, sizeof on) != 0)) {
    fprintf(stderr, "init: %s: %m\n", path.c_str());
  }
  // Without root on the machine the device may lack the group: then the socket is root's alone.
  int ignored = chown(path.c_str(), 0, kSystem);
  (void)ignored;
  return fd;
}

[[noreturn]] void become(const ServiceDefinition& definition, const unique_fd* sockets) {
  for (size_t i = 0; i < kMaxSockets; ++i) {
    if (sockets[i] == -1) continue;
    fcntl(sockets[i], F_SETFD, 0);
    std::string variable = std::string("ANDROID_SOCKET_") + definition.sockets[i].name;
    setenv(variable.c_str(), std::to_string(sockets[i]).c_str(), 1);
  }
  sigset_t none;
  sigemptyset(&none);
  sigprocmask(SIG_SETMASK, &none, nullptr);
  setpgid(0, 0);
  umask(077);
  execv(definition.arguments[0], const_cast<char* const*>(definition.arguments));
  fprintf(stderr, "init: %s: %m\n", definition.arguments[0]);
  _exit(127);
}

}  // namespace

Services::Services() {
  for (const ServiceDefinition& definition : kServices) services_.push_back({&definition});
}

Services::Service* Services::find(const std::string& name) {
  for (Service& service : services_) {
    if (name == service.definition->name) return &service;
  }
  return nullptr;
}

bool Services::start(const std::string& name) {
  Service* service = find(name);
  if (service == nullptr) return false;
  if (service->pid == 0 || service->definition->runs == Runs::kFromBoot) service->wanted = true;
  start_due();
  return true;
}

bool Services::stop(const std::string& name) {
  Service* service = find(name);
  if (service == nullptr) return false;
  service->wanted = false;
  if (service->pid > 0) kill(-service->pid, SIGKILL);
  return true;
}

bool Services::restart(const std::string& name) {
  if (!stop(name)) return false;
  find(name)->wanted = true;
  start_due();
  return true;
}

void Services::start_at_boot() {
  for (Service& service : services_) service.wanted = service.definition->runs != Runs::kWhenAsked;
  start_due();
}

// The sockets are made on this side, so that they stand when this returns.
void Services::launch(Service* service) {
  const ServiceDefinition& definition = *service->definition;
  service->last_start = milliseconds_now();
  unique_fd sockets[kMaxSockets];
  for (size_t i = 0; i < kMaxSockets; ++i) {
    if (definition.sockets[i].name != nullptr) sockets[i] = make_socket(definition.sockets[i]);
  }
  pid_t pid = fork();
  if (pid == 0) become(definition, sockets);
  if (pid < 0) {
    fprintf(stderr, "init: no process for %s: %m\n", definition.name);
    return;
  }
  // On both sides: a group that is to be killed is there from the first moment.
  setpgid(pid, pid);
  service->pid = pid;
  service->wanted = definition.runs == Runs::kFromBoot;
}

// The rest of a group goes while its ended leader keeps the number from being used again.
void Services::reap() {
  for (;;) {
    siginfo_t ended;
    ended.si_pid = 0;
    if (waitid(P_ALL, 0, &ended, WEXITED | WNOHANG | WNOWAIT) != 0 || ended.si_pid == 0) return;
    for (Service& service : services_) {
      if (service.pid != ended.si_pid) continue;
      kill(-service.pid, SIGKILL);
      service.pid = 0;
      if (service.definition->runs != Runs::kFromBoot) continue;
      fprintf(stderr, "init: %s ended with %s %d\n", service.definition->name,
              ended.si_code == CLD_EXITED ? "status" : "signal", ended.si_status);
    }
    waitpid(ended.si_pid, nullptr, 0);
  }
}

int Services::start_due() {
  int64_t now = milliseconds_now();
  int64_t wait = -1;
  for (Service& service : services_) {
    if (!service.wanted || service.pid > 0) continue;
    int64_t left = service.last_start + kLeastBetweenStarts - now;
    if (left <= 0) {
      launch(&service);
    } else if (wait < 0 || left < wait) {
      wait = left;
    }
  }
  return static_cast<int>(wait);
}

}  // namespace corvexd::sim
