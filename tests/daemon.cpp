#include "tests/daemon.h"

#include <fcntl.h>
#include <signal.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <sstream>

namespace corvexd::test {
namespace {

const struct sockaddr_un kAddress = {AF_UNIX, "/dev/socket/corvexd"};

}  // namespace

BootingDaemon::BootingDaemon(const char* program) {
  int fd = bound_socket(SOCK_STREAM, kAddress.sun_path);
  std::string number = std::to_string(fd);
  pid_ = fork();
  if (pid_ == 0) {
    fcntl(fd, F_SETFD, 0);
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

Daemon::Daemon(LogCatcher& log, const char* program)
    : BootingDaemon((make_device_ready(), program)) {
  close(connect_to_daemon());
  probe_reports(4);
  clear_probe_reports();
  EXPECT_TRUE(log.has("closing connection\n"));
  log.clear();
}

const char* const kDaemonWithNodes = "/probe/daemon";

void make_nodes(const std::string& daemon) {
  run("rm -rf /nodes; mkdir -p /nodes/proc/tzdbg /real_proc; cd /nodes; ln -s /real_proc/self "
      "proc; mkfifo kmsg proc/tzdbg/qsee_log proc/tzdbg/tz_log; for name in bootloader_log cmdline "
      "proc_transactions proc_transaction_log proc_state; do printf $name >proc/$name; done");
  write_script(
      kDaemonWithNodes,
      "exec setsid unshare -m sh -c 'mount --rbind /proc /real_proc && mount --bind /nodes/kmsg "
      "/dev/kmsg && mount --bind /nodes/proc /proc && exec " +
          daemon + "'");
}

size_t pauses(int seconds) {
  const std::string all = "\n" + read_file("/probe/pauses"), line = "\n" + std::to_string(seconds);
  size_t count = 0;
  for (size_t at = 0; (at = all.find(line + "\n", at)) != all.npos; ++at) ++count;
  return count;
}

std::string message(const std::string& command) {
  uint16_t length = static_cast<uint16_t>(command.size());
  return std::string(reinterpret_cast<char*>(&length), sizeof length) + command;
}

int try_to_connect() {
  int fd = socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
  const auto* address = reinterpret_cast<const struct sockaddr*>(&kAddress);
  if (connect(fd, address, sizeof kAddress) == 0) return fd;
  close(fd);
  return -1;
}

int connect_to_daemon() {
  int fd = -1;
  EXPECT_TRUE(eventually([&] { return (fd = try_to_connect()) != -1; }));
  return fd;
}

void send_all(int connection, const std::string& bytes) {
  EXPECT_EQ(static_cast<ssize_t>(bytes.size()),
            send(connection, bytes.data(), bytes.size(), MSG_NOSIGNAL));
}

std::string send_commands(const Texts& commands) {
  std::string bytes;
  for (const std::string& command : commands) bytes += message(command);
  int fd = connect_to_daemon();
  send_all(fd, bytes);
  shutdown(fd, SHUT_WR);
  std::string reply = read_to_end(fd);
  close(fd);
  return reply;
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
  reports.resize(std::max(count, reports.size()), {0, {}, {"never started"}});
  return reports;
}

Texts command_lines(const std::vector<ProbeReport>& reports) {
  Texts lines;
  for (const ProbeReport& report : reports) {
    std::string line;
    for (const std::string& argument : report.arguments) {
      bool quoted = argument.empty() || argument.find(' ') != std::string::npos;
      line += (line.empty() ? "" : " ") + (quoted ? "'" + argument + "'" : argument);
    }
    lines.push_back(line);
  }
  return lines;
}

std::string current_directory(const std::string& root) {
  for (const std::string& name : list(root)) {
    if (name.find("_current") != std::string::npos) return root + "/" + name;
  }
  return "";
}

}  // namespace corvexd::test
