#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "services/kovaelasticd/store/catalogue.h"
#include "services/kovaelasticd/store/doc_set.h"
#include "services/kovaelasticd/store/words.h"

namespace ferrox::engine {

struct ClearingLimits {
  int64_t large = 200;           ///< a folder with so many documents below it is taken out
  int64_t turn_documents = 500;  ///< what a turn takes out at most: some 50 ms of work, since commits wait for it
  int64_t turn_bytes = 1 << 20;  ///< the same, of text
  int64_t turn_pages = 512;      ///< the same, of full-text tables
  int64_t purged_part = 16;      ///< from this part of all documents on, their words are taken out together
};

/// Deletes folders with all below them in two steps. TakeOut, part of the change that deletes, takes the folder out of
/// the tree and its documents out of the sums, so that from the commit on nobody finds them (HiddenDocuments); names
/// can be made again at once. Afterwards Turn takes their rows and words out, the folder that was deleted first before
/// the others, a few documents in each transaction. Where they are more than a small part of the index, their words go
/// before that, all together (Words::Purge), which costs less.
///
/// For the thread that writes; every member throws Error kEngineStorage.
class Clearing {
 public:
  /// Both outlive this.
  Clearing(Catalogue& catalogue, Words& words)
      : database_(catalogue.Connection()),
        tree_(catalogue.Tree()),
        links_(catalogue.Links()),
        totals_(catalogue.Sums()),
        words_(words) {}

  /// Whether so much is below the folder that taking it out costs less than removing its documents one by one.
  bool IsLarge(int64_t folder);
  /// Takes the folder out, in the transaction that is open.
  void TakeOut(int64_t folder);
  /// Takes some of the documents out that are left, in the transaction that is open.
  void Turn();
  void SetLimits(const ClearingLimits& limits) { limits_ = limits; }
  /// After a rollback.
  void Forget();

 private:
  /// Documents whose words are taken out together.
  struct Purge {
    DocSet documents;
    bool done;
  };

  void BeginPurge();
  void ContinuePurge();
  void EndPurge();
  void RemoveRows();
  void RemoveDocuments(int64_t folder, int64_t& documents_left, int64_t& bytes_left);

  Database& database_;
  FolderTree& tree_;
  FileLinks& links_;
  Totals& totals_;
  Words& words_;
  ClearingLimits limits_;
  uint64_t last_name_ = 0;  ///< of the folder taken out last
  std::optional<Purge> purge_;
  bool can_purge_ = true;
  std::vector<int64_t> folders_;  ///< the folder that is cleared and those below it, which are still there
};

}  // namespace ferrox::engine
