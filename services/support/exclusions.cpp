#include "services/support/exclusions.h"

#include "base/path.h"

namespace ferrox::services {

namespace {

/// Bounds memory; the folders are asked about in the order of the tree, mostly.
constexpr size_t kFoldersKept = 4096;

}  // namespace

void FolderExclusions::Begin(Chain& chain, const std::shared_ptr<const ExclusionSource>& source) {
  if (source != nullptr) chain.push_back({source, source->exclude.Begin(), source->exclude_content.Begin()});
}

FolderExclusions::Chain FolderExclusions::Entered(const Chain& chain, std::string_view name) {
  Chain entered;
  entered.reserve(chain.size() + 1);
  for (const Reached& above : chain) {
    entered.push_back({above.source, above.source->exclude.Enter(above.exclude, name),
                       above.source->exclude_content.Enter(above.exclude_content, name)});
  }
  return entered;
}

bool FolderExclusions::Chooses(const Chain& chain, Exclusion which, std::string_view name, bool is_folder,
                               ExclusionReason* reason) {
  for (auto reached = chain.rbegin(); reached != chain.rend(); ++reached) {
    const bool all = which == Exclusion::kLeftOut;
    const base::IgnorePatterns& patterns = all ? reached->source->exclude : reached->source->exclude_content;
    const int match = patterns.Match(all ? reached->exclude : reached->exclude_content, name, is_folder);
    if (match == base::IgnorePatterns::kNone) continue;
    if (patterns.TakesBack(match)) return false;
    if (reason != nullptr) {
      *reason = {which, "", reached->source->origin, patterns.LineOf(match), patterns.TextOf(match)};
    }
    return true;
  }
  return false;
}

bool FolderExclusions::Is(Exclusion which, std::string_view name, bool is_folder) const {
  return inherited_ >= which || Chooses(admin_, which, name, is_folder, nullptr) ||
         Chooses(files_, which, name, is_folder, nullptr);
}

/// What is chosen by a folder above is chosen, whatever patterns say of it.
Exclusion FolderExclusions::Decide(std::string_view name, bool is_folder, ExclusionReason* reason) const {
  if (inherited_ == Exclusion::kLeftOut) return inherited_;
  for (const Exclusion which : {Exclusion::kLeftOut, Exclusion::kNameOnly}) {
    if (inherited_ == which) return which;
    if (Chooses(admin_, which, name, is_folder, reason) || Chooses(files_, which, name, is_folder, reason)) {
      return which;
    }
  }
  return Exclusion::kNone;
}

Exclusions::Exclusions(std::string root, ExclusionRules rules, TellRefused tell)
    : root_(std::move(root)),
      rules_(std::move(rules)),
      tell_(std::move(tell)),
      nothing_(std::make_shared<FolderExclusions>()),
      left_out_([] {
        auto left_out = std::make_shared<FolderExclusions>();
        left_out->inherited_ = Exclusion::kLeftOut;
        return left_out;
      }()) {
  for (const auto& [origin, lists] : rules_.instance) {
    if (auto source = SourceOf(origin, lists)) instance_.push_back(std::move(source));
  }
}

Exclusions::FolderPtr Exclusions::Known(const std::string& folder) const {
  const base::MutexLock lock(mutex_);
  if (last_ != nullptr && last_folder_ == folder) return last_;
  const auto found = by_folder_.find(folder);
  if (found == by_folder_.end()) return nullptr;
  last_folder_ = folder;
  last_ = found->second;
  return last_;
}

Exclusions::FolderPtr Exclusions::In(const std::string& folder, bool may_have_file) {
  if (FolderPtr known = Known(folder)) return known;
  FolderPtr made = Make(folder, may_have_file);
  const base::MutexLock lock(mutex_);
  if (by_folder_.size() >= kFoldersKept) by_folder_.clear();
  return by_folder_.emplace(folder, std::move(made)).first->second;
}

/// Folders on the way to indexed ones have no exclusions.
Exclusions::FolderPtr Exclusions::Make(const std::string& folder, bool may_have_file) {
  const auto configured = rules_.folders.find(folder);
  FolderExclusions made;
  if (configured != rules_.folders.end()) {
    for (const auto& source : instance_) FolderExclusions::Begin(made.admin_, source);
    FolderExclusions::Begin(made.admin_, SourceOf("folder set of " + folder, configured->second));
  } else {
    if (!base::IsBelow(folder, root_)) return nothing_;
    const FolderPtr above = In(std::string(base::ParentOf(folder)));
    if (above == nothing_) return nothing_;
    const std::string name = base::NameOf(folder);
    made.inherited_ = above->Of(name, true);
    if (made.inherited_ == Exclusion::kLeftOut) return left_out_;
    made.admin_ = FolderExclusions::Entered(above->admin_, name);
    made.files_ = FolderExclusions::Entered(above->files_, name);
  }
  may_have_file ? AddFile(made, folder) : tell_(folder + "/" + kIgnoreFileName, "");
  return std::make_shared<const FolderExclusions>(std::move(made));
}

void Exclusions::AddFile(FolderExclusions& made, const std::string& folder) const {
  const IgnoreFile file = ReadIgnoreFile(root_, folder);
  tell_(folder + "/" + kIgnoreFileName, file.refused);
  FolderExclusions::Begin(made.files_, file.source);
}

Exclusion Exclusions::Of(const std::string& path, bool is_folder) {
  if (!base::IsBelow(path, root_) || IsConfigured(path)) return Exclusion::kNone;
  const std::string_view folder = base::ParentOf(path);
  return In(std::string(folder))->Of(std::string_view(path).substr(folder.size() + 1), is_folder);
}

void Exclusions::Forget() {
  const base::MutexLock lock(mutex_);
  by_folder_.clear();
  last_ = nullptr;
}

bool Exclusions::HidesContent(const std::string& path) {
  if (!base::IsBelow(path, root_)) return false;
  const std::string_view folder = base::ParentOf(path);
  return In(std::string(folder))->HidesContent(std::string_view(path).substr(folder.size() + 1));
}

/// Goes up to the indexed folder, and down again: the topmost that is chosen decides.
ExclusionReason Exclusions::Explain(const std::string& path, bool is_folder) {
  ExclusionReason reason;
  if (!base::IsBelow(path, root_) || IsConfigured(path)) return reason;
  const std::string folder(base::ParentOf(path));
  reason = Explain(folder, true);
  if (reason.exclusion == Exclusion::kLeftOut) return reason;
  ExclusionReason own;
  const Exclusion exclusion = In(folder)->Decide(base::NameOf(path), is_folder, &own);
  if (own.exclusion == Exclusion::kNone || exclusion <= reason.exclusion) return reason;
  own.path = path;
  return own;
}

}  // namespace ferrox::services
