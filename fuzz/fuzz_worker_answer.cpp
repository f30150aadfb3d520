// What a worker answers, a JSON text and, behind a zero byte here, the text in its region: any bytes give fields that a
// content may set, each small and of its type, or are refused and nothing is taken; of the text, what is handed on is
// its beginning in UTF-8, and all of it when it is taken.

#include <unistd.h>

#include <algorithm>
#include <cstdint>
#include <cstdlib>
#include <string>
#include <string_view>
#include <vector>

#include "base/unique_fd.h"
#include "services/kovacontentextractd/answer.h"
#include "services/kovacontentextractd/readers/reader.h"
#include "services/kovacontentextractd/readers/utf8.h"
#include "services/kovacontentextractd/region.h"
#include "services/kovacontentextractd/worker_protocol.h"

using namespace ferrox::extract;

namespace {

void Require(bool condition) {
  if (!condition) abort();
}

void RequireTextWhole(const std::string& text) {
  static const base::UniqueFd region = MakeRegion();
  Require(pwrite(region.Get(), text.data(), text.size(), 0) == static_cast<ssize_t>(text.size()));
  std::string copied;
  const bool whole = CopyText(region.Get(), text.size(), [&copied](size_t offset, std::string_view piece) {
    Require(offset == copied.size());
    copied += piece;
  });
  Require(text.compare(0, copied.size(), copied) == 0 && ValidUtf8Prefix(copied) == copied.size());
  Require(whole == (text.size() <= Limits().text_bytes && ValidUtf8Prefix(text) == text.size()));
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  const std::string bytes(reinterpret_cast<const char*>(data), size);
  const std::string json = bytes.substr(0, bytes.find('\0'));
  Json::Value fields(Json::objectValue);
  std::vector<AttachedBytes> attachments;
  const bool taken = ParseAnswer(json, fields, attachments);
  for (const AttachedBytes& one : attachments) Require(uint64_t{one.offset} + one.bytes <= kRegionBytes);
  Require(taken || fields.empty());
  Require(!fields.isMember("KOVAMDPath") && !fields.isMember("KOVAMDTextContent"));
  for (const Json::Value& value : fields) {
    Require(value.isBool() || value.isNumeric() || value.isString());
    if (!value.isString()) continue;
    const std::string text = value.asString();
    Require(text.size() <= size && ValidUtf8Prefix(text) == text.size());
  }
  RequireTextWhole(bytes.substr(std::min(json.size() + 1, bytes.size())));
  return 0;
}
