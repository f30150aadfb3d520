#include "cli/word_meaning.h"

namespace ferrox::cli {

namespace {

struct Meaning {
  const char* command;  ///< "": of all commands but those that stand before
  const char* word;
  const char* text;
  const char* example;
};

/// The shares and files of the examples go together.
constexpr Meaning kMeanings[] = {
    {"queue show", "FILE", "a share's queue file; 'fileindexctl status --json' names it as \"queue\"",
     "/var/lib/kova/fileindex/queue/photo"},
    {"share add", "FOLDER", "the folder, as it is called on this machine", "/srv/photo"},
    {"share forget", "FOLDER", "where the share's folder was, when the share is gone", "/srv/photo"},
    {"share migrate", "NEW_FOLDER", "where the share's folder is now", "/mnt/large/photo"},
    {"share rename", "NEW_NAME", "the share's new name, which its folder gets, too", "pictures"},
    {"user rename", "OLD", "the user's name before", "ann"},
    {"user rename", "NEW", "the user's name now", "anna"},
    {"", "SHARE", "the name of a share; 'fileindexctl share list' shows them", "photo"},
    {"", "PATH", "a folder in a share, as /photo/trips or as it is called on this machine", "/photo/trips"},
    {"", "QUERY", "what to look for: words, \"a phrase\", conditions such as kind:image", "invoice 2024"},
    {"", "FILE", "a file, by its path", "/srv/photo/trips/lisbon.jpg"},
    {"", "MOUNT_POINT", "the folder at which the volume is mounted", "/mnt/usb"},
    {"", "HOURS", "how long, in hours; without it until 'fileindexctl resume'", "8"},
};

const Meaning* Find(const Command& command, const std::string& word) {
  for (const Meaning& meaning : kMeanings) {
    if (word == meaning.word && (*meaning.command == '\0' || std::string(command.name) == meaning.command))
      return &meaning;
  }
  return nullptr;
}

}  // namespace

std::string PlainWord(std::string word) {
  while (!word.empty() && (word.back() == ']' || word.back() == '.')) word.pop_back();
  if (!word.empty() && word[0] == '[') word.erase(0, 1);
  return word;
}

std::string MeaningOf(const Command& command, const std::string& word) {
  const Meaning* meaning = Find(command, word);
  return meaning == nullptr ? "" : meaning->text;
}

std::string ExampleOf(const Command& command) {
  std::string example = std::string("fileindexctl ") + command.name;
  for (const std::string& word : Split(command.words, ' ')) {
    const Meaning* meaning = Find(command, PlainWord(word));
    if (meaning != nullptr && word[0] != '[') example += std::string(" ") + meaning->example;
  }
  for (const Option& option : command.options) {
    if (option.is_needed) example += std::string(" ") + option.name + " document,photo";
  }
  return example;
}

}  // namespace ferrox::cli
