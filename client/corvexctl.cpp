// corvexctl: sends command words to the daemon and waits until it has run them.

#include <errno.h>
#include <getopt.h>
#include <stdio.h>
#include <string.h>

#include <algorithm>
#include <string>
#include <vector>

#include "client/command_words.h"
#include "client/connection.h"
#include "client/elapsed_clock.h"
#include "client/replies.h"

namespace corvexd {
namespace {

enum ExitStatus { kDone = 0, kCleanFailed = 1, kUsage = 2, kNoDaemon = 3, kEndedEarly = 4 };

const char kHelp[] =
    "usage: corvexctl [--socket PATH] WORD...\n"
    "       corvexctl --list | --help\n"
    "\n"
    "Sends the words to the log collector daemon in one connection, and waits until it has run\n"
    "them all. Letter case does not matter.\n"
    "\n"
    "  --socket PATH  the daemon's control socket (/dev/socket/corvexd)\n"
    "  --list         show the words\n"
    "  --help         show this text\n"
    "\n"
    "exit status:\n"
    "  0  everything was run; each DELETELOG was answered CLEANSUCCESS\n"
    "  1  a DELETELOG was answered CLEANFAILED\n"
    "  2  wrong usage or an unknown word; nothing was sent\n"
    "  3  no daemon could be reached; nothing was sent\n"
    "  4  the daemon ended the connection before it had run or answered everything\n";

struct Request {
  std::string socket = "/dev/socket/corvexd";
  std::vector<const CommandWord*> words;
};

void print_words() {
  for (const CommandWord& command : kCommandWords) {
    printf("%-22s %s\n", command.word, command.help);
  }
}

bool add_words(int count, char** typed, Request* request) {
  for (int i = 0; i < count; ++i) {
    const CommandWord* word = find_word(typed[i]);
    if (word == nullptr) {
      fprintf(stderr, "corvexctl: unknown word \"%s\", did you mean %s?\n", typed[i],
              nearest_word(typed[i]).word);
      return false;
    }
    request->words.push_back(word);
  }
  if (count == 0) fputs("corvexctl: no word to send; see corvexctl --help\n", stderr);
  return count > 0;
}

// Says on standard error what is missing, if anything, and returns the exit status.
int conclude(const std::vector<const CommandWord*>& words, const Replies& replies, int error) {
  const auto due = std::count(words.begin(), words.end(), &kDeleteLog);
  const bool answered = replies.count() >= static_cast<size_t>(due);
  // Words run in order: when the last one has been answered, the rest has been run, whatever
  // became of the connection.
  const bool all_run = error == 0 || (answered && words.back() == &kDeleteLog);
  if (error == EBADMSG) {
    fputs("corvexctl: what came back is no reply of the daemon\n", stderr);
  } else if (!all_run) {
    fprintf(stderr, "corvexctl: the daemon ended the connection before it had run everything: %s\n",
            strerror(error));
  } else if (!answered) {
    fputs("corvexctl: the daemon ended the connection without an answer to DELETELOG\n", stderr);
  } else {
    return replies.any_failed() ? kCleanFailed : kDone;
  }
  return kEndedEarly;
}

int send_words(const Request& request) {
  ElapsedClock clock;
  const int connection = connect_to_daemon(request.socket, &clock);
  if (connection < 0) {
    const int error = errno;
    clock.hide();
    fprintf(stderr, "corvexctl: cannot reach a daemon at %s: %s\n", request.socket.c_str(),
            strerror(error));
    return error == ENAMETOOLONG ? kUsage : kNoDaemon;
  }
  Replies replies;
  const int error = converse(connection, frame(request.words), &clock, &replies);
  clock.hide();
  return conclude(request.words, replies, error);
}

int run(int argc, char** argv) {
  static const option kOptions[] = {{"socket", required_argument, nullptr, 's'},
                                    {"list", no_argument, nullptr, 'l'},
                                    {"help", no_argument, nullptr, 'h'},
                                    {nullptr, 0, nullptr, 0}};
  Request request;
  int chosen;
  while ((chosen = getopt_long(argc, argv, "", kOptions, nullptr)) != -1) {
    if (chosen == 's') {
      request.socket = optarg;
    } else if (chosen == 'l') {
      print_words();
      return kDone;
    } else if (chosen == 'h') {
      fputs(kHelp, stdout);
      return kDone;
    } else {
      return kUsage;
    }
  }
  if (!add_words(argc - optind, argv + optind, &request)) return kUsage;
  return send_words(request);
}

}  // namespace
}  // namespace corvexd

int main(int argc, char** argv) { return corvexd::run(argc, argv); }
