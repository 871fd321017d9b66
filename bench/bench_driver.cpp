// Runs one job of the daemon's code by itself, for whoever measures it from outside.
//
//   bench_driver reader SRC DST LIMIT    copies SRC to its end into DST, rotating at LIMIT bytes
#include <stdio.h>
#include <stdlib.h>
#include <string.h>

#include "capture/node_reader.h"

namespace corvexd {
namespace {

int64_t rotation_size;
PublishedPath destination;
int32_t from_fd = -1, to_fd = -1;

int run_reader(char** arguments) {
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
  rotation_size = strtoll(arguments[2], nullptr, 10);
  run_node_reader(reader);
  return 0;
}

struct Job {
  const char* name;
  int argument_count;
  int (*run)(char** arguments);
};

constexpr Job kJobs[] = {
    {"reader", 3, run_reader},
};

}  // namespace
}  // namespace corvexd

int main(int argc, char** argv) {
  for (const corvexd::Job& job : corvexd::kJobs) {
    if (argc == job.argument_count + 2 && strcmp(argv[1], job.name) == 0) return job.run(argv + 2);
  }
  fputs("usage: bench_driver reader SRC DST LIMIT\n", stderr);
  return 2;
}
