#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include <json/value.h>

#include "services/kovaelasticd/query/query.h"
#include "services/kovaelasticd/query/synonyms.h"
#include "services/kovaelasticd/store/asker.h"

namespace ferrox::engine {

/// Which documents Get lists: the one at `term`, or the suspects, or the unread, or those of `file`, or those directly
/// in `folder`, or those whose path begins with `prefix`, in the order of their paths.
struct GetRequest {
  std::string term;
  std::string prefix;
  std::string after;                ///< only paths behind this one
  int64_t limit = -1;               ///< at most so many; below 0: all
  std::vector<std::string> fields;  ///< the fields to load; empty: all
  /// Documents that may be older than their file, since a change was reported under another of its names only.
  bool suspects = false;
  bool unread = false;      ///< documents with "_KOVAExtractError"
  uint64_t file = 0;        ///< the number at the end of "_KOVAStamp"; 0: not asked for
  std::string folder = {};  ///< with "/" at its end
};

/// Which folders Digests tells of: those at and below `path` that have documents directly in them. The paths of folders
/// have a "/" at their end.
struct DigestRequest {
  std::string path;
  std::string after;               ///< only folders behind this one; "": from the first
  uint64_t seed = 0;               ///< of the digests (wire::FolderDigest)
  int64_t limit = 1000;            ///< at most so many folders
  int64_t most_in_folder = 50000;  ///< a folder with more documents directly in it has no digest
  int64_t most_documents = 50000;  ///< no further folder once so many documents were looked at
};

/// Documents whose content was wanted, and was not read or not all of it.
struct UnreadContent {
  std::string type;     ///< "KOVAMDContentType"; "": it has none
  int64_t version = 0;  ///< "_KOVAExtractVersion"
};

struct FolderState {
  std::string path;
  int64_t documents = 0;                   ///< directly in it
  std::optional<uint64_t> digest = {};     ///< of these
  std::vector<UnreadContent> unread = {};  ///< of these, each kind once
};

struct DigestPage {
  std::vector<FolderState> folders;
  bool more = false;  ///< there may be folders behind these
};

/// What hits are ordered by.
enum class SortKey { kRelevance, kDate, kName, kSize };

/// A search in one index.
struct SearchRequest {
  const QueryNode* query = nullptr;  ///< lives as long as the search
  int64_t offset = 0;
  int64_t limit = 20;
  SortKey sort = SortKey::kRelevance;
  bool ascending = false;
  bool snippet = true;
  bool all_words = false;      ///< every word of the query is needed, as if each were required
  bool explain = false;        ///< hits tell what their score is made of
  size_t ranked_max = 200000;  ///< so many documents, the newest added, are ranked at most for one word
  std::string mark_start = "[";
  std::string mark_end = "]";
  const Synonyms* synonyms = nullptr;  ///< lives as long as the search; null: none
  const Asker* asker = nullptr;        ///< lives as long as the search; null: whoever asks may read everything
  /// In how many documents of other indices that are asked as well a word of the query stands: as if it were in so many
  /// more of this one, it is not repaired, or beside it only. Empty for one index.
  std::map<std::string, int64_t> elsewhere = {};
  /// Unless "": no query, but the beginning of a word. The reply has completions of it alone, `limit` at most.
  std::string completed = {};
};

/// What one word of a query, or something else about a document, adds to its score.
struct ScorePart {
  std::string what;   ///< the word as it was found, or "recent" and the like
  std::string where;  ///< "name", "title", "text", "folder" ...; "" for what is no word
  double adds = 0;
};

/// A word of a query that was looked for in another spelling.
struct RepairedWord {
  std::string from;   ///< as it was typed, folded
  std::string to;     ///< a word of documents that whoever asks may read
  bool also = false;  ///< `from` itself is found too: its hits come first
};

/// A word that what was typed is the beginning of.
struct Completion {
  std::string word;
  int64_t documents = 0;  ///< that have it; of a word of names and titles, there
  bool in_name = false;   ///< in names or titles
};

/// A document that was found, as it is shown.
struct SearchHit {
  std::string path;
  double score = 0;
  int64_t number_key = 0;  ///< date or size, for merging the hits of several indices
  std::string name_key;    ///< the name, for the same
  std::string snippet;
  Json::Value fields;
  std::string stamp = {};  ///< "_KOVAStamp"; "": it has none
  bool is_folder = false;
  std::string title = {};                   ///< of its text; "": it has none
  bool has_all = true;                      ///< it counts in SearchReply::total_all
  std::vector<ScorePart> explanation = {};  ///< when it was asked for, what adds most first
};

struct SearchReply {
  int64_t total = 0;                         ///< all documents found, whether shown or not
  std::optional<int64_t> total_all;          ///< of these, those with all words; nothing where all have them anyway
  std::vector<std::string> ignored;          ///< words in so many documents that they find none by themselves
  std::vector<RepairedWord> repaired;        ///< in the order of the query
  std::map<std::string, int64_t> documents;  ///< that have the single plain words, as they are typed, or a synonym
  std::vector<RepairedWord> synonyms;        ///< words that were looked for as others, too, which documents have
  bool none_has_all = false;                 ///< all_words was asked for, no document has all, and some words sufficed
  bool ranking_bounded = false;              ///< there were more than ranked_max to order; some were left out of that
  std::vector<SearchHit> hits;               ///< from the first, offset + limit of them at most
  std::vector<std::string> suggestions;      ///< other spellings, when nothing was found
  std::vector<Completion> completions;       ///< where it was no search
  std::vector<std::string> hints = {};       ///< sentences about what was looked for otherwise than it may be meant
};

/// Figures of an index; those of documents are as of its last commit.
struct StoreStat {
  int64_t documents = 0;
  int64_t with_content = 0;    ///< of these, those with text
  int64_t bytes_on_disk = 0;   ///< of all its files
  int64_t text_bytes = 0;      ///< of all texts, unpacked
  int64_t without_access = 0;  ///< documents that have no access record
  bool preparing = false;      ///< it came without access records: those without are still to be given theirs
  int64_t clearing = 0;        ///< documents that are deleted, but whose words are still to be taken out (ClearSome)
  std::map<std::string, int64_t> extract_errors;  ///< documents for each reason why content could not be read
  std::map<std::string, std::vector<std::string>> extract_error_examples;  ///< of each reason, one or two paths
};

/// What was seen of the file at `path`.
struct AccessChange {
  std::string path;
  std::string stamp;   ///< "_KOVAStamp"
  std::string access;  ///< "_KOVAAccess"
};

/// Positions in the list that SetAccess was given.
struct AccessReport {
  std::vector<size_t> differing;  ///< of documents whose content is not that of the stamp
  std::vector<size_t> missing;    ///< of paths without a document
};

/// One index: its documents, and what finds them. Changes, Get, Digests and Commit are for one thread at a time; Search
/// and Stat may be called by any number of others meanwhile, never wait for a change, and see what was committed. Every
/// member throws Error kEngineStorage, with the file and the remedy, when the disk is full or the file is unusable;
/// after that, call Rollback.
class IndexStore {
 public:
  IndexStore() = default;
  IndexStore(const IndexStore&) = delete;
  IndexStore& operator=(const IndexStore&) = delete;
  virtual ~IndexStore();

  /// Stores a document in place of the one at `path`, if there is one.
  virtual void Upsert(const std::string& path, const Json::Value& document) = 0;
  /// Changes members of the document at `path`; null removes one. A new KOVAMDPath moves the document and replaces
  /// what is there. @throws Error kEngineNoSuchDocument, nothing is changed then.
  virtual void Set(const std::string& path, const Json::Value& changes) = 0;
  /// Set for the document at `path`, whose new KOVAMDPath must be given, and all documents below it move along. What
  /// follows from a path (parent, names) follows; nothing else of theirs changes, and it costs the same whatever is
  /// below, unless there are documents below the new path already: those that meet one that moves are replaced then.
  /// `stamp`, unless "", is what the document's "_KOVAStamp" must be.
  /// Neither path may lie at or below the other.
  /// @throws Error kEngineNoSuchDocument where none is at `path`, or another; nothing is changed then.
  virtual void MoveFolder(const std::string& path, const std::string& stamp, const Json::Value& changes) = 0;
  /// Sets the rights of documents, as Set would set "_KOVAAccess" and the members that change with it: stamp, owner,
  /// group, date of the change. Of a document whose content differs from what was seen only the access record is set,
  /// and where there is none, that of a folder at the path. Stamps and records must be well-formed. Cheap, unless owner
  /// or group change: they are searched for.
  virtual AccessReport SetAccess(const std::vector<AccessChange>& changes) = 0;
  /// The index came without access records (Preparing), and all that can be had of them are there now.
  virtual void EndPreparing() = 0;
  virtual void Delete(const std::string& path) = 0;
  /// Large folders cost no more than a look at the rows of their documents. Their words are left to ClearSome.
  virtual void DeletePrefix(const std::string& prefix) = 0;
  /// Lists documents, uncommitted ones too.
  virtual void Get(const GetRequest& request, const std::function<void(Json::Value)>& take) = 0;
  /// Digests of the documents in folders, in the order in which Get lists what is in these; uncommitted changes count.
  virtual DigestPage Digests(const DigestRequest& request) = 0;
  /// Makes all changes durable and visible to Search.
  virtual void Commit() = 0;
  /// Forgets the changes since the last commit.
  virtual void Rollback() = 0;
  /// How much has been changed since the last commit, in bytes of text, roughly.
  virtual int64_t UncommittedBytes() const = 0;
  /// How many documents are deleted, uncommitted deletions too, but still to be cleared.
  virtual int64_t Uncleared() const = 0;
  /// Takes the words of some of them out, as a transaction of its own of some 50 ms, and commits it. No changes may be
  /// uncommitted. To be called until Uncleared is 0; what is left at the end of the process is there when the index is
  /// opened again.
  virtual void ClearSome() = 0;
  /// Whether askers with `rules` (Asker::unseen_names) can be answered, as far as the last commit is concerned.
  virtual bool Obeys(const std::string& rules) const = 0;
  /// Compares some names with `rules`, in place of those before, as a transaction of its own of some 50 ms, and commits
  /// it. No changes may be uncommitted. To be called until Obeys; it begins anew when the index is opened again.
  virtual void ObeySome(const std::string& rules) = 0;
  /// When to call GiveBack next; nothing while there is nothing to give back. For any thread.
  virtual std::optional<std::chrono::steady_clock::time_point> NextGiveBack() const { return std::nullopt; }
  /// Frees memory that only saves time, if nobody has used it for some minutes before `now`.
  virtual void GiveBack(std::chrono::steady_clock::time_point /*now*/) {}
  /// Rebuilds the words that are suggested when a search finds nothing; ClearSome does it at its end while documents
  /// are to be cleared.
  virtual void RebuildSuggestions() = 0;

  virtual SearchReply Search(const SearchRequest& request) = 0;
  virtual StoreStat Stat() = 0;
  /// StoreStat::preparing at no cost, as of the last commit. For any thread.
  virtual bool Preparing() const = 0;
};

}  // namespace ferrox::engine
