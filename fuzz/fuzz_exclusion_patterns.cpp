// An ignore file as any bytes, and a path behind its last line: it is read within its limits, and what it says of the
// path does not depend on whether names are matched one by one or the same folder is entered again. Patterns that a
// name is made of choose it.

#include <cstdint>
#include <cstdlib>
#include <string>
#include <string_view>

#include "services/support/exclusion_source.h"

using base::IgnorePatterns;

namespace {

void Require(bool condition) {
  if (!condition) abort();
}

void Walk(const IgnorePatterns& patterns, std::string_view path) {
  IgnorePatterns::State state = patterns.Begin();
  for (bool more = true; more;) {
    const size_t end = path.find('/');
    const std::string_view name = path.substr(0, end);
    more = end != std::string_view::npos;
    const int as_file = patterns.Match(state, name, false);
    Require(as_file < static_cast<int>(patterns.Count()));
    Require(patterns.Match(state, name, true) >= as_file);
    Require(patterns.Enter(state, name) == patterns.Enter(state, name));
    state = patterns.Enter(state, name);
    if (more) path.remove_prefix(end + 1);
  }
}

/// With all that means something escaped, any name but one of blanks at its end is a pattern for itself.
void CheckPlain(std::string_view name) {
  std::string escaped;
  for (const char byte : name) escaped += std::string("\\") + byte;
  IgnorePatterns patterns;
  if (name.empty() || name.find('/') != std::string_view::npos || name.find('\n') != std::string_view::npos) return;
  Require(patterns.Add(escaped, 1));
  Require(patterns.Match(patterns.Begin(), name, false) == 0);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  const std::string_view text(reinterpret_cast<const char*>(data), size);
  const size_t last_line = text.rfind('\n') + 1;
  const std::string_view path = text.substr(last_line, 4096);
  ferrox::services::ExclusionSource source;
  const std::string refused = ferrox::services::AddIgnoreFileText(text.substr(0, last_line), source);
  Require(!refused.empty() ||
          source.exclude.Count() + source.exclude_content.Count() <= ferrox::services::kIgnorePatternsMax);
  Walk(source.exclude, path);
  Walk(source.exclude_content, path);
  CheckPlain(path.substr(0, path.find('/')));
  return 0;
}
