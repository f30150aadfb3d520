// The encoding and markup readers: any bytes give valid UTF-8 within the limit, or the word that they are no text.
// The first byte chooses the reader and whether the file goes on after the bytes.

#include <cstdint>
#include <cstdlib>
#include <string>
#include <string_view>

#include "services/kovacontentextractd/readers/declared_encoding.h"
#include "services/kovacontentextractd/readers/encoding.h"
#include "services/kovacontentextractd/readers/markup.h"
#include "services/kovacontentextractd/readers/utf8.h"

using namespace ferrox::extract;

namespace {

constexpr size_t kLimitBytes = 4096;

void Require(bool condition) {
  if (!condition) abort();
}

void Check(const MarkupText& read) {
  Require(read.text.size() <= kLimitBytes);
  Require(ValidUtf8Prefix(read.text) == read.text.size());
  Require(ValidUtf8Prefix(read.title) == read.title.size());
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  if (size == 0) return 0;
  const std::string_view bytes(reinterpret_cast<const char*>(data) + 1, size - 1);
  const bool html = (data[0] & 1) != 0, cut = (data[0] & 2) != 0;
  DecodedText decoded;
  if (bytes.empty() || !Decode(bytes, cut, html ? DeclaredHtmlEncoding(bytes) : DeclaredXmlEncoding(bytes), decoded)) {
    return 0;
  }
  Require(ValidUtf8Prefix(decoded.text) == decoded.text.size());
  Check(html ? ReadHtml(decoded.text, kLimitBytes) : ReadXml(decoded.text, kLimitBytes));
  return 0;
}
