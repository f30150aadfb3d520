#include "cli/kinds.h"

#include <algorithm>

#include "cli/command.h"
#include "cli/did_you_mean.h"
#include "cli/format.h"
#include "fileindex/util.h"

namespace ferrox::cli {

namespace {

size_t KindAt(const std::string& path) { return static_cast<size_t>(fileindex::GetFileTypeByFullPath(path)); }

}  // namespace

std::string KindNameOf(const std::string& path) {
  const size_t kind = KindAt(path);
  return kind < kKinds.size() ? kKinds[kind] : "";
}

bool Kinds::WantsContent(const std::string& path) const {
  const size_t kind = KindAt(path);
  return kind >= chosen_.size() || chosen_[kind];
}

/// An empty name between two commas is refused like any other that is not known.
Kinds::Kinds(const std::string& text) {
  chosen_.fill(text == "all");
  if (text == "all" || text == "none") return;
  for (const std::string& name : Split(text, ',')) {
    const auto kind = std::find(kKinds.begin(), kKinds.end(), name);
    if (kind == kKinds.end()) {
      throw UsageError("--kinds takes document, audio, video, photo, joined with commas; or all, or none; not \"" +
                       name + "\"" + DidYouMean(name, {kKinds.begin(), kKinds.end()}));
    }
    chosen_[static_cast<size_t>(kind - kKinds.begin())] = true;
  }
}

Kinds::Kinds(const Json::Value& folder) {
  for (size_t i = 0; i < kKinds.size(); ++i) chosen_[i] = BoolOf(folder, kKinds[i]);
}

void Kinds::Store(Json::Value& folder) const {
  for (size_t i = 0; i < kKinds.size(); ++i) folder[kKinds[i]] = chosen_[i];
}

std::string Kinds::Text() const {
  if (std::all_of(chosen_.begin(), chosen_.end(), [](bool chosen) { return chosen; })) return "all kinds";
  std::string text;
  for (size_t i = 0; i < kKinds.size(); ++i) {
    if (chosen_[i]) text += (text.empty() ? "" : ", ") + std::string(kKinds[i]);
  }
  return text.empty() ? "names only" : text;
}

}  // namespace ferrox::cli
