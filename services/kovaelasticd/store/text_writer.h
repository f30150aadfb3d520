#pragma once

#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "services/kovaelasticd/store/document.h"
#include "services/kovaelasticd/store/sqlite_db.h"
#include "services/kovaelasticd/store/store_rows.h"
#include "services/kovaelasticd/store/text_codec.h"
#include "services/kovaelasticd/text/schema.h"

namespace ferrox::engine {

/// Writes the words of documents: the two full-text tables, and the texts themselves in "bodies".
///
/// A full-text table takes rows cheaply as long as their numbers grow; a lower number makes it write out what it has
/// gathered. It also keeps no text, so a document's old words are removed by handing it exactly what was added. Changes
/// are therefore kept in memory, one entry for each document with its words before and after, and written in the order
/// of the numbers by Flush. For the thread that writes, within its transaction; every member that writes throws Error
/// kEngineStorage, after which Forget goes with the rollback.
class TextWriter {
 public:
  /// `database` and `names` must outlive this; `names` are those that stored rows are packed with.
  TextWriter(Database& database, const FieldNames& names, std::shared_ptr<const Schema> schema)
      : database_(database), names_(names), schema_(std::move(schema)) {}

  /// A new document. Empty text: it has none.
  void Add(int64_t id, MetaText meta, std::string_view text);
  /// A document that `before` describes gets other words; without `text` it keeps the text that it has.
  void Replace(const StoredDocument& before, MetaText meta, std::optional<std::string_view> text);
  void Remove(const StoredDocument& before);
  /// Counts `bytes` of changed text, and writes all changes when too much of it waits.
  void Changed(int64_t bytes);

  /// The text of a document, changed or not; "" when it has none.
  std::string Text(int64_t id);

  /// Writes all changes to the tables.
  void Flush();
  /// Drops the changes that are not written.
  void Forget();

 private:
  /// A document whose words in the full-text tables are not yet what they must be.
  struct Pending {
    std::optional<MetaText> old_meta;  ///< as the full-text table has it; none: it is not in there
    std::optional<MetaText> new_meta;  ///< none: the document is removed
    bool text_changed = false;
    std::optional<std::string> text;  ///< none: it has no text; counts when text_changed
  };
  Pending& PendingOf(const StoredDocument& stored);
  void WriteText(int64_t id, const Pending& pending);
  void WriteMeta(int64_t id, const Pending& pending);
  void InsertMeta(int64_t id, const MetaText& meta, bool remove);
  std::string StoredText(int64_t id);

  Database& database_;
  const FieldNames& names_;
  const std::shared_ptr<const Schema> schema_;
  TextCodec codec_;
  std::map<int64_t, Pending> pending_;
  int64_t pending_bytes_ = 0;
  int64_t last_written_ = 0;  ///< the highest id of the last Flush
};

}  // namespace ferrox::engine
