#include "services/kovaelasticd/store/word_purge.h"

#include <algorithm>
#include <functional>

namespace ferrox::engine {

namespace {

// The format of FTS5's pages, which files are bound to as long as "version" in "<name>_config" is kVersion.
//
// Row 10 lists the segments: 4 bytes of a counter, then numbers: levels, segments, pages written; for each level, how
// many of its segments are being merged, how many there are, and of each its number, first and last page. A page is a
// row of its own:
//
//   first list entry that begins on the page without a term before it (2 bytes, 0: none), end of the lists (2 bytes),
//   rest of an entry of the page before, entries, {term, entries}...; at the end the places of terms, as differences
//
// A term is {bytes kept of the one before, unless it is the page's first; length; bytes}. An entry is {document, as
// difference to the one before it, unless it is the first behind a term or the page's first; bytes of places * 2, plus
// 1 for one that is deleted; places}.

constexpr int64_t kVersion = 4;
constexpr int64_t kStructureRow = 10;
constexpr size_t kHeaderBytes = 4;
constexpr char kNoPlaces = 1;  ///< what stands for the length of a deleted entry

int64_t RowOf(int64_t segment, int64_t page) { return (segment << 37) + page; }

size_t Number16(std::string_view bytes, size_t at) {
  return static_cast<size_t>(static_cast<unsigned char>(bytes[at])) << 8 | static_cast<unsigned char>(bytes[at + 1]);
}

void Put16(std::string& bytes, size_t at, size_t value) {
  bytes[at] = static_cast<char>(value >> 8);
  bytes[at + 1] = static_cast<char>(value);
}

/// Takes numbers off the front, 7 bits a byte with the highest first; the ninth byte has 8.
class NumberReader {
 public:
  explicit NumberReader(std::string_view bytes) : bytes_(bytes) {}
  bool AtEnd() const { return at_ >= bytes_.size(); }
  size_t At() const { return at_; }
  void Skip(size_t bytes) { at_ += bytes; }
  bool Failed() const { return at_ > bytes_.size(); }
  uint64_t Next() {
    uint64_t value = 0;
    for (int i = 0; i < 9; ++i) {
      if (at_ >= bytes_.size()) {
        at_ = bytes_.size() + 1;
        return 0;
      }
      const auto byte = static_cast<unsigned char>(bytes_[at_++]);
      if (i == 8) return value << 8 | byte;
      value = value << 7 | (byte & 0x7F);
      if ((byte & 0x80) == 0) return value;
    }
    return value;
  }

 private:
  std::string_view bytes_;
  size_t at_ = 0;
};

/// Below 2^56, as all numbers of documents are.
void AppendNumber(std::string& bytes, uint64_t value) {
  char reversed[10];
  int count = 0;
  do {
    reversed[count] = static_cast<char>((value & 0x7F) | (count == 0 ? 0 : 0x80));
    ++count;
    value >>= 7;
  } while (value != 0);
  while (count > 0) bytes += reversed[--count];
}

}  // namespace

WordPurge::WordPurge(Database& database, const std::string& table)
    : database_(database),
      version_("SELECT v FROM " + table + "_config WHERE k = 'version'"),
      select_("SELECT block FROM " + table + "_data WHERE id = ?1"),
      update_("UPDATE " + table + "_data SET block = ?2 WHERE id = ?1") {}

std::string WordPurge::ReadPage(int64_t segment, int64_t page) {
  Statement statement = database_.Prepare(select_);
  return statement.Bind(1, RowOf(segment, page)).Step() ? std::string(statement.Text(0)) : "";
}

bool WordPurge::ReadSegments(std::vector<Segment>& segments) {
  if (database_.QueryInt(version_.c_str()) != kVersion) return false;
  const std::string structure = ReadPage(0, kStructureRow);
  if (structure.size() < kHeaderBytes || structure[kHeaderBytes] == '\xFF') return false;
  NumberReader reader(std::string_view(structure).substr(kHeaderBytes));
  const uint64_t levels = reader.Next();
  (void)reader.Next();
  (void)reader.Next();
  for (uint64_t level = 0; level < levels && !reader.Failed(); ++level) {
    (void)reader.Next();
    for (uint64_t count = reader.Next(); count > 0 && !reader.Failed(); --count) {
      Segment segment = {static_cast<int64_t>(reader.Next()), static_cast<int64_t>(reader.Next()),
                         static_cast<int64_t>(reader.Next()), 0};
      if (segment.last == 0) continue;
      segment.first_page_hash = std::hash<std::string>()(ReadPage(segment.number, segment.first));
      segments.push_back(segment);
    }
  }
  return !reader.Failed() && reader.AtEnd();
}

WordPurge::Result WordPurge::Turn(const DocSet& gone, int64_t& pages) {
  std::vector<Segment> segments;
  if (!ReadSegments(segments)) return Result::kUnknownFormat;
  std::erase_if(
      done_, [&](const Segment& done) { return std::find(segments.begin(), segments.end(), done) == segments.end(); });
  for (Segment& segment : segments) {
    if (std::find(done_.begin(), done_.end(), segment) != done_.end()) continue;
    if (!(segment == current_)) {
      next_page_ = segment.first;
      spill_ = 0;
    }
    if (!RewritePages(segment, gone, pages)) return Result::kUnknownFormat;
    current_ = segment;
    if (next_page_ <= segment.last) return Result::kMore;
    current_ = {};
    done_.push_back(segment);
  }
  return Result::kDone;
}

bool WordPurge::RewritePages(Segment& segment, const DocSet& gone, int64_t& pages) {
  std::string rewritten;
  for (; next_page_ <= segment.last && pages > 0; ++next_page_, --pages) {
    const std::string page = ReadPage(segment.number, next_page_);
    if (!Rewrite(page, gone, rewritten)) return false;
    if (rewritten == page) continue;
    database_.Prepare(update_).Bind(1, RowOf(segment.number, next_page_)).BindBlob(2, rewritten).Run();
    if (next_page_ == segment.first) segment.first_page_hash = std::hash<std::string>()(rewritten);
  }
  return true;
}

bool WordPurge::Rewrite(std::string_view page, const DocSet& gone, std::string& out) {
  if (page.size() < kHeaderBytes) return false;
  const size_t first_entry = Number16(page, 0);
  const size_t end = Number16(page, 2);
  if (end < kHeaderBytes || end > page.size()) return false;
  std::vector<size_t> terms;
  for (NumberReader places(page.substr(end)); !places.AtEnd();) {
    terms.push_back(places.Next() + (terms.empty() ? 0 : terms.back()));
    if (places.Failed() || terms.back() >= end) return false;
  }
  terms.push_back(end);
  const size_t spill_end = first_entry != 0 ? first_entry : terms.front();
  if (spill_end < kHeaderBytes || spill_end > terms.front()) return false;
  const size_t spilled = spill_end - kHeaderBytes;
  if (spilled > spill_ || (spilled < spill_ && spill_end < end)) return false;
  out.assign(kHeaderBytes, '\0');
  if (!spill_gone_) out += page.substr(kHeaderBytes, spilled);
  spill_ -= spilled;
  if (first_entry != 0) {
    Put16(out, 0, out.size());
    if (!CopyEntries(page.substr(first_entry, terms.front() - first_entry), terms.size() == 1, true, gone, out))
      return false;
  }
  std::string places;
  size_t place_before = 0;
  for (size_t i = 0; i + 1 < terms.size(); ++i) {
    const std::string_view list = page.substr(terms[i], terms[i + 1] - terms[i]);
    NumberReader term(list);
    if (i > 0) (void)term.Next();
    const uint64_t bytes = term.Next();
    if (bytes > list.size()) return false;
    term.Skip(bytes);
    if (term.Failed()) return false;
    AppendNumber(places, out.size() - place_before);
    place_before = out.size();
    out += list.substr(0, term.At());
    if (!CopyEntries(list.substr(term.At()), i + 2 == terms.size(), false, gone, out)) return false;
  }
  Put16(out, 2, out.size());
  out += places;
  return true;
}

/// `is_last`: the list goes on behind the page's end. `keep_first`: the first entry must not vanish.
bool WordPurge::CopyEntries(std::string_view list, bool is_last, bool keep_first, const DocSet& gone,
                            std::string& out) {
  const auto put_deleted = [&out](uint64_t document) {
    AppendNumber(out, document);
    out += kNoPlaces;
  };
  uint64_t first = 0;
  uint64_t document = 0;
  uint64_t written = 0;
  for (NumberReader entry(list); !entry.AtEnd();) {
    document += entry.Next();
    const size_t length_at = entry.At();
    const uint64_t places = entry.Next() / 2;
    if (entry.Failed()) return false;
    const uint64_t here = std::min<uint64_t>(places, list.size() - entry.At());
    if (here < places && !is_last) return false;
    entry.Skip(here);
    spill_ = places - here;
    spill_gone_ = gone.Contains(static_cast<int64_t>(document));
    if (!spill_gone_) {
      AppendNumber(out, document - written);
      out += list.substr(length_at, entry.At() - length_at);
      written = document;
    } else if (first == 0 && keep_first) {
      put_deleted(document);
      written = document;
    }
    if (first == 0) first = document;
  }
  if (written == 0 && first != 0) put_deleted(first);
  return true;
}

}  // namespace ferrox::engine
