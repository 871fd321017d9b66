// getprop [KEY] and setprop KEY VALUE.
#include <dirent.h>
#include <stdio.h>
#include <string.h>
#include <sys/socket.h>

#include <map>
#include <string>

#include "simulator/common/protocol.h"
#include "simulator/toolbox/tools.h"

namespace corvexd::sim {
namespace {

std::string read_property(const char* key) {
  std::string path = std::string(kPropertyDirectory) + "/" + key;
  char value[kMaxPropertyValue];
  FILE* file = fopen(path.c_str(), "re");
  if (file == nullptr) return "";
  size_t length = fread(value, 1, sizeof value, file);
  fclose(file);
  return std::string(value, length);
}

void append_text(const char* text, std::string* request) {
  uint32_t length = static_cast<uint32_t>(strlen(text));
  request->append(reinterpret_cast<const char*>(&length), sizeof length).append(text);
}

bool set_property(const char* key, const char* value) {
  std::string request(reinterpret_cast<const char*>(&kPropertySetRequest),
                      sizeof kPropertySetRequest);
  append_text(key, &request);
  append_text(value, &request);
  android::base::unique_fd fd = connect_to(kPropertySocket, SOCK_STREAM);
  uint32_t result = 1;
  return fd != -1 &&
         send(fd, request.data(), request.size(), MSG_NOSIGNAL) ==
             static_cast<ssize_t>(request.size()) &&
         recv(fd, &result, sizeof result, MSG_WAITALL) == sizeof result && result == 0;
}

}  // namespace

int getprop_main(int argc, char** argv) {
  if (argc > 1) {
    printf("%s\n", read_property(argv[1]).c_str());
    return 0;
  }
  DIR* directory = opendir(kPropertyDirectory);
  if (directory == nullptr) {
    fprintf(stderr, "getprop: %s: %m\n", kPropertyDirectory);
    return 1;
  }
  std::map<std::string, std::string> properties;
  while (struct dirent* entry = readdir(directory)) {
    if (entry->d_name[0] != '.') properties[entry->d_name] = read_property(entry->d_name);
  }
  closedir(directory);
  for (const auto& [key, value] : properties) printf("[%s]: [%s]\n", key.c_str(), value.c_str());
  return 0;
}

int setprop_main(int argc, char** argv) {
  if (argc != 3) {
    fprintf(stderr, "usage: setprop KEY VALUE\n");
    return 1;
  }
  if (set_property(argv[1], argv[2])) return 0;
  fprintf(stderr, "setprop: could not set \"%s\" to \"%s\"\n", argv[1], argv[2]);
  return 1;
}

}  // namespace corvexd::sim
