#include "services/kovaelasticd/store/text_codec.h"

namespace ferrox::engine {

namespace {

/// The library's default.
constexpr int kLevel = 3;
/// A damaged length must not ask for all memory.
constexpr unsigned long long kTextMaxBytes = 256ULL << 20;
/// What a codec keeps between two texts.
constexpr size_t kKeepBytes = 4 << 20;

/// Gives back what an unusually long text took.
void Shrink(std::string& buffer) {
  if (buffer.capacity() > kKeepBytes) buffer = std::string();
}

}  // namespace

TextCodec::TextCodec() : packer_(ZSTD_createCCtx()), unpacker_(ZSTD_createDCtx()) {}

std::string_view TextCodec::Pack(std::string_view text) {
  Shrink(packed_);
  packed_.resize(ZSTD_compressBound(text.size()));
  const size_t size =
      ZSTD_compressCCtx(packer_.get(), packed_.data(), packed_.size(), text.data(), text.size(), kLevel);
  return ZSTD_isError(size) != 0 ? std::string_view() : std::string_view(packed_).substr(0, size);
}

std::string_view TextCodec::Unpack(std::string_view packed) {
  Shrink(text_);
  const unsigned long long size = ZSTD_getFrameContentSize(packed.data(), packed.size());
  if (size > kTextMaxBytes) return {};  // the two error values are beyond it
  text_.resize(static_cast<size_t>(size));
  const size_t got = ZSTD_decompressDCtx(unpacker_.get(), text_.data(), text_.size(), packed.data(), packed.size());
  return ZSTD_isError(got) != 0 ? std::string_view() : std::string_view(text_).substr(0, got);
}

}  // namespace ferrox::engine
