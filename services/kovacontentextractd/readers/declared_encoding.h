#pragma once

#include <string>
#include <string_view>

namespace ferrox::extract {

/// The encoding that the beginning of the content declares for itself, as it is spelt there; empty when it does not.
/// HTML does so in a <meta> element within the first 4096 bytes or as XML does; XML in its first line.
std::string DeclaredHtmlEncoding(std::string_view head);
std::string DeclaredXmlEncoding(std::string_view head);

}  // namespace ferrox::extract
