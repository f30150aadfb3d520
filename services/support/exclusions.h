#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <string>
#include <string_view>
#include <unordered_map>
#include <utility>
#include <vector>

#include "base/mutex.h"
#include "base/pattern_lists.h"
#include "services/support/exclusion_source.h"

namespace ferrox::services {

/// What a file that patterns choose is left. In the order of strictness.
enum class Exclusion {
  kNone,      ///< all of it
  kNameOnly,  ///< a document without content
  kLeftOut,   ///< nothing, nor anything below
};

/// What the administrator has set for one share.
struct ExclusionRules {
  /// For all folders, each with its origin; later ones can take back what earlier ones choose.
  std::vector<std::pair<std::string, base::PatternLists>> instance;
  /// All indexed folders of the share, by full path, with their own patterns.
  std::map<std::string, base::PatternLists, std::less<>> folders;

  bool operator==(const ExclusionRules&) const = default;
};

/// Which pattern decided.
struct ExclusionReason {
  Exclusion exclusion = Exclusion::kNone;
  std::string path;     ///< what the pattern chose: the file, or a folder above it
  std::string origin;   ///< as ExclusionSource
  uint32_t line = 0;    ///< of a file; 0 of other origins
  std::string pattern;  ///< as written
};

/// The exclusions that hold in one folder. Immutable.
class FolderExclusions {
 public:
  /// Of what lies directly in the folder.
  Exclusion Of(std::string_view name, bool is_folder) const { return Decide(name, is_folder, nullptr); }
  /// The same as Of(...) == kLeftOut, and >= kNameOnly of what is not left out; each costs half.
  bool LeavesOut(std::string_view name, bool is_folder) const { return Is(Exclusion::kLeftOut, name, is_folder); }
  bool HidesContent(std::string_view name) const { return Is(Exclusion::kNameOnly, name, false); }

 private:
  friend class Exclusions;
  /// A source, and how far its patterns have come on the way to the folder.
  struct Reached {
    std::shared_ptr<const ExclusionSource> source;
    base::IgnorePatterns::State exclude;
    base::IgnorePatterns::State exclude_content;
  };
  using Chain = std::vector<Reached>;  ///< the last that matches decides

  static void Begin(Chain& chain, const std::shared_ptr<const ExclusionSource>& source);
  static Chain Entered(const Chain& chain, std::string_view name);
  static bool Chooses(const Chain& chain, Exclusion which, std::string_view name, bool is_folder,
                      ExclusionReason* reason);
  bool Is(Exclusion which, std::string_view name, bool is_folder) const;
  Exclusion Decide(std::string_view name, bool is_folder, ExclusionReason* reason) const;

  Exclusion inherited_ = Exclusion::kNone;
  Chain admin_;  ///< the instance's, then the indexed folder's
  Chain files_;  ///< the ignore files', from the indexed folder down
};

/// Which files of one share are left out of its index, or are in it by name only: by patterns of the administrator, and
/// by ignore files in the shared folders (docs/exclusions.md). Both are asked, and the stricter answer counts: no file
/// takes back what the administrator has set. An indexed folder begins afresh: what holds above it, whatever is set for
/// another indexed folder or stands in ignore files, does not hold in it, and no pattern chooses the folder itself.
///
/// Ignore files are read when their folder is first asked about, and then kept for the life of the object: it is made
/// for one pass. Every call is safe from several threads.
class Exclusions {
 public:
  using FolderPtr = std::shared_ptr<const FolderExclusions>;
  /// Told of each ignore file that is read: its path and why it is refused, "" when it is not, or is missing.
  using TellRefused = std::function<void(const std::string& path, const std::string& reason)>;

  /// `root` is the share's folder.
  Exclusions(
      std::string root, ExclusionRules rules, TellRefused tell = [](const std::string&, const std::string&) {});

  /// What holds in `folder`. With `may_have_file` false, the caller has seen that the folder has no ignore file.
  FolderPtr In(const std::string& folder, bool may_have_file = true);
  /// Of a path at or below the root. Looks at no file but ignore files.
  Exclusion Of(const std::string& path, bool is_folder);
  bool LeavesOut(const std::string& path, bool is_folder) { return Of(path, is_folder) == Exclusion::kLeftOut; }
  /// Whether a file that is not left out has its name alone in the index.
  bool HidesContent(const std::string& path);
  /// Whether the path is left out whatever it is, a file or a folder.
  bool LeavesOutAll(const std::string& path) { return LeavesOut(path, false) && LeavesOut(path, true); }
  /// Has ignore files read again where they are asked about next.
  void Forget();
  /// Which pattern decided Of; for people.
  ExclusionReason Explain(const std::string& path, bool is_folder);

 private:
  bool IsConfigured(std::string_view path) const { return rules_.folders.find(path) != rules_.folders.end(); }
  FolderPtr Known(const std::string& folder) const;
  FolderPtr Make(const std::string& folder, bool may_have_file);
  void AddFile(FolderExclusions& made, const std::string& folder) const;

  const std::string root_;
  const ExclusionRules rules_;
  const TellRefused tell_;
  std::vector<std::shared_ptr<const ExclusionSource>> instance_;
  const FolderPtr nothing_;
  const FolderPtr left_out_;

  mutable base::Mutex mutex_;
  std::unordered_map<std::string, FolderPtr> by_folder_ BASE_GUARDED_BY(mutex_);
  /// The last one asked about: most questions are about files of one folder after the other.
  mutable std::string last_folder_ BASE_GUARDED_BY(mutex_);
  mutable FolderPtr last_ BASE_GUARDED_BY(mutex_);
};

}  // namespace ferrox::services
