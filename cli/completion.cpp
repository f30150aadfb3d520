#include "cli/completion.h"

#include <dirent.h>

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <utility>

#include "base/files.h"
#include "base/path.h"
#include "cli/caller.h"
#include "cli/command_table.h"
#include "cli/folder_path.h"
#include "cli/format.h"
#include "cli/global_options.h"
#include "cli/kinds.h"
#include "cli/word_meaning.h"
#include "common/file_util.h"
#include "fileindex/folders/folder_mgr.h"
#include "sdk/share.h"
#include "wire/engine_requests.h"
#include "wire/frame_client.h"

/// Completion goes by the table of commands: names, options, and what the usage lines call the words ("SHARE", "PATH").
/// The words of a search are completed by the engine, which has a second: pressing a key must not wait for anything.
namespace ferrox::cli {

namespace {

using Words = std::vector<std::string>;

/// The folders of an indexed share below what has been typed so far: "/photo/tr" gives "/photo/trips".
Words FoldersBelow(const std::string& typed) {
  Words found;
  const std::string parent = Dirname(typed);
  for (const std::string& share : sdk::SDKShare::Enum()) {
    if (!base::IsAtOrBelow(parent, "/" + share)) continue;
    const std::string folder = sdk::SDKShare(share).GetPath() + parent.substr(1 + share.size());
    const base::OpenFolderPtr entries(opendir(folder.c_str()));
    if (entries == nullptr) continue;
    while (const dirent* entry = readdir(entries.get())) {
      const std::string name = entry->d_name;
      if (name[0] != '.' && IsDirentDir(*entry, folder + "/" + name)) found.push_back(parent + "/" + name);
    }
  }
  return found;
}

/// For PATH: indexed folders, shares, and folders below what has been typed. A path that does not begin with "/" may be
/// one on disk, which the shell knows better.
Words SharePaths(const std::string& typed) {
  Words found = {":open"};
  if (typed.empty() || typed[0] != '/') found.push_back(":folders");
  const fileindex::FolderMgr configured;
  for (const auto& folder : configured.GetFolders()) found.push_back(folder->GetPath());
  for (const std::string& share : sdk::SDKShare::Enum()) found.push_back("/" + share);
  for (const std::string& folder : FoldersBelow(typed)) found.push_back(folder);
  return found;
}

/// "document,au" gives "document,audio".
Words KindLists(const std::string& typed) {
  const size_t comma = typed.rfind(',');
  const std::string before = comma == std::string::npos ? "" : typed.substr(0, comma + 1);
  Words found = {":open"};
  for (const char* kind : kKinds) found.push_back(before + kind);
  if (before.empty()) found.insert(found.end(), {"all", "none"});
  return found;
}

/// For QUERY: what the last word may become, by the documents that the caller may read.
Words QueryWords(const std::string& typed) {
  constexpr std::chrono::seconds kLongest(1);
  if (typed.size() < 2) return {};
  Json::Value data;
  data["text"] = typed;
  const wire::Reply reply = wire::AskEngine(wire::EngineRequest("complete", data), kLongest);
  Words found;
  if (reply.outcome != wire::Outcome::kAnswered) return found;
  for (const Json::Value& completion : reply.data["completions"]) found.push_back(TextOf(completion, "text"));
  return found;
}

/// What can stand for a name of the usage line.
Words Candidates(std::string name, const std::string& typed) {
  if (name.find('|') != std::string::npos) return Split(name, '|');
  name = PlainWord(std::move(name));
  if (name == "QUERY") return QueryWords(typed);
  // Which shares and folders there are is read from files that are closed to ordinary users.
  if (!IsPrivileged() && (name == "SHARE" || name == "PATH")) return {};
  if (name == "SHARE") return sdk::SDKShare::Enum();
  if (name == "PATH") return SharePaths(typed);
  if (name == "KINDS") return KindLists(typed);
  if (name == "FILE") return {":files"};
  if (name == "USER") return {":users"};
  if (name == "FOLDER" || name == "NEW_FOLDER" || name == "MOUNT_POINT") return {":folders"};
  return {};
}

/// The first words of all commands, or the second ones of those that begin with `first`.
Words CommandWords(const std::string& first) {
  Words found;
  for (const CommandGroup& group : CommandTable()) {
    for (const Command& command : group.commands) {
      if (!MayUse(command)) continue;
      const Words name = Split(command.name, ' ');
      const std::string& word = first.empty() ? name[0] : name.back();
      if (!first.empty() && (name.size() < 2 || name[0] != first)) continue;
      if (found.empty() || found.back() != word) found.push_back(word);
    }
  }
  return found;
}

/// "--kinds=au" gives "--kinds=audio".
Words JoinedOptionWords(const Command& command, const std::string& typed) {
  const size_t value = typed.find('=') + 1;
  Words found;
  for (const Option& option : command.options) {
    if (option.value == nullptr || typed.compare(0, value - 1, option.name) != 0) continue;
    for (const std::string& candidate : Candidates(option.value, typed.substr(value))) {
      found.push_back(candidate[0] == ':' ? candidate : typed.substr(0, value) + candidate);
    }
  }
  return found;
}

/// Of a command, the last of the words given behind its name.
Words ArgumentWords(const Command& command, const Words& given) {
  const std::string& typed = given.back();
  size_t place = 0;                 // how many words of the usage line are given already
  const Option* pending = nullptr;  // the option whose value comes next
  for (size_t i = 0; i + 1 < given.size(); ++i) {
    const Option* known = pending;
    pending = nullptr;
    if (known != nullptr) continue;  // this word is an option's value
    if (given[i].compare(0, 2, "--") != 0) ++place;
    for (const Option& option : command.options) {
      if (given[i] == option.name && option.value != nullptr && option.value[0] != '[') pending = &option;
    }
  }
  if (pending != nullptr) return Candidates(pending->value, typed);
  if (typed.compare(0, 2, "--") == 0 && typed.find('=') != std::string::npos) return JoinedOptionWords(command, typed);
  if (typed.compare(0, 1, "-") == 0) {
    Words found = {"--help"};
    for (const Option& option : command.options) found.emplace_back(option.name);
    return found;
  }
  // The last name of the usage line stands for all further words where it may be repeated: "PATH...".
  const Words names = Split(command.words, ' ');
  if (place >= names.size()) {
    const bool repeated = names.back().find("...") != std::string::npos;
    return repeated ? Candidates(names.back(), typed) : Words();
  }
  return Candidates(names[place], typed);
}

/// What could stand at the place of the last word, without regard to what has been typed of it where that does not
/// matter. The words before it decide: a global option, a command's name, its options and words.
Words AllCompletions(Words& words) {
  if (words.size() > 1 && words[words.size() - 2] == "--root") return {":folders"};
  TakeRoot(words);
  if (words.empty()) return {};
  if (words.size() == 1) {
    Words found = CommandWords("");
    found.insert(found.end(), {"help", "--root", "--help", "--version"});
    return found;
  }
  if (words[0] == "help") {
    words.erase(words.begin());
    return words.size() == 1 ? CommandWords("") : words.size() == 2 ? CommandWords(words[0]) : Words();
  }
  size_t count = 0;
  const Words typed_before(words.begin(), words.end() - 1);
  const Command* command = FindCommand(typed_before, count);
  if (command == nullptr) return words.size() == 2 ? CommandWords(words[0]) : Words();
  return ArgumentWords(*command, {words.begin() + static_cast<std::ptrdiff_t>(count), words.end()});
}

}  // namespace

std::vector<std::string> Completions(std::vector<std::string> words) {
  const std::string typed = words.empty() ? "" : words.back();
  Words found;
  for (const std::string& candidate : AllCompletions(words)) {
    const bool for_shell = candidate.compare(0, 1, ":") == 0;
    if (candidate.find('\n') != std::string::npos) continue;  // such a name does not fit on a line
    if (for_shell || StringStartWith(candidate, typed)) found.push_back(candidate);
  }
  std::sort(found.begin(), found.end());
  found.erase(std::unique(found.begin(), found.end()), found.end());
  return found;
}

int PrintCompletions(const std::vector<std::string>& words) {
  for (const std::string& candidate : Completions(words)) (void)printf("%s\n", candidate.c_str());
  return kDone;
}

}  // namespace ferrox::cli
