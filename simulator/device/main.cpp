// corvex-device: starts a simulated device and runs commands in it.
#include <errno.h>
#include <limits.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/stat.h>

#include "simulator/device/commands.h"

namespace {

bool parse_options(char** arguments, corvexd::sim::BootOptions* options) {
  for (; *arguments != nullptr; ++arguments) {
    bool quiet = strcmp(*arguments, "--quiet") == 0;
    if (!quiet && strcmp(*arguments, "--encrypted") != 0) return false;
    (quiet ? options->quiet : options->encrypted) = true;
  }
  return true;
}

}  // namespace

int main(int argc, char** argv) {
  char root[PATH_MAX];
  bool boots = argc >= 3 && strcmp(argv[1], "boot") == 0;
  bool runs = argc >= 4 && strcmp(argv[1], "exec") == 0;
  corvexd::sim::BootOptions options;
  if ((boots && parse_options(&argv[3], &options)) || runs) {
    if (boots && mkdir(argv[2], 0755) != 0 && errno != EEXIST) {
      fprintf(stderr, "corvex-device: %s: %m\n", argv[2]);
      return 1;
    }
    if (realpath(argv[2], root) == nullptr) {
      fprintf(stderr, "corvex-device: %s: %m\n", argv[2]);
      return runs ? 125 : 1;
    }
    return boots ? corvexd::sim::boot_device(root, options)
                 : corvexd::sim::run_in_device(root, &argv[3]);
  }
  fprintf(stderr,
          "usage: corvex-device boot ROOT [--quiet] [--encrypted]\n"
          "       corvex-device exec ROOT COMMAND [ARGUMENT]...\n");
  return 2;
}
