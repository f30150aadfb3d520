#pragma once

#include <sys/stat.h>

#include <algorithm>
#include <atomic>
#include <functional>
#include <map>
#include <mutex>
#include <set>
#include <string>
#include <vector>

#include <kova/content_extract.h>

#include "common/error.h"
#include "common/file_util.h"
#include "services/fileindexd/share_index.h"
#include "wire/folder_digest.h"

namespace ferrox::test {

/// An index in memory that behaves as the search engine is agreed to, and counts what it is asked to do.
class FakeIndex : public indexd::ShareIndex {
 public:
  struct Document {
    std::string stamp;
    bool with_content = false;
    std::string content;  ///< what was read when it was last upserted
    std::string access;
  };

  bool Exists() override {
    if (paused) throw Error(Error::kEngineIndexPaused, "paused");
    return exists;
  }
  void Create() override {
    exists = true;
    ++creations;
  }

  int64_t Rebuilding() override { return rebuilding; }
  void EndRebuilding(int64_t which) override {
    if (which == rebuilding) rebuilding = 0;
  }

  void Resume() override { paused = false; }
  void EndPreparing() override { ++prepared; }
  void NoteShare(const wire::IndexShare& share) override {
    if (before_note) before_note(share);
    notes.push_back(share.share + "|" + share.refused);
  }
  void Upsert(const std::string& path, bool need_meta) override {
    if (before_read) before_read(path);
    const Document document = {StampOf(path), need_meta, need_meta ? ContentOf(path) : "", AccessOf(path)};
    if (after_read) after_read(path);
    const std::lock_guard lock(mutex);
    if (before_write) before_write(path);
    ++upserts[path];
    Changed(path, document.stamp);
    documents[path] = document;
  }

  void Attr(const std::string& path) override {
    if (before_attr) before_attr(path);
    const std::string stamp = StampOf(path);
    const std::lock_guard lock(mutex);
    (void)RequireDocument(path);
    Changed(path, stamp);
    documents[path].stamp = stamp;
    documents[path].access = AccessOf(path);
  }

  indexd::AccessGaps SetAccess(const std::vector<wire::SeenAccess>& records) override {
    const std::lock_guard lock(mutex);
    indexd::AccessGaps gaps;
    for (size_t i = 0; i < records.size(); ++i) {
      const auto& [path, stamp, access] = records[i];
      const auto found = documents.find(path);
      (found == documents.end() ? folders[path] : found->second.access) = access;
      if (found == documents.end()) {
        gaps.missing.push_back(i);
      } else if (!KOVA::CONTENT_EXTRACT::SameContent(found->second.stamp, stamp)) {
        gaps.differing.push_back(i);
      } else {
        Changed(path, stamp);
        found->second.stamp = stamp;
      }
    }
    access_sets.insert(records.size());
    if (after_access) after_access(records);
    return gaps;
  }
  uint64_t WithoutAccess() override {
    const std::lock_guard lock(mutex);
    return static_cast<uint64_t>(
        std::count_if(documents.begin(), documents.end(), [](const auto& item) { return item.second.access.empty(); }));
  }

  void Delete(const std::vector<std::string>& paths, bool and_below) override {
    for (const std::string& path : paths) {
      const std::lock_guard lock(mutex);
      if (and_below) {
        std::erase_if(documents, [&path](const auto& item) { return StringStartWith(item.first, path + "/"); });
      }
      Changed(path, "");
      documents.erase(path);
    }
  }

  void Move(const std::string& new_path, const std::string& old_path, const std::string& stamp) override {
    const std::lock_guard lock(mutex);
    if (RequireDocument(old_path).stamp != stamp) throw Error(Error::kEngineNoSuchDocument, "another stamp");
    std::map<std::string, Document> moved;
    std::erase_if(documents, [&](const auto& item) {
      const bool moves = item.first == old_path || StringStartWith(item.first, old_path + "/");
      if (moves) moved[new_path + item.first.substr(old_path.size())] = item.second;
      return moves;
    });
    for (const auto& [path, document] : moved) documents[path] = document;
    ++renames;
  }

  void Commit() override { ++commits; }

  std::vector<indexd::IndexedEntry> List(const std::string& folder, const std::string& after, unsigned limit) override {
    const std::lock_guard lock(mutex);
    ++lists;
    std::vector<indexd::IndexedEntry> page;
    for (auto at = documents.upper_bound(after.empty() ? folder + "/" : after);
         at != documents.end() && StringStartWith(at->first, folder + "/") && page.size() < limit; ++at) {
      page.push_back(EntryOf(at->first, at->second));
    }
    return page;
  }

  std::vector<indexd::IndexedEntry> ListIn(const std::string& folder, const std::string& after,
                                           unsigned limit) override {
    std::vector<indexd::IndexedEntry> page = List(folder, after, ~0U);
    std::erase_if(page, [&folder](const auto& entry) { return Dirname(entry.path) != folder; });
    page.resize(std::min<size_t>(page.size(), limit));
    return page;
  }

  /// Two folders a page.
  indexd::FolderPage Folders(const std::string& folder, const std::string& after, uint64_t seed) override {
    const std::lock_guard lock(mutex);
    std::map<std::string, wire::FolderDigest> digests;
    for (const auto& [path, document] : documents) {
      wire::FolderDigest& digest = digests.try_emplace(Dirname(path) + "/", seed).first->second;
      unsigned marks = document.with_content ? wire::FolderDigest::kWithContent : wire::FolderDigest::kNone;
      if (document.access.empty()) marks |= wire::FolderDigest::kNoAccess;
      digest.Add(Basename(path), document.stamp, marks);
    }
    indexd::FolderPage page;
    for (auto at = digests.lower_bound(folder + "/"); at != digests.end() && !page.more; ++at) {
      if (!StringStartWith(at->first, folder + "/")) break;
      if (!after.empty() && at->first <= after + "/") continue;
      page.folders.push_back({at->first.substr(0, at->first.size() - 1), at->second.Value()});
      page.more = page.folders.size() == 2;
    }
    return page;
  }

  std::vector<indexd::IndexedEntry> Find(const std::string& path) override {
    const std::lock_guard lock(mutex);
    const auto found = documents.find(path);
    if (found == documents.end()) return {};
    return {EntryOf(path, found->second)};
  }

  std::vector<indexd::IndexedEntry> Suspects(const std::string& after, unsigned limit) override {
    const std::lock_guard lock(mutex);
    std::vector<indexd::IndexedEntry> page;
    for (auto at = suspects.upper_bound(after); at != suspects.end() && page.size() < limit; ++at) {
      if (documents.count(*at) != 0) page.push_back(EntryOf(*at, documents[*at]));
    }
    return page;
  }

  std::vector<indexd::IndexedEntry> OfFile(uint64_t file, const std::string& after, unsigned limit) override {
    const std::lock_guard lock(mutex);
    std::vector<indexd::IndexedEntry> page;
    for (auto at = documents.upper_bound(after); at != documents.end() && page.size() < limit; ++at) {
      if (!at->second.stamp.ends_with("." + std::to_string(file))) continue;
      page.push_back(EntryOf(at->first, at->second));
    }
    return page;
  }

  Json::Value Figures(std::chrono::milliseconds) override { return Json::Value(); }

  std::mutex mutex;
  bool exists = true;
  std::atomic<bool> paused{false};
  std::atomic<int64_t> rebuilding{0};
  std::map<std::string, Document> documents;
  std::map<std::string, std::string> folders;  ///< rights of what has no document
  std::set<std::string> suspects;
  std::map<std::string, int> upserts;
  int creations = 0;
  int renames = 0;
  int lists = 0;
  int commits = 0;
  int prepared = 0;
  std::vector<std::string> notes;
  std::function<void(const wire::IndexShare& share)> before_note;
  std::multiset<size_t> access_sets;                         ///< how many records each had
  std::function<void(const std::string& path)> before_read;  ///< by several threads
  std::function<void(const std::string& path)> after_read;   ///< by several threads
  std::function<void(const std::string& path)> before_write;
  std::function<void(const std::vector<wire::SeenAccess>& records)> after_access;
  std::function<void(const std::string& path)> before_attr;

 private:
  static std::string StampOf(const std::string& path) {
    struct stat status = {};
    if (lstat(path.c_str(), &status) != 0) throw Error(Error::kParseFailed, "Parse failed, path=" + path);
    return KOVA::CONTENT_EXTRACT::Stamp(status);
  }

  static std::string AccessOf(const std::string& path) {
    struct stat status = {};
    return lstat(path.c_str(), &status) == 0 ? KOVA::CONTENT_EXTRACT::Access(path, status) : "";
  }

  static indexd::IndexedEntry EntryOf(const std::string& path, const Document& document) {
    indexd::IndexedEntry entry = {path, document.stamp, document.with_content};
    entry.has_access = !document.access.empty();
    return entry;
  }

  static std::string ContentOf(const std::string& path) {
    std::string content;
    (void)ReadWholeFile(path, content);
    return content;
  }

  /// Before the document at `path` gets another stamp, or ("") is removed.
  void Changed(const std::string& path, const std::string& stamp) {
    suspects.erase(path);
    const std::string of = stamp.empty() && documents.count(path) != 0 ? documents[path].stamp : stamp;
    const std::string file = of.substr(std::min(of.size(), of.rfind('.')));
    for (const auto& [other, document] : documents) {
      if (other != path && document.stamp.ends_with(file) && document.stamp != stamp) suspects.insert(other);
    }
  }

  Document& RequireDocument(const std::string& path) {
    const auto found = documents.find(path);
    if (found == documents.end()) throw Error(Error::kEngineNoSuchDocument, "no such document");
    return found->second;
  }
};

}  // namespace ferrox::test
