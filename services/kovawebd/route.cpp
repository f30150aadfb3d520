#include "services/kovawebd/route.h"

#include <algorithm>
#include <charconv>
#include <optional>
#include <utility>

#include "base/json.h"
#include "base/text.h"
#include "services/kovawebd/query_string.h"

namespace ferrox::web {

namespace {

[[noreturn]] void Refuse(const Parameter& parameter, const std::string& must_be) {
  throw Problem{400, "\"" + std::string(parameter.name) + "\" must be " + must_be};
}

std::optional<int64_t> ReadNumber(const std::string& text) {
  int64_t number = 0;
  const auto read = std::from_chars(text.data(), text.data() + text.size(), number);
  if (read.ec != std::errc() || read.ptr != text.data() + text.size()) return std::nullopt;
  return number;
}

bool IsUtf8(std::string_view text) {
  while (!text.empty()) {
    const size_t bytes = base::CharacterBytes(text);
    if (bytes == 0) return false;
    text.remove_prefix(bytes);
  }
  return true;
}

std::string Bounds(const Parameter& parameter) {
  return "of " + std::to_string(parameter.low) + " to " + std::to_string(parameter.high);
}

void CheckValue(const Parameter& parameter, const std::string& value) {
  using Kind = Parameter::Kind;
  if (parameter.kind == Kind::kNumber) {
    const std::optional<int64_t> number = ReadNumber(value);
    if (!number.has_value() || *number < parameter.low || *number > parameter.high)
      Refuse(parameter, "a number " + Bounds(parameter));
    return;
  }
  if (parameter.kind == Kind::kYesNo) {
    if (value != "true" && value != "false") Refuse(parameter, "true or false");
    return;
  }
  const auto bytes = static_cast<int64_t>(value.size());
  if (bytes < parameter.low || bytes > parameter.high) Refuse(parameter, "a text " + Bounds(parameter) + " bytes");
  if (parameter.kind == Kind::kText && !IsUtf8(value)) Refuse(parameter, "UTF-8");
  const std::vector<std::string>& values = parameter.values;
  if (!values.empty() && std::find(values.begin(), values.end(), value) == values.end()) {
    std::string list;
    for (const std::string& one : values) list += (list.empty() ? "" : ", ") + one;
    Refuse(parameter, "one of " + list);
  }
}

const Parameter& Known(const std::vector<Parameter>& parameters, const std::string& name) {
  const auto found = std::find_if(parameters.begin(), parameters.end(),
                                  [&name](const Parameter& parameter) { return name == parameter.name; });
  if (found == parameters.end()) throw Problem{400, "there is a parameter that is not known here"};
  return *found;
}

void RequireAll(const std::vector<Parameter>& parameters, const std::function<bool(const char* name)>& has) {
  for (const Parameter& parameter : parameters) {
    if (parameter.required && !has(parameter.name)) Refuse(parameter, "given");
  }
}

/// Values are as texts, as those of the query are.
std::string ValueText(const Parameter& parameter, const Json::Value& value) {
  const bool is_number = parameter.kind == Parameter::Kind::kNumber;
  if (is_number ? !value.isInt64() : !value.isString()) Refuse(parameter, is_number ? "a number" : "a text");
  return value.asString();
}

Json::Value ReadBody(const std::vector<Parameter>& members, const std::string& text) {
  Json::Value body;
  const bool read = base::ParseJson(text, base::JsonRules::kDocument, body) && body.isObject();
  if (!read) throw Problem{400, "the body must be a JSON object"};
  for (const std::string& name : body.getMemberNames()) {
    const Parameter& member = Known(members, name);
    CheckValue(member, ValueText(member, body[name]));
  }
  RequireAll(members, [&body](const char* name) { return body.isMember(name); });
  return body;
}

/// Whether the path is the route's; `last` gets what stands for its variable.
bool Fits(const std::string& pattern, const std::string& path, std::string& last) {
  const size_t variable = pattern.find('{');
  if (variable == std::string::npos) return pattern == path;
  if (path.size() <= variable || path.compare(0, variable, pattern, 0, variable) != 0) return false;
  last = path.substr(variable);
  return last.find('/') == std::string::npos;
}

}  // namespace

std::string Call::Text(const std::string& name, const std::string& otherwise) const {
  const auto found = parameters.find(name);
  return found == parameters.end() ? otherwise : found->second.front();
}

int64_t Call::Number(const std::string& name, int64_t otherwise) const {
  return Has(name) ? ReadNumber(Text(name)).value_or(otherwise) : otherwise;
}

Found FindRoute(const std::vector<Route>& routes, const std::string& method, const std::string& path) {
  std::string allowed, last;
  for (const Route& route : routes) {
    if (!Fits(route.path, path, last)) continue;
    if (method == route.method || (method == "HEAD" && route.method == std::string("GET"))) return {&route, last};
    allowed += (allowed.empty() ? "" : ", ") + std::string(route.method);
  }
  if (allowed.empty()) throw Problem{404, "there is nothing here; /api/v1/openapi.json tells what there is"};
  throw Problem{405, "here is to be asked with " + allowed};
}

Call ReadCall(const Route& route, const Found& found, const std::string& target, const std::string& body) {
  Call call;
  call.last = found.last;
  for (auto& [name, value] : ReadTarget(target).parameters) {
    const Parameter& parameter = Known(route.parameters, name);
    CheckValue(parameter, value);
    std::vector<std::string>& values = call.parameters[name];
    if (!values.empty() && !parameter.repeated) Refuse(parameter, "given once");
    values.push_back(std::move(value));
  }
  RequireAll(route.parameters, [&call](const char* name) { return call.Has(name); });
  if (!route.body.empty()) call.body = ReadBody(route.body, body);
  return call;
}

}  // namespace ferrox::web
