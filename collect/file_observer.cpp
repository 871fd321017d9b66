#include "collect/file_observer.h"

#include <android-base/unique_fd.h>
#include <cutils/properties.h>
#include <errno.h>
#include <fcntl.h>
#include <string.h>
#include <sys/inotify.h>
#include <unistd.h>

#include <utility>

#include "capture/exec_shell.h"
#include "collect/artefact_mover.h"
#include "core/directory.h"
#include "core/files.h"
#include "core/local_time.h"
#include "core/log.h"
#include "core/properties.h"
#include "core/sleep.h"
#include "core/state.h"
#include "storage/copy.h"
#include "storage/current_directory.h"
#include "storage/mkdirs.h"

using android::base::unique_fd;

namespace corvexd {
namespace {

constexpr size_t kBufferSize = 32768;
constexpr char kScreenshots[] = "/data/media/0/Pictures/Screenshots";
constexpr uint32_t kScreenshotEvents = IN_MODIFY | IN_CLOSE_WRITE | IN_CREATE;
constexpr char kTraces[] = "/data/anr/";

struct Watch {
  const char* directory;
  uint32_t events;
};

constexpr Watch kWatches[] = {
    {"/data", IN_CREATE},
    {"/data/tombstones", IN_CLOSE_WRITE},
    {"/data/anr", IN_MODIFY | IN_CLOSE_WRITE | IN_MOVED_TO | IN_CREATE},
    {"/data/system/dropbox", IN_MOVED_TO},
    {"/data/misc/display", IN_MODIFY | IN_CREATE},
    {kScreenshots, kScreenshotEvents},
    {"/data/media/0/Pictures/", IN_CREATE},
    {"/data/coredump/", IN_MODIFY | IN_CLOSE_WRITE | IN_CREATE},
    {"/data/vendor/media/", IN_MODIFY | IN_CLOSE_WRITE | IN_MOVED_TO | IN_CREATE},
};

// The directory of a file that was closed after writing, by its name. The first match counts.
struct ClosedArtefact {
  const char* in_name;
  const char* directory;
};

constexpr ClosedArtefact kClosedArtefacts[] = {
    {"tombstone", "/data/tombstones"}, {"Screenshot", kScreenshots},
    {"core", "/data/coredump/"},       {"html.gz", kTraces},
    {"yuv", "/data/vendor/media/"},    {"264", "/data/vendor/media/"},
};

// The kernel's state of binder calls, copied when a trace appears.
struct BinderState {
  const char* source;
  const char* name;
};

constexpr BinderState kBinderStates[] = {
    {"/proc/proc_transactions", "transactions"},
    {"/proc/proc_transaction_log", "transaction_log"},
    {"/proc/proc_state", "state"},
};

ChildSlot input_dump;

bool holds(const char* name, const char* part) { return strstr(name, part) != nullptr; }

bool is_trace(const char* name) { return holds(name, "trace") || holds(name, "anr_"); }

// Opens the directory of the latest trace. If a capture has begun since, the log directory above it
// has lost the mark and so has another name.
unique_fd open_anr_directory(LongPath* path) {
  std::lock_guard<std::mutex> lock(current_directory_mutex);
  unique_fd folder = open_folder(path->c_str());
  const char* mark = strstr(path->c_str(), kCurrentMark);
  if (folder != -1 || mark == nullptr) return folder;
  LongPath renamed;
  renamed.append(path->c_str(), mark - path->c_str()).append(mark + strlen(kCurrentMark));
  folder = open_folder(renamed.c_str());
  if (folder != -1) *path = renamed;
  return folder;
}

void complete_trace(ObserverState& state, const char* name) {
  log_error("corvexd: traces: %s", name);
  if (state.anr_directory.empty()) return;
  const unique_fd traces = open_folder(kTraces);
  const unique_fd folder = open_anr_directory(&state.anr_directory);
  LongPath source, target(state.anr_directory);
  source.append(kTraces).append("/").append(name);
  target.append("/").append(name);
  const char* target_name = strrchr(target.c_str(), '/') + 1;
  if (faccessat(folder, target_name, R_OK, 0) == 0 && unlinkat(folder, target_name, 0) != 0) {
    log_error("corvexd: can't remove %s'", target.c_str());
  }
  copy_file({traces, name, source.c_str()}, Links::kNone, {folder, target_name, target.c_str()});
}

// `folder` is the trace's directory.
void dump_input(int folder, const LongPath& directory) {
  constexpr char kDump[] = "/system/bin/dumpsys input | xargs -0 echo";
  constexpr char kFile[] = "dumpsys_input";
  const LongPath command = LongPath().append(kDump).append("&");
  unique_fd output = open_program_output_at(folder, kFile);
  if (start_shell(input_dump, command.c_str(), std::move(output))) sleep_seconds(1);
  LongPath line;
  line.append(kDump).append(" > ").append(directory.c_str()).append(kFile).append("&");
  log_info("corvexd: anr_input is %s \n", line.c_str());
}

void begin_trace(ObserverState& state, const char* name) {
  log_error("corvexd: traces: %s", name);
  // Before the first capture there is no log directory, and nothing may be made elsewhere.
  if (LOG_DIR.get().empty()) return;
  LongPath directory;
  unique_fd folder;
  {
    std::lock_guard<std::mutex> lock(current_directory_mutex);
    directory.append(LOG_DIR.get().c_str()).append("/anr/");
    directory.append(local_timestamp().c_str()).append("/");
    mkdirs(directory.c_str());
    folder = open_folder(directory.c_str());
  }
  state.anr_directory = directory;
  for (const BinderState& binder : kBinderStates) {
    LongPath target(directory);
    target.append(binder.name);
    const Place source = locate(binder.source);
    copy_file({source.folder, source.name, binder.source}, Links::kOwn,
              {folder, binder.name, target.c_str()});
  }
  dump_input(folder, directory);
}

void handle_closed(ObserverState& state, const char* name) {
  for (const ClosedArtefact& artefact : kClosedArtefacts) {
    if (!holds(name, artefact.in_name)) continue;
    movefile(artefact.directory, name);
    return;
  }
  if (is_trace(name)) complete_trace(state, name);
}

void handle_created(ObserverState& state, const char* name) {
  if (is_trace(name)) {
    begin_trace(state, name);
  } else if (holds(name, "Screenshots")) {
    inotify_add_watch(state.inotify_fd, kScreenshots, kScreenshotEvents);
  } else if (holds(name, "core")) {
    movefile("/data/coredump/", name);
  }
}

void handle_event(ObserverState& state, uint32_t mask, const char* name) {
  if ((mask & IN_CLOSE_WRITE) != 0) handle_closed(state, name);
  if ((mask & IN_CREATE) != 0) handle_created(state, name);
  if ((mask & (IN_MODIFY | IN_CREATE)) != 0 && holds(name, "raw")) {
    sleep_seconds(1);
    property_set("debug.sf.dump", "0");
    movefile("/data/misc/display/", name);
  }
  if ((mask & IN_MOVED_TO) != 0) movefile("/data/system/dropbox", name);
}

}  // namespace

bool EventReader::read(Event* event) {
  struct inotify_event record;
  while (left_ >= sizeof record) {
    memcpy(&record, next_, sizeof record);
    const char* name = next_ + sizeof record;
    if (record.len > left_ - sizeof record) return false;
    next_ += sizeof record + record.len;
    left_ -= sizeof record + record.len;
    const size_t length = strnlen(name, record.len);
    if (record.len == 0 || length >= sizeof event->name) continue;
    event->mask = record.mask;
    memcpy(event->name, name, length);
    event->name[length] = '\0';
    return true;
  }
  return false;
}

void handle_events(ObserverState& state, const char* records, size_t size) {
  EventReader reader(records, size);
  for (Event event; reader.read(&event);) handle_event(state, event.mask, event.name);
}

void* file_observer(void*) {
  log_info("corvexd file observer start! \n");
  ObserverState state;
  unique_fd inotify(inotify_init1(IN_CLOEXEC));
  if (inotify == -1) {
    log_error("corvexd: Inotify init failed: %s", strerror(errno));
    return nullptr;
  }
  state.inotify_fd = inotify;
  for (const Watch& watch : kWatches) inotify_add_watch(inotify, watch.directory, watch.events);
  static char records[kBufferSize];  // there is one observer; its stack stays small
  for (;;) {
    ssize_t size = TEMP_FAILURE_RETRY(read(inotify, records, sizeof records));
    if (size == -1) {
      log_error("corvexd: Inotify read failed: %s", strerror(errno));
      return nullptr;
    }
    if (size > 0 && property_is("persist.sys.assert.panic", "true"))
      handle_events(state, records, size);
  }
}

}  // namespace corvexd
