#include "services/kovacontentextractd/readers/audio_stream.h"

#include <algorithm>
#include <limits>

namespace ferrox::extract {

namespace {

/// At a time: a tag with a picture in it.
constexpr long kBlockMaxBytes = 16L << 20;
/// In all, from one file.
constexpr long kAudioReadMaxBytes = 256L << 20;
constexpr std::chrono::milliseconds kAudioCpuMax(1500);
/// No file of sound is longer. In what is, the library would search for sound step by step.
constexpr uint64_t kLengthMaxBytes = 4ULL << 30;

}  // namespace

AudioStream::AudioStream(const Source& source, uint64_t begin, uint64_t end, std::string name)
    : file_(source), begin_(std::min(begin, file_.Size())), budget_(kAudioCpuMax), name_(std::move(name)) {
  const uint64_t length = std::min(std::clamp(end, begin_, file_.Size()) - begin_, kLengthMaxBytes);
  length_ = static_cast<long>(std::min<uint64_t>(length, std::numeric_limits<long>::max()));
}

TagLib::ByteVector AudioStream::readBlock(unsigned long length) {
  ended_ = ended_ || read_ >= kAudioReadMaxBytes || budget_.IsSpent();
  const long left = !ended_ ? std::clamp(length_ - at_, 0L, kBlockMaxBytes) : 0;
  const auto wanted = static_cast<unsigned>(std::min<unsigned long>(length, static_cast<unsigned long>(left)));
  TagLib::ByteVector block(wanted, '\0');
  const size_t got = wanted > 0 ? file_.ReadAt(begin_ + static_cast<uint64_t>(at_), block.data(), wanted) : 0;
  block.resize(static_cast<unsigned>(got));
  at_ += static_cast<long>(got);
  read_ += static_cast<long>(got);
  return block;
}

void AudioStream::seek(long offset, Position from) {
  const int64_t base = from == Current ? at_ : from == End ? length_ : 0;
  at_ = static_cast<long>(std::clamp<int64_t>(base + offset, 0, std::numeric_limits<long>::max()));
}

}  // namespace ferrox::extract
