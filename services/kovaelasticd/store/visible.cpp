#include "services/kovaelasticd/store/visible.h"

#include "services/kovaelasticd/store/name_marks.h"
#include "services/kovaelasticd/store/store_reader.h"

namespace ferrox::engine {

Visible::Visible(StoreReader& reader, const Asker* asker)
    : reader_(reader), asker_(asker), hidden_(reader.hidden.get()) {
  const Totals totals = LoadTotals(reader.database);
  version_ = totals.version;
  if (asker == nullptr) {
    documents_ = totals.documents;
    with_content_ = totals.with_content;
    text_bytes_ = totals.text_bytes;
    return;
  }
  if (reader.tree.IsFlat()) return;  // files of that format have no access records
  if (!asker->unseen_names.empty()) NameMarks::Require(reader.database, asker->unseen_names);
  places_ = reader.places.Load(reader.database, version_);
  readable_ = reader.readable.Load(reader.database, reader.tree, *places_, *asker);
  documents_ = readable_->Count();
  with_content_ = readable_->WithContent();
  text_bytes_ = readable_->TextBytes();
}

void Visible::Trim(DocSet& documents) const {
  if (IsForAsker()) {
    documents.IntersectWith(readable_ != nullptr ? readable_->Documents() : DocSet());
  } else if (hidden_ != nullptr) {
    documents.Subtract(*hidden_);
  }
}

DocSet Visible::All() const {
  if (IsForAsker()) return readable_ != nullptr ? readable_->Documents() : DocSet();
  DocSet all;
  Statement rows = reader_.database.Prepare("SELECT id FROM docs");
  while (rows.Step()) all.Add(rows.Int(0));
  Trim(all);
  return all;
}

}  // namespace ferrox::engine
