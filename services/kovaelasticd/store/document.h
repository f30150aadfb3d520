#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include <json/value.h>

#include "services/kovaelasticd/text/schema.h"
#include "services/kovaelasticd/text/stems.h"

namespace ferrox::engine {

/// Numbers for the names of document fields, so that stored documents are short. Numbers count from 1, in the order in
/// which an index met the names, and never change: rows refer to them. For one thread at a time.
class FieldNames {
 public:
  void Add(int64_t number, const std::string& name);
  /// The number of `name`; 0 when it has none.
  int64_t NumberOf(const std::string& name) const;
  /// The name of `number`; null when unknown.
  const std::string* NameOf(int64_t number) const;
  int64_t Largest() const { return static_cast<int64_t>(names_.size()); }

 private:
  std::unordered_map<std::string, int64_t> numbers_;
  std::vector<std::string> names_;  ///< number 1 first
};

/// A document as the table of documents holds it: what is filtered and sorted by has a column, the rest is packed.
/// Fields that follow from the columns are only noted.
struct DocRow {
  std::string path;
  std::string name;
  std::string ext;
  int32_t kind = kOther;
  std::optional<int64_t> size;
  std::optional<int64_t> mtime;
  uint32_t derived = 0;                 ///< bits of the fields that follow from the columns
  std::string error;                    ///< why its content could not be read; empty when nothing is wrong
  std::string packed;                   ///< all other fields except the text content and the access record
  int64_t access = 0;                   ///< number of its access record; 0: none
  Language language = Language::kNone;  ///< whose stems its words have
  std::string title;                    ///< what its text calls itself (TitleOf); "" for none
};

/// The texts of a document that are searched, beside its content: the columns of meta_fts. They follow from the
/// document and the schema alone, so that the words of a stored document can be computed again in order to remove them.
struct MetaText {
  Language language = Language::kNone;  ///< of the content, too
  std::string grams;                    ///< the name, for parts of it
  std::string name;                     ///< the name, for its words
  std::string title;                    ///< "KOVAMDTitle", and the title that its text has
  std::string text;                     ///< the fields that plain words look into
  std::string fields;                   ///< words marked with the field that they stand in
  bool operator==(const MetaText& other) const = default;
};

/// Texts handed to the full-text index begin with one of these. Prose, which is cut into words with their stems; next
/// stands its language (ProseMark).
inline constexpr char kProseMark = '\x01';
/// A name, of which all groups of three characters are taken.
inline constexpr char kGramsMark = '\x02';
/// Words that are taken as they are, each ended by kReadyEnd.
inline constexpr char kReadyMark = '\x03';
inline constexpr char kReadyEnd = '\x1E';
/// What prose in that language begins with.
std::string ProseMark(Language language);
inline constexpr size_t kProseMarkBytes = 2;
/// The language of prose, from what it begins with.
Language MarkedLanguage(std::string_view prose);
/// Stands between a field's name and the word, in a word marked with its field.
inline constexpr char kFieldEnd = '\x1F';
/// Stands for a field's name before the words of a folder's own name, by which what lies in it is found; the stems that
/// these words have in any language follow them.
inline constexpr char kFolderNameField[] = "/";
/// The word by which a number in a field is found; words of one field have the order of their numbers.
std::string RangeWord(const std::string& field_name, int64_t number);

/// The row of a document, without its access record, language and title. `names` must know every member (see
/// NamesNeeded).
DocRow PackDocument(const std::string& path, const Json::Value& document, const FieldNames& names);
/// The bit of a field in DocRow::derived; 0 for one that never follows from columns.
uint32_t DerivedBit(const std::string& name);
/// The members of `document` whose names `names` does not know yet.
std::vector<std::string> NamesNeeded(const Json::Value& document, const FieldNames& names);
/// The fields of a stored document, without text content and access record; only those in `wanted` unless that is
/// empty.
Json::Value UnpackDocument(const DocRow& row, const FieldNames& names, const std::vector<std::string>& wanted);

/// The searched texts of a document that is stored as `row`.
MetaText MakeMetaText(const DocRow& row, const Json::Value& document, const Schema& schema);

}  // namespace ferrox::engine
