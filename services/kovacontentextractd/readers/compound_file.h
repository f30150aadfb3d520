#pragma once

#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "services/kovacontentextractd/readers/byte_source.h"

namespace ferrox::extract {

class CompoundFile;

/// One stream in a compound file. It reads through the file, which must outlive it.
class CompoundStream : public ByteSource {
 public:
  uint64_t Size() const { return size_; }
  /// Small reads are served from a piece that is read ahead: records are read a few bytes at a time.
  size_t Read(char* buffer, size_t room) override;
  /// Passes `count` bytes, or all that are left.
  void Skip(uint64_t count) { at_ = count < size_ - at_ ? at_ + count : size_; }
  uint64_t Left() const { return size_ - at_; }
  /// The bytes at `offset`, fewer where the stream ends; does not move the place that Read goes on from.
  std::string ReadAt(uint64_t offset, size_t size) const;

 private:
  friend class CompoundFile;
  size_t ReadAt(uint64_t offset, char* buffer, size_t room) const;

  const CompoundFile* file_ = nullptr;
  std::vector<uint32_t> sectors_;
  bool mini_ = false;  ///< its sectors are small ones within the file's stream for them
  uint64_t size_ = 0;
  uint64_t at_ = 0;
  std::string piece_;  ///< what is read in small steps, read ahead
  uint64_t piece_at_ = 0;
};

/// The container of office files before they were ZIP files ([MS-CFB]): a small file system of storages (folders) and
/// streams (files) in sectors.
///
/// The header of 512 bytes has the size of sectors as a power of two (at 1E, mostly 9 or 12), that of small sectors (at
/// 20, 6), the first sector of the directory (at 30), the size below which a stream lies in small sectors (at 38), the
/// first sector of the table of small sectors (at 3C), the chain of further lists of table sectors (at 44) and the
/// first 109 of these (from 4C). The table has, for each sector, the number of the next one of the same stream. Streams
/// below 4096 bytes lie in small sectors within one ordinary stream, whose first sector the root's entry names.
///
/// Nothing in it is trusted: a table has at most as many entries as the file has sectors, a chain at most as many
/// sectors as the size of its stream needs, so one that comes back on itself ends, and the directory's tree is walked
/// with each entry visited once.
class CompoundFile {
 public:
  explicit CompoundFile(const Source& source);
  CompoundFile(const CompoundFile&) = delete;
  CompoundFile& operator=(const CompoundFile&) = delete;
  bool IsOpen() const { return open_; }
  /// A storage: the root, which is where a program keeps its own document, or a number that Storages has given.
  static constexpr uint32_t kRoot = 0;
  /// The stream of this name in a storage; null when there is none.
  std::unique_ptr<CompoundStream> Open(std::string_view name, uint32_t storage = kRoot) const;
  /// The storages in the root whose names begin so.
  std::vector<uint32_t> Storages(std::string_view begin) const;

 private:
  friend class CompoundStream;
  struct Entry {
    std::string name;
    uint8_t type = 0;
    uint32_t left = 0, right = 0, child = 0;  ///< a storage holds a tree of entries, by their numbers
    uint32_t first_sector = 0;
    uint64_t size = 0;
    uint32_t parent = kNoParent;
  };
  static constexpr uint32_t kNoParent = UINT32_MAX;

  uint64_t SectorOffset(uint32_t sector) const { return (uint64_t{sector} + 1) << sector_shift_; }
  /// At most `bytes`, in sectors of 2^shift.
  static std::vector<uint32_t> Chain(const std::vector<uint32_t>& table, uint32_t first, uint64_t bytes,
                                     uint32_t shift);
  void ReadSectorTable(const std::string& header);
  void ReadMiniTable(uint32_t first);
  void ReadEntries(uint32_t first);
  void FindParents();
  void AppendTable(uint32_t sector, std::vector<uint32_t>& table) const;
  std::string ReadSector(uint32_t sector) const;

  FileBytes file_;
  bool open_ = false;
  uint32_t sector_shift_ = 9, mini_shift_ = 6;
  uint64_t mini_cutoff_ = 4096;
  uint64_t sectors_max_ = 0;          ///< as many as the file has room for
  std::vector<uint32_t> table_;       ///< the sector behind each one
  std::vector<uint32_t> mini_table_;  ///< the same for small sectors
  std::vector<Entry> entries_;
  CompoundStream mini_stream_;
};

}  // namespace ferrox::extract
