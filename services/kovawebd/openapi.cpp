#include "services/kovawebd/openapi.h"

#include <algorithm>
#include <cctype>

namespace ferrox::web {

namespace {

Json::Value SchemaOf(const Parameter& parameter) {
  using Kind = Parameter::Kind;
  Json::Value schema;
  schema["type"] = parameter.kind == Kind::kNumber ? "integer" : parameter.kind == Kind::kYesNo ? "boolean" : "string";
  if (parameter.kind == Kind::kNumber) {
    schema["minimum"] = Json::Int64(parameter.low);
    schema["maximum"] = Json::Int64(parameter.high);
  } else if (parameter.kind != Kind::kYesNo) {
    schema["minLength"] = Json::Int64(parameter.low);
    schema["maxLength"] = Json::Int64(parameter.high);
  }
  for (const std::string& value : parameter.values) schema["enum"].append(value);
  if (!parameter.repeated) return schema;
  Json::Value list;
  list["type"] = "array";
  list["items"] = schema;
  return list;
}

Json::Value InQuery(const Parameter& parameter) {
  Json::Value json;
  json["in"] = "query";
  json["name"] = parameter.name;
  json["description"] = parameter.description;
  json["required"] = parameter.required;
  json["schema"] = SchemaOf(parameter);
  return json;
}

Json::Value InPath(const std::string& path) {
  Json::Value json;
  const size_t begin = path.find('{') + 1;
  json["in"] = "path";
  json["name"] = path.substr(begin, path.find('}') - begin);
  json["required"] = true;
  json["schema"]["type"] = "string";
  return json;
}

Json::Value BodyOf(const std::vector<Parameter>& members) {
  Json::Value body;
  body["required"] = true;
  Json::Value& schema = body["content"]["application/json"]["schema"];
  schema["type"] = "object";
  schema["additionalProperties"] = false;
  for (const Parameter& member : members) {
    Json::Value& property = schema["properties"][member.name] = SchemaOf(member);
    property["description"] = member.description;
    if (member.required) schema["required"].append(member.name);
  }
  return body;
}

Json::Value OperationOf(const Route& route) {
  Json::Value operation;
  operation["operationId"] = route.name;
  operation["summary"] = route.summary;
  if (route.whom == Route::For::kUser) operation["security"][0]["token"] = Json::Value(Json::arrayValue);
  if (route.whom == Route::For::kLocal) operation["description"] = "On the Unix socket alone.";
  for (const Parameter& parameter : route.parameters) operation["parameters"].append(InQuery(parameter));
  const std::string path = route.path;
  if (path.find('{') != std::string::npos) operation["parameters"].append(InPath(path));
  if (!route.body.empty()) operation["requestBody"] = BodyOf(route.body);
  Json::Value& good = operation["responses"]["200"];
  good["description"] = "The answer";
  good["content"]["application/json"]["schema"]["type"] = "object";
  operation["responses"]["default"]["$ref"] = "#/components/responses/Problem";
  return operation;
}

}  // namespace

Json::Value DescribeApi(const std::vector<Route>& routes, const std::string& version) {
  Json::Value api;
  api["openapi"] = "3.1.0";
  api["info"]["title"] = "File search";
  api["info"]["version"] = version;
  for (const Route& route : routes) {
    std::string method = route.method;
    std::transform(method.begin(), method.end(), method.begin(), [](unsigned char c) { return tolower(c); });
    api["paths"][route.path][method] = OperationOf(route);
  }
  Json::Value& components = api["components"];
  components["securitySchemes"]["token"]["type"] = "http";
  components["securitySchemes"]["token"]["scheme"] = "bearer";
  components["schemas"]["Problem"]["type"] = "object";
  for (const char* name : {"type", "title", "detail"}) {
    components["schemas"]["Problem"]["properties"][name]["type"] = "string";
  }
  components["schemas"]["Problem"]["properties"]["status"]["type"] = "integer";
  Json::Value& problem = components["responses"]["Problem"];
  problem["description"] = "A problem, as RFC 9457 has it";
  problem["content"]["application/problem+json"]["schema"]["$ref"] = "#/components/schemas/Problem";
  return api;
}

}  // namespace ferrox::web
