#include "client/command_words.h"

#include <algorithm>
#include <cctype>
#include <cstring>
#include <iterator>
#include <vector>

namespace corvexd {

const CommandWord kCommandWords[16] = {
    {"LOGBEGIN", "make a new log directory and start a capture into it"},
    {"LOGSTOP", "end the capture"},
    {"CACHECLEAR", "clear the log buffers of the device"},
    {"BUGREPORT", "write a bug report into the log directory (takes minutes)"},
    {"CPUTHERMAL", "start recording CPU frequencies and temperatures"},
    {"STOPCPUTHERMAL", "stop recording CPU frequencies and temperatures"},
    {"DELETELOG", "delete everything under both log roots; answers CLEANSUCCESS or CLEANFAILED"},
    {"OEM_BT_DEBUG_ENABLE", "verbose Bluetooth logging on"},
    {"OEM_BT_DEBUG_DISABLE", "verbose Bluetooth logging off"},
    {"OEM_GPS_DEBUG_ENABLE", "verbose location logging on"},
    {"OEM_GPS_DEBUG_DISABLE", "verbose location logging off"},
    {"OEM_NFC_DEBUG_ENABLE", "verbose NFC logging on"},
    {"OEM_NFC_DEBUG_DISABLE", "verbose NFC logging off"},
    {"WIFI_SNIFFLOG_START", "start the Wi-Fi driver's packet log"},
    {"WIFI_SNIFFLOG_STOP", "stop the Wi-Fi driver's packet log"},
    {"CHANGEPATH", "read again where logs are to be kept"},
};
const CommandWord& kDeleteLog = kCommandWords[6];

namespace {

std::string upper_case(std::string text) {
  for (char& c : text) c = static_cast<char>(std::toupper(static_cast<unsigned char>(c)));
  return text;
}

// Levenshtein distance, one row of its table at a time.
size_t edit_distance(const std::string& from, const std::string& to) {
  std::vector<size_t> row(to.size() + 1);
  for (size_t j = 0; j < row.size(); ++j) row[j] = j;
  for (size_t i = 1; i <= from.size(); ++i) {
    size_t diagonal = row[0];
    row[0] = i;
    for (size_t j = 1; j < row.size(); ++j) {
      const size_t replaced = diagonal + (from[i - 1] == to[j - 1] ? 0 : 1);
      diagonal = row[j];
      row[j] = std::min({row[j] + 1, row[j - 1] + 1, replaced});
    }
  }
  return row.back();
}

}  // namespace

const CommandWord* find_word(const std::string& typed) {
  const std::string wanted = upper_case(typed);
  for (const CommandWord& command : kCommandWords) {
    if (wanted == command.word) return &command;
  }
  return nullptr;
}

const CommandWord& nearest_word(const std::string& typed) {
  const std::string wanted = upper_case(typed);
  return *std::min_element(std::begin(kCommandWords), std::end(kCommandWords),
                           [&](const CommandWord& a, const CommandWord& b) {
                             return edit_distance(wanted, a.word) < edit_distance(wanted, b.word);
                           });
}

}  // namespace corvexd
