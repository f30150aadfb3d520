#include "services/kovaelasticd/store/place_writer.h"

#include <algorithm>
#include <string>

namespace ferrox::engine {

namespace {

constexpr auto kPlacesInPart = static_cast<int64_t>(PlaceList::kPart);
/// From so many changed places of a part on, one pass over all of its rows is cheaper.
constexpr int64_t kReadAllFrom = 64;

Place PlaceOfRow(const Statement& row) {
  return {static_cast<uint32_t>(row.Int(1)), static_cast<uint32_t>(row.Int(2))};
}

}  // namespace

const PlaceWriter::List PlaceWriter::kDocuments = {0, "SELECT id, folder, access FROM docs WHERE id = ?1",
                                                   "SELECT id, folder, access FROM docs WHERE id BETWEEN ?1 AND ?2"};
const PlaceWriter::List PlaceWriter::kFolders = {1, "SELECT id, parent, access FROM folders WHERE id = ?1",
                                                 "SELECT id, parent, access FROM folders WHERE id BETWEEN ?1 AND ?2"};

void PlaceWriter::MakeTable() {
  if (database_.QueryInt("SELECT count(*) FROM sqlite_master WHERE name = 'places'") != 0) return;
  database_.Execute("BEGIN IMMEDIATE");
  try {
    database_.Execute("CREATE TABLE places(part INTEGER PRIMARY KEY, version INTEGER NOT NULL, packed BLOB NOT NULL)");
    database_.Execute("CREATE INDEX places_version ON places(version)");
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
    Statement row = database_.Prepare("SELECT packed FROM places WHERE part = ?1");
    if (row.Bind(1, key).Step()) before = row.Text(0);
  }
  if (begin == end || end - begin >= kReadAllFrom) {
    Statement rows = database_.Prepare(list.range);
    rows.Bind(1, first).Bind(2, first + kPlacesInPart - 1);
    while (rows.Step()) part[static_cast<size_t>(rows.Int(0) - first)] = PlaceOfRow(rows);
  } else {
    if (!UnpackPlaces(before, part)) database_.Fail(SQLITE_CORRUPT);
    for (; begin != end; ++begin) {
      Statement row = database_.Prepare(list.one);
      part[static_cast<size_t>(*begin - first)] = row.Bind(1, *begin).Step() ? PlaceOfRow(row) : Place();
    }
  }
  const std::string packed = PackPlaces(part);
  if (packed == before) return;
  Statement write = database_.Prepare(
      "INSERT INTO places(part, version, packed) VALUES(?1, ?2, ?3)"
      " ON CONFLICT(part) DO UPDATE SET version = excluded.version, packed = excluded.packed");
  write.Bind(1, key).Bind(2, version).BindBlob(3, packed).Run();
}

void PlaceWriter::Forget() {
  documents_.clear();
  folders_.clear();
}

}  // namespace ferrox::engine
