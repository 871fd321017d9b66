#include "tests/daemon.h"

#include <gtest/gtest.h>
#include <signal.h>
#include <string.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <sys/wait.h>
#include <unistd.h>

#include <sstream>

#include "tests/device_root.h"
#include "tests/files.h"

namespace corvexd::test {
namespace {

const struct sockaddr_un kAddress = {AF_UNIX, "/dev/socket/corvexd"};
const struct sockaddr* address() { return reinterpret_cast<const struct sockaddr*>(&kAddress); }

}  // namespace

BootingDaemon::BootingDaemon(const char* program) {
  unlink(kAddress.sun_path);
  int fd = socket(AF_UNIX, SOCK_STREAM, 0);
  EXPECT_EQ(0, bind(fd, address(), sizeof kAddress));
  std::string number = std::to_string(fd);
  pid_ = fork();
  if (pid_ == 0) {
    close_range(3, fd - 1, 0);
    close_range(fd + 1, ~0u, 0);
    setenv("ANDROID_SOCKET_corvexd", number.c_str(), 1);
    setenv("PATH", "/system/bin:/bin", 1);
    execl(program, program, nullptr);
    _exit(127);
  }
  close(fd);
}

BootingDaemon::~BootingDaemon() {
  kill(pid_, SIGKILL);
  waitpid(pid_, nullptr, 0);
}

void make_device_ready() {
  write_file("/data/.layout_version", "3");
  set_property("vold.internalSD.mount", "1");
  write_file("/cache/fileAfter911", "");
}

// The probe is there already when this device starts its daemon.
Daemon::Daemon(LogCatcher& log, const char* program)
    : BootingDaemon((make_device_ready(), install_probes("live"), program)) {
  close(connect_to_daemon());
  probe_reports(4);
  clear_probe_reports();
  EXPECT_TRUE(log.has("closing connection\n"));
  log.clear();
}

std::string message(const std::string& command) {
  uint16_t length = static_cast<uint16_t>(command.size());
  return std::string(reinterpret_cast<char*>(&length), sizeof length) + command;
}

int connect_to_daemon() {
  int fd = socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
  EXPECT_TRUE(eventually([&] { return connect(fd, address(), sizeof kAddress) == 0; }));
  return fd;
}

std::string send_bytes(const std::string& bytes) {
  int fd = connect_to_daemon();
  EXPECT_EQ(static_cast<ssize_t>(bytes.size()), send(fd, bytes.data(), bytes.size(), MSG_NOSIGNAL));
  shutdown(fd, SHUT_WR);
  std::string reply;
  char buffer[256];
  for (ssize_t count; (count = read(fd, buffer, sizeof buffer)) > 0;) reply.append(buffer, count);
  close(fd);
  return reply;
}

std::string send_commands(const std::vector<std::string>& commands) {
  std::string bytes;
  for (const std::string& command : commands) bytes += message(command);
  return send_bytes(bytes);
}

void install_probes(const std::string& mode) {
  write_file("/probe/mode", mode);
  for (const char* path : {"/system/bin/logcat", "/system/xbin/tcpdump"}) {
    unlink(path);
    EXPECT_EQ(0, symlink("/build/tests/recorder_probe", path));
  }
}

void clear_probe_reports() { run("rm -f /probe/report.*"); }

std::vector<ProbeReport> probe_reports(size_t count) {
  const std::string prefix = "report.";
  std::vector<ProbeReport> reports;
  eventually([&] {
    reports.clear();
    for (const std::string& name : list("/probe")) {
      if (name.rfind(prefix, 0) != 0) continue;
      ProbeReport report = {atoi(name.c_str() + prefix.size()), {}, {}};
      std::istringstream lines(read_file("/probe/" + name));
      for (std::string line; std::getline(lines, line);) {
        bool argument = line.rfind("arg ", 0) == 0;
        (argument ? report.arguments : report.rest).push_back(argument ? line.substr(4) : line);
      }
      reports.push_back(report);
    }
    return reports.size() >= count;
  });
  EXPECT_EQ(count, reports.size());
  return reports;
}

std::string current_directory(const std::string& root) {
  for (const std::string& name : list(root)) {
    if (name.find("_current") != std::string::npos) return root + "/" + name;
  }
  return "";
}

}  // namespace corvexd::test
