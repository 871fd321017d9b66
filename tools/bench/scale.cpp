// What the daemon's jobs cost as what they have to look at grows, and what an event costs that has
// it do little. In a simulated device of its own, with nobody reading the log.
#include <android/log.h>
#include <benchmark/benchmark.h>
#include <fcntl.h>
#include <sys/inotify.h>
#include <sys/stat.h>
#include <unistd.h>

#include <string>

#include "capture/rotation.h"
#include "collect/artefact_mover.h"
#include "collect/file_observer.h"
#include "core/state.h"
#include "service/commands.h"
#include "storage/delete.h"
#include "storage/log_directory.h"
#include "tests/device_root.h"
#include "tests/files.h"

namespace corvexd::test {
namespace {

constexpr char kRoot[] = "/data/corvex/";

void make_log_root(int64_t directories) {
  make_empty_device();
  checkLogPath();
  for (int64_t i = 1; i < directories; ++i) {
    mkdir((kRoot + ("KVBR_" + std::to_string(i)) + "--2020-01-01-00-00-00").c_str(), 0755);
  }
  createLogDirectory();
}

void touch(const std::string& path) { close(creat(path.c_str(), 0600)); }

void BM_NewLogDirectory(benchmark::State& state) {
  make_log_root(state.range(0));
  while (state.KeepRunning()) {
    renameLastDirectoryName();
    createLogDirectory();
    state.PauseTiming();
    remove_file(LOG_DIR.get().c_str());
    state.ResumeTiming();
  }
  state.SetComplexityN(state.range(0));
}
BENCHMARK(BM_NewLogDirectory)->RangeMultiplier(10)->Range(1, 1000)->Complexity(benchmark::oN);

void BM_CollectArtefact(benchmark::State& state) {
  make_log_root(state.range(0));
  run("mkdir /data/coredump");
  write_file("/data/coredump/core", "c");
  while (state.KeepRunning()) movefile("/data/coredump", "core");  // replaces the earlier copy
  state.SetComplexityN(state.range(0));
}
BENCHMARK(BM_CollectArtefact)->RangeMultiplier(10)->Range(1, 1000)->Complexity(benchmark::oN);

void BM_Rotate(benchmark::State& state) {
  make_empty_device();
  const std::string path = std::string(kRoot) + "kernel.log";
  const int count = static_cast<int>(state.range(0));
  for (int i = 1; i <= count; ++i) touch(path + "." + std::to_string(i));
  while (state.KeepRunning()) {
    state.PauseTiming();
    touch(path);
    state.ResumeTiming();
    shift_series(locate(path.c_str()), count, false);
  }
  state.SetComplexityN(count);
}
BENCHMARK(BM_Rotate)->RangeMultiplier(10)->Range(1, 1000)->Complexity(benchmark::oN);

void BM_Delete(benchmark::State& state) {
  make_empty_device();
  while (state.KeepRunning()) {
    state.PauseTiming();
    for (int64_t i = 0; i < state.range(0); ++i) {
      const std::string directory = kRoot + std::to_string(i / 1000);
      if (i % 1000 == 0) mkdir(directory.c_str(), 0755);
      touch(directory + "/" + std::to_string(i));
    }
    state.ResumeTiming();
    deleteLog(kRoot);
  }
  state.SetComplexityN(state.range(0));
}
BENCHMARK(BM_Delete)->RangeMultiplier(10)->Range(1000, 100'000)->Complexity(benchmark::oN);

void BM_UnknownCommand(benchmark::State& state) {
  while (state.KeepRunning()) run_command("LOGBEGIN ", -1);
}
BENCHMARK(BM_UnknownCommand);

// As many as one read takes of what touches no artefact.
void BM_EventsOfNoInterest(benchmark::State& state) {
  std::string records;
  while (records.size() < 32768) {
    struct inotify_event event = {};
    event.mask = IN_CLOSE_WRITE;
    event.len = 16;
    records.append(reinterpret_cast<const char*>(&event), sizeof event);
    records.append(std::string("entry").append(16, '\0'), 0, 16);
  }
  ObserverState observer;
  while (state.KeepRunning()) handle_events(observer, records.data(), records.size());
  state.SetItemsProcessed(state.iterations() * static_cast<int64_t>(records.size()) / 32);
}
BENCHMARK(BM_EventsOfNoInterest);

}  // namespace
}  // namespace corvexd::test

int main(int argc, char** argv) {
  corvexd::test::enter_device_root();
  __android_log_set_logger([](auto...) {});
  benchmark::Initialize(&argc, argv);
  benchmark::RunSpecifiedBenchmarks();
  return 0;
}
