// The device's first process: serves the properties and keeps the services running.
#include <fcntl.h>
#include <signal.h>
#include <stdio.h>
#include <sys/signalfd.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <time.h>
#include <unistd.h>

#include "simulator/init/property_service.h"
#include "simulator/init/property_store.h"
#include "simulator/init/services.h"

using android::base::unique_fd;

namespace corvexd::sim {
namespace {

constexpr int kReadyFd = 3;    // who boots the device waits at the other end
constexpr int kPatience = 20;  // steps of 50 ms that processes get to end by themselves

// A service starts with the dispositions of a fresh process, whatever the shell ignored for us.
unique_fd take_signals() {
  for (int number = 1; number < NSIG; ++number) signal(number, SIG_DFL);
  sigset_t taken;
  sigemptyset(&taken);
  for (int number : {SIGCHLD, SIGTERM, SIGINT}) sigaddset(&taken, number);
  sigprocmask(SIG_SETMASK, &taken, nullptr);
  return unique_fd(signalfd(-1, &taken, SFD_CLOEXEC));
}

// What is left after that ends with this process, as the kernel sees to it.
void shut_down() {
  kill(-1, SIGTERM);
  for (int i = 0; i < kPatience; ++i) {
    while (waitpid(-1, nullptr, WNOHANG) > 0) {
    }
    if (kill(-1, 0) != 0) return;
    struct timespec pause = {0, 50 * 1000 * 1000};
    nanosleep(&pause, nullptr);
  }
}

int run() {
  umask(0);
  fcntl(kReadyFd, F_SETFD, FD_CLOEXEC);
  unique_fd signals = take_signals();
  Services services;
  PropertyService property_service(&services);
  load_properties();
  if (signals == -1 || !property_service.open()) {
    fprintf(stderr, "init: no property service: %m\n");
    return 1;
  }
  services.start_at_boot();
  if (write(kReadyFd, "+", 1) != 1) return 1;
  close(kReadyFd);

  std::vector<struct pollfd> polls;
  for (;;) {
    int timeout = services.start_due();
    polls.assign(1, {signals, POLLIN, 0});
    property_service.add_to(&polls);
    if (poll(polls.data(), polls.size(), timeout) <= 0) continue;
    property_service.serve(&polls[1]);
    struct signalfd_siginfo signal;
    if (polls[0].revents == 0 || read(signals, &signal, sizeof signal) != sizeof signal) continue;
    if (signal.ssi_signo != SIGCHLD) break;
    services.reap();
  }
  shut_down();
  return 0;
}

}  // namespace
}  // namespace corvexd::sim

int main() { return corvexd::sim::run(); }
