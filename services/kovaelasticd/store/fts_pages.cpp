#include "services/kovaelasticd/store/fts_pages.h"

namespace ferrox::engine {

namespace {

constexpr int64_t kFtsVersion = 4;
constexpr int64_t kStructureRow = 10;

int64_t RowOfPage(int64_t segment, int64_t page) { return (segment << 37) + page; }

}  // namespace

bool ReadFtsTermPlaces(std::string_view page, std::vector<size_t>& places) {
  places.clear();
  if (page.size() < kFtsHeaderBytes) return false;
  const size_t end = FtsNumber16(page, 2);
  if (end < kFtsHeaderBytes || end > page.size()) return false;
  for (FtsNumbers differences(page.substr(end)); !differences.AtEnd();) {
    places.push_back(differences.Next() + (places.empty() ? 0 : places.back()));
    if (differences.Failed() || places.back() >= end) return false;
  }
  places.push_back(end);
  return true;
}

FtsPages::FtsPages(Database& database, const std::string& table)
    : database_(database),
      version_("SELECT v FROM " + table + "_config WHERE k = 'version'"),
      select_("SELECT block FROM " + table + "_data WHERE id = ?1"),
      update_("UPDATE " + table + "_data SET block = ?2 WHERE id = ?1") {}

std::string FtsPages::ReadPage(int64_t segment, int64_t page) {
  Statement statement = database_.Prepare(select_);
  return statement.Bind(1, RowOfPage(segment, page)).Step() ? std::string(statement.Text(0)) : "";
}

void FtsPages::WritePage(int64_t segment, int64_t page, std::string_view bytes) {
  database_.Prepare(update_).Bind(1, RowOfPage(segment, page)).BindBlob(2, bytes).Run();
}

bool FtsPages::ReadSegments(std::vector<FtsSegment>& segments) {
  segments.clear();
  if (database_.QueryInt(version_.c_str()) != kFtsVersion) return false;
  const std::string structure = ReadPage(0, kStructureRow);
  if (structure.size() < kFtsHeaderBytes || structure[kFtsHeaderBytes] == '\xFF') return false;
  FtsNumbers numbers(std::string_view(structure).substr(kFtsHeaderBytes));
  const uint64_t levels = numbers.Next();
  (void)numbers.Next();
  (void)numbers.Next();
  for (uint64_t level = 0; level < levels && !numbers.Failed(); ++level) {
    (void)numbers.Next();
    for (uint64_t count = numbers.Next(); count > 0 && !numbers.Failed(); --count) {
      const auto number = static_cast<int64_t>(numbers.Next());
      const auto first = static_cast<int64_t>(numbers.Next());
      const auto last = static_cast<int64_t>(numbers.Next());
      if (last != 0) segments.push_back({number, first, last});
    }
  }
  return !numbers.Failed() && numbers.AtEnd();
}

}  // namespace ferrox::engine
