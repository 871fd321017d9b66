#include "faults/trace.h"

#include <string.h>

#include <algorithm>
#include <fstream>
#include <map>
#include <set>

#include "faults/places.h"

namespace corvexd::faults {
namespace {

bool ends_with(const std::string& text, const std::string& end) {
  return text.size() >= end.size() && text.compare(text.size() - end.size(), end.size(), end) == 0;
}

std::string between(const std::string& text, char first, char last) {
  size_t start = text.find(first);
  size_t end = text.find(last, start + 1);
  return start == std::string::npos || end == std::string::npos
             ? ""
             : text.substr(start + 1, end - start - 1);
}

std::string path_of(const std::string& name, const std::string& line) {
  static const std::set<std::string> on_descriptors = {"read", "write", "fchown", "fchmod"};
  std::string folder = between(line, '<', '>');
  if (folder.rfind(kJail, 0) == 0) folder.erase(0, strlen(kJail));
  if (on_descriptors.count(name) != 0) return folder;
  const std::string path = between(line, '"', '"');
  bool is_relative = !path.empty() && path[0] != '/';
  return is_relative ? folder + "/" + path : path;
}

Call read_call(const std::string& line) {
  Call call;
  call.name = line.substr(0, line.find('('));
  call.injected = ends_with(line, "(INJECTED)");
  call.path = path_of(call.name, line);
  size_t result = line.rfind(" = -1 E");
  if (result != std::string::npos) call.error = between(line.substr(result), '(', ')');
  return call;
}

bool is_the_shields(const Call& call) {
  return std::any_of(call.functions.begin(), call.functions.end(), [](const auto& function) {
    return function.find("wait_at_gate") != std::string::npos;
  });
}

}  // namespace

// A line for each call, and below it one for each caller.
void read_trace(const std::string& file, bool in_main, bool injected_only,
                std::vector<Call>& calls) {
  std::ifstream lines(file);
  std::map<std::string, int> counts;
  bool wanted = false;
  for (std::string line; std::getline(lines, line);) {
    if (line.rfind(" > ", 0) != 0) {
      wanted = line.find('(') != std::string::npos && line.rfind("+++", 0) != 0 &&
               (!injected_only || ends_with(line, "(INJECTED)"));
      if (!wanted) continue;
      calls.push_back(read_call(line));
      calls.back().in_main = in_main;
      calls.back().when = ++counts[calls.back().name];
    } else if (wanted && line.find(kProgram) != std::string::npos) {
      calls.back().functions.push_back(between(line, '(', '+'));
      calls.back().site += between(line, '[', ']') + " ";
    }
  }
  // The shield's calls are nobody's.
  calls.erase(std::remove_if(calls.begin(), calls.end(), is_the_shields), calls.end());
}

}  // namespace corvexd::faults
