#pragma once

#include <cstddef>
#include <string>
#include <string_view>

/// Text out of HTML and XML, in one pass over the bytes with constant memory beside the result. No document type is
/// read, no entity is defined by the content, nothing is fetched; what is not well-formed is read as far as it goes.
namespace ferrox::extract {

struct MarkupText {
  std::string title;
  std::string text;  ///< valid UTF-8 when the input is
  bool cut = false;  ///< there was more text than the limit
};

/// Tags become blanks or line ends, scripts and styles are dropped, references to characters are resolved, and runs of
/// blanks are one. `source` is UTF-8; at most `limit_bytes` of text are kept, and reading ends there.
MarkupText ReadHtml(std::string_view source, size_t limit_bytes);
MarkupText ReadXml(std::string_view source, size_t limit_bytes);

}  // namespace ferrox::extract
