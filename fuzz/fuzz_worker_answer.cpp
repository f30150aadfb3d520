// What a worker answers: any bytes give fields that a content may set, each small and of its type, and text in UTF-8
// within the limit; or they are refused and nothing is taken.

#include <cstdint>
#include <cstdlib>
#include <string>

#include "services/kovacontentextractd/answer.h"
#include "services/kovacontentextractd/readers/reader.h"
#include "services/kovacontentextractd/readers/utf8.h"

using namespace ferrox::extract;

namespace {

void Require(bool condition) {
  if (!condition) abort();
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  Answer answer;
  const bool taken = ParseAnswer(std::string(reinterpret_cast<const char*>(data), size), answer);
  Require(taken || (answer.fields.empty() && answer.text.empty()));
  Require(answer.text.size() <= Limits().text_bytes && ValidUtf8Prefix(answer.text) == answer.text.size());
  Require(!answer.fields.isMember("KOVAMDPath") && !answer.fields.isMember("KOVAMDTextContent"));
  for (const Json::Value& value : answer.fields) {
    Require(value.isBool() || value.isNumeric() || value.isString());
    if (!value.isString()) continue;
    const std::string text = value.asString();
    Require(text.size() <= size && ValidUtf8Prefix(text) == text.size());
  }
  return 0;
}
