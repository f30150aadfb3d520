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
#include "services/kovaelasticd/store/word_purge.h"
#include "services/kovaelasticd/store/words.h"
#include "services/kovaelasticd/text/schema.h"

namespace ferrox::engine {

/// Words in the index file: the two full-text tables, and the texts themselves in "bodies".
///
/// A full-text table takes rows cheaply as long as their numbers grow; a lower number makes it write out what it has
/// gathered. It also keeps no text, so a document's old words are removed by handing it exactly what was added. Changes
/// are therefore kept in memory, one entry for each document with its words before and after, and written in the order
/// of the numbers by Flush, within the transaction that is open.
class SqliteWords : public Words {
 public:
  /// `database` and `names` must outlive this; `names` are those that stored rows are packed with.
  SqliteWords(Database& database, const FieldNames& names, std::shared_ptr<const Schema> schema)
      : database_(database), names_(names), schema_(std::move(schema)) {}

  void Add(int64_t id, MetaText meta, std::string_view text) override;
  void Replace(const StoredDocument& before, MetaText meta, std::optional<std::string_view> text) override;
  void Remove(const StoredDocument& before) override;
  void Changed(int64_t bytes) override;
  std::string Text(int64_t id) override;
  void Flush() override;
  void Forget() override;
  void RebuildSuggestions() override;
  Purged Purge(const DocSet& documents, int64_t pages) override;
  void EndPurge() override { purges_.reset(); }
  void RemovePurged(int64_t id) override;

 private:
  /// A document whose words in the full-text tables are not yet what they must be.
  struct Pending {
    std::optional<MetaText> old_meta;  ///< as the full-text table has it; none: it is not in there
    std::optional<MetaText> new_meta;  ///< none: the document is removed
    bool text_changed = false;
    std::optional<std::string> text;  ///< none: it has no text; counts when text_changed
    /// Words of the text, too, since their stems are those of its language.
    bool ChangesContent() const {
      return text_changed || (old_meta.has_value() && old_meta->language != new_meta->language);
    }
  };
  Pending& PendingOf(const StoredDocument& stored);
  void WriteText(int64_t id, const Pending& pending);
  void InsertText(int64_t id, Language language, std::string_view text, bool remove);
  void WriteMeta(int64_t id, const Pending& pending);
  void InsertMeta(int64_t id, const MetaText& meta, bool remove);
  std::string StoredText(int64_t id);

  struct Purges {
    explicit Purges(Database& database) : content(database, "content_fts"), meta(database, "meta_fts") {}
    WordPurge content;
    WordPurge meta;
  };

  Database& database_;
  const FieldNames& names_;
  const std::shared_ptr<const Schema> schema_;
  TextCodec codec_;
  std::map<int64_t, Pending> pending_;
  int64_t pending_bytes_ = 0;
  int64_t last_written_ = 0;        ///< the highest id of the last Flush
  std::unique_ptr<Purges> purges_;  ///< while documents are purged
};

}  // namespace ferrox::engine
