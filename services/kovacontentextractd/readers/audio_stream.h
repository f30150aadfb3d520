#pragma once

#include <string>
#include <taglib/tiostream.h>

#include "services/kovacontentextractd/readers/byte_source.h"
#include "services/kovacontentextractd/readers/cpu_budget.h"

namespace ferrox::extract {

/// A part of a file as the tag library wants it: read only, never more at a time than a tag may have, and ended where
/// more was read, or more time spent, than tags can take: the library searches a whole damaged file for sound.
class AudioStream : public TagLib::IOStream {
 public:
  /// The bytes from `begin` to before `end`; `name` is one whose extension tells the library the format.
  AudioStream(const Source& source, uint64_t begin, uint64_t end, std::string name);

  TagLib::FileName name() const override { return name_.c_str(); }
  /// Fewer bytes than asked for at the end, and none once a limit is reached.
  TagLib::ByteVector readBlock(unsigned long length) override;
  void seek(long offset, Position from) override;
  long tell() const override { return at_; }
  long length() override { return length_; }
  bool readOnly() const override { return true; }
  bool isOpen() const override { return true; }

  // What a stream for reading does not do.
  void writeBlock(const TagLib::ByteVector&) override {}
  void insert(const TagLib::ByteVector&, unsigned long, unsigned long) override {}
  void removeBlock(unsigned long, unsigned long) override {}
  void truncate(long) override {}

 private:
  FileBytes file_;
  uint64_t begin_;  ///< place 0 of the stream, in the file
  long length_;     ///< the library counts in long, so that on 32 bits a file ends at 2 GiB
  long at_ = 0;
  long read_ = 0;  ///< in all
  CpuBudget budget_;
  bool ended_ = false;  ///< nothing more is given
  std::string name_;
};

}  // namespace ferrox::extract
