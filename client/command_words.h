// The words a client can send to the daemon, and how a typed word is recognised.
#pragma once

#include <string>

namespace corvexd {

struct CommandWord {
  const char* word;
  const char* help;
};

extern const CommandWord kCommandWords[16];
extern const CommandWord& kDeleteLog;  // the one word that is answered

// The word that `typed` names in any letter case, or null.
const CommandWord* find_word(const std::string& typed);

// The word with the fewest letters inserted, removed or replaced.
const CommandWord& nearest_word(const std::string& typed);

}  // namespace corvexd
