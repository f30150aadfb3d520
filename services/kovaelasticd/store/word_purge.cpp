#include "services/kovaelasticd/store/word_purge.h"

#include <algorithm>
#include <functional>

namespace ferrox::engine {

namespace {

constexpr char kNoPlaces = 1;  ///< what stands for the length of a deleted entry

void Put16(std::string& bytes, size_t at, size_t value) {
  bytes[at] = static_cast<char>(value >> 8);
  bytes[at + 1] = static_cast<char>(value);
}

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

bool WordPurge::ReadSegments(std::vector<Segment>& segments) {
  std::vector<FtsSegment> stored;
  if (!pages_.ReadSegments(stored)) return false;
  for (const FtsSegment& segment : stored) {
    segments.push_back({segment, std::hash<std::string>()(pages_.ReadPage(segment.number, segment.first))});
  }
  return true;
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
    const std::string page = pages_.ReadPage(segment.number, next_page_);
    if (!Rewrite(page, gone, rewritten)) return false;
    if (rewritten == page) continue;
    pages_.WritePage(segment.number, next_page_, rewritten);
    if (next_page_ == segment.first) segment.first_page_hash = std::hash<std::string>()(rewritten);
  }
  return true;
}

bool WordPurge::Rewrite(std::string_view page, const DocSet& gone, std::string& out) {
  std::vector<size_t> terms;
  if (!ReadFtsTermPlaces(page, terms)) return false;
  const size_t first_entry = FtsNumber16(page, 0);
  const size_t end = terms.back();
  const size_t spill_end = first_entry != 0 ? first_entry : terms.front();
  if (spill_end < kFtsHeaderBytes || spill_end > terms.front()) return false;
  const size_t spilled = spill_end - kFtsHeaderBytes;
  if (spilled > spill_ || (spilled < spill_ && spill_end < end)) return false;
  out.assign(kFtsHeaderBytes, '\0');
  if (!spill_gone_) out += page.substr(kFtsHeaderBytes, spilled);
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
    FtsNumbers term(list);
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
  for (FtsNumbers entry(list); !entry.AtEnd();) {
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
