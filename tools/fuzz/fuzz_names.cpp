// Any names, between NUL bytes, of directories and files in the log root and in a watched
// directory.
#include <stdint.h>
#include <sys/stat.h>

#include <string>

#include "collect/artefact_mover.h"
#include "core/state.h"
#include "early/initial_log.h"
#include "storage/capture_paths.h"
#include "storage/copy.h"
#include "storage/delete.h"
#include "storage/log_directory.h"
#include "tests/files.h"

namespace {

constexpr char kRoot[] = "/data/corvex";
constexpr char kDropbox[] = "/data/system/dropbox";

// Every other one is a directory in the log root, and a file in the watched directory.
void make(const std::string& name, bool directory) {
  if (directory) mkdir((kRoot + ("/" + name)).c_str(), 0755);
  corvexd::test::write_file((directory ? kDropbox : kRoot) + ("/" + name), name);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  using corvexd::test::list;
  static const bool prepared = mkdir("/data/system", 0755) == 0 && mkdir(kDropbox, 0755) == 0;
  if (!prepared) __builtin_trap();
  corvexd::checkLogPath();
  std::string name;
  bool directory = false;
  for (size_t i = 0; i <= size; ++i) {
    if (i < size && data[i] != '\0') {
      name += data[i] == '/' ? '_' : static_cast<char>(data[i]);
      continue;
    }
    if (!name.empty() && name != "." && name != ".." && name.size() <= 255) {
      make(name, directory = !directory);
    }
    name.clear();
  }
  corvexd::renameLastDirectoryName();
  corvexd::createLogDirectory();
  corvexd::makeLogAbsolutePath();
  corvexd::copy_folder(kDropbox, "/anr/");
  for (const std::string& entry : list(kDropbox)) corvexd::movefile(kDropbox, entry.c_str());
  if (corvexd::getDirSize(kRoot) < 0) __builtin_trap();
  if (corvexd::deleteLog(kRoot) != 0 || !list(kRoot).empty()) __builtin_trap();
  return corvexd::deleteLog(kDropbox);
}
