#pragma once

#include <cstdint>
#include <random>
#include <string>

#include "common/file_util.h"
#include "services/fileindexd/share_index.h"

namespace ferrox::indexd {

/// The folders at and below one in which the index has documents, in byte order of their paths with a "/" at the end,
/// fetched by pages. For one thread.
class IndexedFolders {
 public:
  /// Both must outlive it.
  IndexedFolders(const std::string& folder, ShareIndex& index) : folder_(folder), index_(index) {
    std::random_device random;
    seed_ = uint64_t{random()} << 32 | random();
    Fetch("");
  }

  /// Null at the end.
  const FolderState* Current() const { return next_ < page_.folders.size() ? &page_.folders[next_] : nullptr; }
  /// What paths in the folder at hand begin with.
  std::string Prefix() const { return Current()->path + "/"; }
  /// Of the digests.
  uint64_t Seed() const { return seed_; }

  void Advance() {
    if (++next_ == page_.folders.size() && page_.more) Fetch(std::string(page_.folders.back().path));
  }
  /// Passes by the folder `path` and all below it.
  void SkipTree(const std::string& path) {
    while (Current() != nullptr && StringStartWith(Prefix(), path + "/")) Advance();
  }

 private:
  void Fetch(const std::string& after) {
    page_ = index_.Folders(folder_, after, seed_);
    next_ = 0;
  }

  const std::string& folder_;
  ShareIndex& index_;
  uint64_t seed_ = 0;
  FolderPage page_;
  size_t next_ = 0;
};

}  // namespace ferrox::indexd
