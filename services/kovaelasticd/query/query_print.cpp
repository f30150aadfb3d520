#include "services/kovaelasticd/query/query.h"

namespace ferrox::engine {

namespace {

void Print(std::string& out, const QueryNode& node);

void PrintJoined(std::string& out, const QueryNode& node) {
  out += node.type == QueryNode::Type::kAnd ? "(and" : node.type == QueryNode::Type::kOr ? "(or" : "(not";
  for (const QueryNode& child : node.children) {
    out += ' ';
    Print(out, child);
  }
  out += ')';
}

void PrintWords(std::string& out, const std::string& before, const QueryNode& node) {
  if (!node.joined.empty()) out += '[' + node.joined + "] ";
  out += (node.required ? "+" : "") + before + (node.phrase ? "\"" + node.text + "\"" : node.text) +
         (node.prefix ? "*" : "");
}

std::string Join(const std::vector<std::string>& parts) {
  std::string joined;
  for (const std::string& part : parts) joined += (joined.empty() ? "" : "|") + part;
  return joined;
}

void PrintRange(std::string& out, const QueryNode& node) {
  out += node.type == QueryNode::Type::kSize ? "size" : node.type == QueryNode::Type::kDate ? "date" : "";
  out += Join(node.fields) + ":" + std::to_string(node.low) + ".." + std::to_string(node.high);
}

void Print(std::string& out, const QueryNode& node) {
  switch (node.type) {
    case QueryNode::Type::kAll:
      out += "all";
      break;
    case QueryNode::Type::kAnd:
    case QueryNode::Type::kOr:
    case QueryNode::Type::kNot:
      PrintJoined(out, node);
      break;
    case QueryNode::Type::kText:
      PrintWords(out, "", node);
      break;
    case QueryNode::Type::kField:
      PrintWords(out, Join(node.fields) + ":", node);
      break;
    case QueryNode::Type::kName:
      PrintWords(out, "name:", node);
      break;
    case QueryNode::Type::kExt:
      out += "ext:" + node.text;
      break;
    case QueryNode::Type::kPath:
      out += "path:" + node.text;
      break;
    case QueryNode::Type::kKind:
      out += "kind:";
      for (const int32_t kind : node.kinds) out += std::to_string(kind);
      break;
    case QueryNode::Type::kSize:
    case QueryNode::Type::kDate:
    case QueryNode::Type::kRange:
      PrintRange(out, node);
      break;
  }
}

}  // namespace

std::string PrintQuery(const QueryNode& query) {
  std::string out;
  Print(out, query);
  return out;
}

}  // namespace ferrox::engine
