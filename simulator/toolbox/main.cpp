// One program for the device's small tools: the name it is called by chooses.
#include <stdio.h>
#include <string.h>

#include "simulator/toolbox/tools.h"

int main(int argc, char** argv) {
  static constexpr struct {
    const char* name;
    int (*run)(int, char**);
  } kTools[] = {
      {"logcat", corvexd::sim::logcat_main},
      {"log", corvexd::sim::log_main},
      {"getprop", corvexd::sim::getprop_main},
      {"setprop", corvexd::sim::setprop_main},
  };
  const char* name = argc > 0 ? basename(argv[0]) : "";
  for (const auto& tool : kTools) {
    if (strcmp(tool.name, name) == 0) return tool.run(argc, argv);
  }
  fprintf(stderr, "%s: call this by the name of one of its tools: logcat log getprop setprop\n",
          name);
  return 1;
}
