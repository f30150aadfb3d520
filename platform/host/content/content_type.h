#pragma once

#include <string_view>

/// What kind of content a file has, by its extension and by its first bytes.
namespace kova::content {

enum class Reader {
  kNone,   ///< no text to get: pictures, sound, archives and the like
  kPlain,  ///< plain text, source code, CSV, Markdown
  kHtml,
  kXml,
};

struct ContentType {
  const char* mime;
  Reader reader;
};

/// By an extension in lower case, without its dot; null for one that is not in the table.
const ContentType* TypeByExtension(std::string_view extension);

/// By the first bytes of the file, for formats that have a mark of their own; null when there is none.
const ContentType* TypeByMark(std::string_view head);

}  // namespace kova::content
