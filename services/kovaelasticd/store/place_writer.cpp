#include "services/kovaelasticd/store/place_writer.h"

#include <algorithm>
#include <string>

#include "services/kovaelasticd/store/length_class.h"

namespace ferrox::engine {

namespace {

constexpr auto kPlacesInPart = static_cast<int64_t>(PlaceList::kPart);
/// From so many changed places of a part on, one pass over all of its rows is cheaper.
constexpr int64_t kReadAllFrom = 64;

}  // namespace

const PlaceWriter::List PlaceWriter::kDocuments = {
    0, "SELECT id, folder, access, text_bytes, leaf FROM docs WHERE id = ?1",
    "SELECT id, folder, access, text_bytes, leaf FROM docs WHERE id BETWEEN ?1 AND ?2"};
const PlaceWriter::List PlaceWriter::kFolders = {
    1, "SELECT id, parent, access, 0, name FROM folders WHERE id = ?1",
    "SELECT id, parent, access, 0, name FROM folders WHERE id BETWEEN ?1 AND ?2"};

void PlaceWriter::MakeTable() {
  // Of which patterns the marks are (NameMarks); places that are made anew have none.
  database_.Execute(
      "CREATE TABLE IF NOT EXISTS name_rules(id INTEGER PRIMARY KEY, rules TEXT NOT NULL, complete INTEGER NOT NULL)");
  if (database_.QueryInt("SELECT count(*) FROM sqlite_master WHERE name = 'locations'") != 0) return;
  database_.Execute("BEGIN IMMEDIATE");
  try {
    database_.Execute("DELETE FROM name_rules WHERE id > 0");
    database_.Execute("DROP TABLE IF EXISTS places");  // the same with less in it, which files had before
    database_.Execute(
        "CREATE TABLE locations(part INTEGER PRIMARY KEY, version INTEGER NOT NULL, packed BLOB NOT NULL)");
    database_.Execute("CREATE INDEX locations_version ON locations(version)");
    const auto fill = [this](const List& list, int64_t last) {
      for (int64_t number = 0; number <= last / kPlacesInPart; ++number) UpdatePart(list, number, nullptr, nullptr, 0);
    };
    fill(kDocuments, database_.QueryInt("SELECT max(id) FROM docs"));
    fill(kFolders, database_.QueryInt("SELECT max(id) FROM folders"));
    database_.Execute("COMMIT");
  } catch (...) {
    (void)sqlite3_exec(database_.Handle(), "ROLLBACK", nullptr, nullptr, nullptr);
    throw;
  }
}

void PlaceWriter::OnRow(RowWatch::Table table, int64_t number) {
  if (table == RowWatch::Table::kSuspects) return;
  std::vector<int64_t>& changed = table == RowWatch::Table::kDocuments ? documents_ : folders_;
  if (changed.empty() || changed.back() != number) changed.push_back(number);
}

void PlaceWriter::Flush(int64_t version) {
  FlushList(kDocuments, documents_, version);
  FlushList(kFolders, folders_, version);
}

void PlaceWriter::FlushList(const List& list, std::vector<int64_t>& changed, int64_t version) {
  std::sort(changed.begin(), changed.end());
  const int64_t* const end =
      changed.data() + std::distance(changed.begin(), std::unique(changed.begin(), changed.end()));
  for (const int64_t* at = changed.data(); at != end;) {
    const int64_t number = *at / kPlacesInPart;
    const int64_t* const next = std::lower_bound(at, end, (number + 1) * kPlacesInPart);
    UpdatePart(list, number, at, next, version);
    at = next;
  }
  changed.clear();
}

/// Writes part `number` anew. From `begin` to `end` are the numbers whose places have changed; none: it is made.
void PlaceWriter::UpdatePart(const List& list, int64_t number, const int64_t* begin, const int64_t* end,
                             int64_t version) {
  const int64_t key = 2 * number + list.parity, first = number * kPlacesInPart;
  PlaceList::Part part = {};
  std::string before;
  {
    Statement row = database_.Prepare("SELECT packed FROM locations WHERE part = ?1");
    if (row.Bind(1, key).Step()) before = row.Text(0);
  }
  if (begin == end || end - begin >= kReadAllFrom) {
    Statement rows = database_.Prepare(list.range);
    rows.Bind(1, first).Bind(2, first + kPlacesInPart - 1);
    while (rows.Step()) PutRow(rows, first, part);
  } else {
    if (!UnpackPlaces(before, part)) database_.Fail(SQLITE_CORRUPT);
    for (; begin != end; ++begin) {
      const auto at = static_cast<size_t>(*begin - first);
      part.places[at] = {};
      Statement row = database_.Prepare(list.one);
      if (row.Bind(1, *begin).Step()) PutRow(row, first, part);
    }
  }
  const std::string packed = PackPlaces(part);
  if (packed == before) return;
  Statement write = database_.Prepare(
      "INSERT INTO locations(part, version, packed) VALUES(?1, ?2, ?3)"
      " ON CONFLICT(part) DO UPDATE SET version = excluded.version, packed = excluded.packed");
  write.Bind(1, key).Bind(2, version).BindBlob(3, packed).Run();
}

/// `row` has number, folder, access record, bytes of text, name; folders' names end with "/".
void PlaceWriter::PutRow(const Statement& row, int64_t first, PlaceList::Part& part) const {
  const auto at = static_cast<size_t>(row.Int(0) - first);
  const int64_t access = row.Int(2);
  std::string_view name = row.Text(4);
  Place& place = part.places[at];
  place.folder = static_cast<uint32_t>(row.Int(1));
  place.access = static_cast<uint32_t>(access > Place::kAccessMax ? 0 : access) & Place::kAccessMax;
  place.length = LengthClass(row.Int(3));
  part.names[at] = NameHash(name);
  if (name.ends_with('/')) name.remove_suffix(1);
  place.unseen = name_rules_->Match(name) ? 1 : 0;
}

int64_t PlaceWriter::MarkPart(int64_t key, int64_t version) {
  {
    Statement next = database_.Prepare("SELECT min(part) FROM locations WHERE part >= ?1");
    if (!next.Bind(1, key).Step() || next.IsNull(0)) return -1;
    key = next.Int(0);
  }
  const List& list = key % 2 == kFolders.parity ? kFolders : kDocuments;
  UpdatePart(list, key / 2, nullptr, nullptr, version);
  return key + 1;
}

void PlaceWriter::Forget() {
  documents_.clear();
  folders_.clear();
}

}  // namespace ferrox::engine
