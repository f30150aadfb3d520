#include <json/value.h>

#include <kova/content_extract.h>

#include "platform/host/content/facts.h"

namespace KOVA::CONTENT_EXTRACT {

void ParseFile(const std::string& path, const Json::Value& config, Json::Value& document) {
  (void)config;
  const kova::content::Facts facts = kova::content::AddFacts(path, document);
  const char* type = kova::content::TypeByMode(facts.info.stx_mode);
  if (type != nullptr) document["KOVAMDContentType"] = type;
}

}  // namespace KOVA::CONTENT_EXTRACT
