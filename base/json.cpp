#include "base/json.h"

#include <memory>

#include <json/reader.h>
#include <json/value.h>

#include "base/files.h"

namespace base {

namespace {

std::unique_ptr<Json::CharReader> NewReader(JsonRules rules) {
  Json::CharReaderBuilder builder;
  builder["collectComments"] = false;
  builder["allowComments"] = false;
  builder["allowTrailingCommas"] = false;
  builder["failIfExtra"] = true;
  builder["stackLimit"] = 1000;
  builder["strictRoot"] = rules == JsonRules::kDocument;
  builder["rejectDupKeys"] = rules == JsonRules::kDocument;
  return std::unique_ptr<Json::CharReader>(builder.newCharReader());
}

}  // namespace

bool ParseJson(std::string_view text, JsonRules rules, Json::Value& value, std::string* problem) {
  thread_local const std::unique_ptr<Json::CharReader> of_any = NewReader(JsonRules::kAnyValue);
  thread_local const std::unique_ptr<Json::CharReader> of_documents = NewReader(JsonRules::kDocument);
  const auto& reader = rules == JsonRules::kAnyValue ? of_any : of_documents;
  try {
    if (reader->parse(text.data(), text.data() + text.size(), &value, problem)) return true;
  } catch (const Json::Exception& error) {  // nesting beyond the limit
    if (problem != nullptr) *problem = error.what();
  }
  value = Json::Value();
  return false;
}

bool ReadJsonFile(const std::string& path, JsonRules rules, Json::Value& value) {
  std::string text;
  if (ReadWholeFile(path, text)) return ParseJson(text, rules, value);
  value = Json::Value();
  return false;
}

}  // namespace base
