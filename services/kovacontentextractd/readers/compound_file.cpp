#include "services/kovacontentextractd/readers/compound_file.h"

#include <algorithm>

#include "services/kovacontentextractd/readers/code_pages.h"
#include "services/kovacontentextractd/readers/little_endian.h"

namespace ferrox::extract {

namespace {

constexpr std::string_view kMark = "\xD0\xCF\x11\xE0\xA1\xB1\x1A\xE1";
constexpr size_t kCompoundHeaderBytes = 512;
constexpr uint32_t kLastSector = 0xFFFFFFFA;  ///< numbers beyond it have other meanings: end, free
constexpr size_t kFolderEntryBytes = 128;
constexpr uint8_t kStorageType = 1, kStreamType = 2;  // the root is 5

/// Names are compared without case: some programs write all of them in capitals.
bool IsSameName(std::string_view a, std::string_view b) {
  const auto lower = [](char c) { return c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c; };
  return std::equal(a.begin(), a.end(), b.begin(), b.end(), [&](char x, char y) { return lower(x) == lower(y); });
}
/// Entries of the directory that are read: office files have some dozens, messages a few for each property.
constexpr size_t kEntriesMax = 65536;
constexpr uint64_t kTableMax = 8U << 20;  ///< sectors: a file of 4 GiB
/// Of one stream, what may be read.
constexpr uint64_t kStreamMaxBytes = 128U << 20;
/// How much a small read of a stream reads ahead.
constexpr size_t kSectorsPieceBytes = 4096;

}  // namespace

size_t CompoundStream::ReadAt(uint64_t offset, char* buffer, size_t room) const {
  const uint32_t shift = mini_ ? file_->mini_shift_ : file_->sector_shift_;
  const uint64_t sector_bytes = uint64_t{1} << shift;
  size_t have = 0;
  while (have < room && offset < size_ && (offset >> shift) < sectors_.size()) {
    const uint32_t sector = sectors_[static_cast<size_t>(offset >> shift)];
    const uint64_t within = offset & (sector_bytes - 1);
    const auto wanted = static_cast<size_t>(std::min<uint64_t>({room - have, sector_bytes - within, size_ - offset}));
    const size_t got = mini_ ? file_->mini_stream_.ReadAt((uint64_t{sector} << shift) + within, buffer + have, wanted)
                             : file_->file_.ReadAt(file_->SectorOffset(sector) + within, buffer + have, wanted);
    have += got;
    offset += got;
    if (got < wanted) break;
  }
  return have;
}

std::string CompoundStream::ReadAt(uint64_t offset, size_t size) const {
  if (offset >= size_) return {};
  std::string bytes(static_cast<size_t>(std::min<uint64_t>(size, size_ - offset)), '\0');
  bytes.resize(ReadAt(offset, bytes.data(), bytes.size()));
  return bytes;
}

size_t CompoundStream::Read(char* buffer, size_t room) {
  size_t got = 0;
  if (room >= kSectorsPieceBytes) {
    got = ReadAt(at_, buffer, room);
  } else {
    if (at_ < piece_at_ || at_ + room > piece_at_ + piece_.size()) {
      piece_ = ReadAt(at_, kSectorsPieceBytes);
      piece_at_ = at_;
    }
    got = std::string_view(piece_).substr(static_cast<size_t>(at_ - piece_at_)).copy(buffer, room);
  }
  at_ += got;
  return got;
}

CompoundFile::CompoundFile(const Source& source) : file_(source) {
  mini_stream_.file_ = this;
  const std::string header = file_.ReadAt(0, kCompoundHeaderBytes);
  sector_shift_ = Little16(header, 0x1E);
  mini_shift_ = Little16(header, 0x20);
  const bool sane = header.size() == kCompoundHeaderBytes && header.starts_with(kMark) && sector_shift_ >= 7 &&
                    sector_shift_ <= 16 && mini_shift_ >= 4 && mini_shift_ <= sector_shift_;
  if (!sane) return;
  mini_cutoff_ = Little32(header, 0x38);
  sectors_max_ = std::min(kTableMax, (file_.Size() >> sector_shift_) + 1);
  ReadSectorTable(header);
  ReadMiniTable(Little32(header, 0x3C));
  ReadEntries(Little32(header, 0x30));
  open_ = !entries_.empty();
}

std::string CompoundFile::ReadSector(uint32_t sector) const {
  return file_.ReadAt(SectorOffset(sector), size_t{1} << sector_shift_);
}

void CompoundFile::AppendTable(uint32_t sector, std::vector<uint32_t>& table) const {
  const std::string bytes = ReadSector(sector);
  for (size_t at = 0; at + 4 <= bytes.size() && table.size() < sectors_max_; at += 4) {
    table.push_back(Little32(bytes, at));
  }
}

/// The table's own sectors are listed in the header, which has room for 109, and in a chain of further sectors that are
/// full of such numbers, the last of which names the next sector of the chain.
void CompoundFile::ReadSectorTable(const std::string& header) {
  const auto append = [this](std::string_view list) {
    for (size_t at = 0; at + 4 <= list.size() && table_.size() < sectors_max_; at += 4) {
      const uint32_t sector = Little32(list, at);
      if (sector < kLastSector) AppendTable(sector, table_);
    }
  };
  append(std::string_view(header).substr(0x4C));
  uint32_t next = Little32(header, 0x44);
  const uint64_t per_sector = (uint64_t{1} << sector_shift_) / 4;
  const uint64_t lists_max = sectors_max_ / (per_sector * (per_sector - 1)) + 1;
  for (uint64_t lists = 0; next < kLastSector && lists < lists_max && table_.size() < sectors_max_; ++lists) {
    const std::string list = ReadSector(next);
    if (list.size() < 8) return;
    append(std::string_view(list).substr(0, list.size() - 4));
    next = Little32(list, list.size() - 4);
  }
}

/// The sectors that follow `first` in a table. A stream of `bytes` needs so many and no more, which also ends a ring.
std::vector<uint32_t> CompoundFile::Chain(const std::vector<uint32_t>& table, uint32_t first, uint64_t bytes,
                                          uint32_t shift) {
  const uint64_t count = std::min<uint64_t>(table.size(), (bytes + (uint64_t{1} << shift) - 1) >> shift);
  std::vector<uint32_t> sectors;
  for (uint32_t sector = first; sector < table.size() && sectors.size() < count; sector = table[sector]) {
    sectors.push_back(sector);
  }
  return sectors;
}

void CompoundFile::ReadMiniTable(uint32_t first) {
  const uint64_t room = std::min(sectors_max_ << (sector_shift_ - mini_shift_), kTableMax);
  for (const uint32_t sector : Chain(table_, first, room * 4, sector_shift_)) {
    const std::string bytes = ReadSector(sector);
    for (size_t at = 0; at + 4 <= bytes.size() && mini_table_.size() < room; at += 4) {
      mini_table_.push_back(Little32(bytes, at));
    }
  }
}

/// The directory: entries of 128 bytes with a name (64 bytes of UTF-16), its size with the final zero (at 40), type (at
/// 42), the numbers of its left and right neighbour in the tree and of the first entry within it (at 44, 48, 4C), its
/// first sector (at 74) and size (at 78, of which the upper half is not read).
void CompoundFile::ReadEntries(uint32_t first) {
  for (const uint32_t sector : Chain(table_, first, kEntriesMax * kFolderEntryBytes, sector_shift_)) {
    const std::string bytes = ReadSector(sector);
    for (size_t at = 0; at + kFolderEntryBytes <= bytes.size() && entries_.size() < kEntriesMax;
         at += kFolderEntryBytes) {
      const std::string_view entry = std::string_view(bytes).substr(at, kFolderEntryBytes);
      const size_t name_bytes = std::min<size_t>(Little16(entry, 64), 64);
      Entry& added = entries_.emplace_back();
      added.name = FromUtf16Little(entry.substr(0, name_bytes < 2 ? 0 : name_bytes - 2));
      added.type = static_cast<uint8_t>(entry[66]);
      added.left = Little32(entry, 68);
      added.right = Little32(entry, 72);
      added.child = Little32(entry, 76);
      added.first_sector = Little32(entry, 116);
      added.size = Little32(entry, 120);  // bigger ones are not office files
    }
  }
  if (entries_.empty()) return;
  const Entry& root = entries_.front();
  mini_stream_.sectors_ = Chain(table_, root.first_sector, root.size, sector_shift_);
  mini_stream_.size_ = std::min<uint64_t>(root.size, uint64_t{mini_stream_.sectors_.size()} << sector_shift_);
  FindParents();
}

/// Notes for each entry which storage it lies in, by a walk through the trees. What no storage holds, because a tree is
/// damaged, counts as the root's, so that a document's main stream is found all the same.
void CompoundFile::FindParents() {
  std::vector<std::pair<uint32_t, uint32_t>> open = {{entries_.front().child, kRoot}};
  while (!open.empty()) {
    const auto [number, parent] = open.back();
    open.pop_back();
    if (number == kRoot || number >= entries_.size() || entries_[number].parent != kNoParent) continue;
    Entry& entry = entries_[number];
    entry.parent = parent;
    open.insert(open.end(), {{entry.left, parent}, {entry.right, parent}});
    if (entry.type == kStorageType) open.emplace_back(entry.child, number);
  }
  for (Entry& entry : entries_) {
    if (entry.parent == kNoParent) entry.parent = kRoot;
  }
}

std::vector<uint32_t> CompoundFile::Storages(std::string_view begin) const {
  std::vector<uint32_t> found;
  for (size_t i = 1; i < entries_.size(); ++i) {
    const Entry& entry = entries_[i];
    const bool wanted = entry.type == kStorageType && entry.parent == kRoot && entry.name.starts_with(begin);
    if (wanted) found.push_back(static_cast<uint32_t>(i));
  }
  return found;
}

std::unique_ptr<CompoundStream> CompoundFile::Open(std::string_view name, uint32_t storage) const {
  const auto found = std::find_if(entries_.begin(), entries_.end(), [&](const Entry& entry) {
    return entry.type == kStreamType && entry.parent == storage && IsSameName(entry.name, name);
  });
  if (found == entries_.end()) return nullptr;
  auto stream = std::make_unique<CompoundStream>();
  stream->file_ = this;
  stream->mini_ = found->size < mini_cutoff_;
  const uint32_t shift = stream->mini_ ? mini_shift_ : sector_shift_;
  const uint64_t size = std::min(found->size, kStreamMaxBytes);
  stream->sectors_ = Chain(stream->mini_ ? mini_table_ : table_, found->first_sector, size, shift);
  stream->size_ = std::min(size, uint64_t{stream->sectors_.size()} << shift);
  return stream;
}

}  // namespace ferrox::extract
