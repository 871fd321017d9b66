// Stands in for logcat and tcpdump: reports what it was given, then lives as /probe/mode says.
#include <fcntl.h>
#include <signal.h>
#include <stdio.h>
#include <string.h>
#include <time.h>
#include <unistd.h>

int main(int argc, char** argv) {
  struct timespec started;
  clock_gettime(CLOCK_MONOTONIC, &started);
  bool inherited[64];  // was open at the exec
  for (int fd = 0; fd < 64; ++fd) inherited[fd] = fcntl(fd, F_GETFD) != -1;
  char mode[16] = "live";
  if (FILE* file = fopen("/probe/mode", "re")) {
    if (fscanf(file, "%15s", mode) != 1) return 2;
    fclose(file);
  }
  if (strcmp(mode, "stubborn") == 0) signal(SIGTERM, [](int) { signal(SIGTERM, SIG_DFL); });

  char draft[64], path[64];
  snprintf(draft, sizeof draft, "/probe/draft.%d", getpid());
  snprintf(path, sizeof path, "/probe/report.%06d", getpid());
  FILE* report = fopen(draft, "we");
  if (report == nullptr) return 2;
  for (int i = 0; i < argc; ++i) fprintf(report, "arg %s\n", argv[i]);
  char line[256];
  FILE* status = fopen("/proc/self/status", "re");
  while (fgets(line, sizeof line, status) != nullptr) {
    if (strncmp(line, "SigBlk", 6) == 0 || strncmp(line, "SigIgn", 6) == 0) fputs(line, report);
  }
  for (int fd = 3; fd < 64; ++fd) {
    if (inherited[fd]) fprintf(report, "fd %d\n", fd);
  }
  fprintf(report, "started %lld\n", started.tv_sec * 1'000'000'000LL + started.tv_nsec);
  fclose(report);
  rename(draft, path);

  if (strcmp(mode, "brief") == 0) {
    usleep(getpid() % 16 * 1000);
    return 0;
  }
  while (strcmp(mode, "die") != 0) pause();
  return 0;
}
