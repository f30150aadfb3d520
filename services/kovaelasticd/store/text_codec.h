#pragma once

#include <zstd.h>

#include <memory>
#include <string>
#include <string_view>

namespace ferrox::engine {

/// Packs and unpacks texts, each on its own (zstd); keeps its working memory for the next one. For one thread at a
/// time.
class TextCodec {
 public:
  TextCodec();
  /// The packed text; valid until the next call.
  std::string_view Pack(std::string_view text);
  /// The text again, "" when the bytes are damaged; valid until the next call.
  std::string_view Unpack(std::string_view packed);

 private:
  /// For the library's contexts.
  struct Freer {
    void operator()(ZSTD_CCtx* context) const { (void)ZSTD_freeCCtx(context); }
    void operator()(ZSTD_DCtx* context) const { (void)ZSTD_freeDCtx(context); }
  };
  std::unique_ptr<ZSTD_CCtx, Freer> packer_;
  std::unique_ptr<ZSTD_DCtx, Freer> unpacker_;
  // What the views that were returned last point into.
  std::string packed_;
  std::string text_;
};

}  // namespace ferrox::engine
