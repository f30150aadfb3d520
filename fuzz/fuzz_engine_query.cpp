// Any query text is parsed or refused, never more; what is parsed can be printed, searched for in words, and marked.
#include <cstdint>
#include <string>

#include "common/error.h"
#include "services/kovaelasticd/query/query.h"
#include "services/kovaelasticd/text/snippet.h"
#include "services/kovaelasticd/text/words.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  using namespace ferrox::engine;
  const std::string text(reinterpret_cast<const char*>(data), size);
  try {
    const QueryNode query = ParseQuery(text, 1718000000);
    if (PrintQuery(query).empty()) __builtin_trap();
  } catch (const ferrox::Error& error) {
    if (error.Code() != ferrox::Error::kEngineBadRequest || *error.what() == '\0') __builtin_trap();
  }
  WordScanner scanner(text);
  std::vector<SnippetWord> words;
  while (scanner.Next()) {
    if (scanner.Word().empty() || scanner.End() > size || scanner.Begin() >= scanner.End()) __builtin_trap();
    if (words.size() < 3) words.push_back({std::string(scanner.Word()), false});
  }
  // What was cut out of a text is found in it again.
  if (!words.empty() && MakeSnippet(text, words, "[", "]").empty()) __builtin_trap();
  (void)Trigrams(text, 64);
  return 0;
}
