#include "services/kovaelasticd/query/asked_fields.h"

#include <algorithm>

#include "services/kovaelasticd/query/field_names.h"
#include "wire/fields.h"

namespace ferrox::engine {

namespace {

void Collect(const QueryNode& node, std::vector<AskedFields>& asked) {
  if (node.type == QueryNode::Type::kNot) return;
  for (const QueryNode& child : node.children) Collect(child, asked);
  const bool is_condition = node.type == QueryNode::Type::kField || node.type == QueryNode::Type::kRange;
  const auto is_same = [&node](const AskedFields& earlier) { return earlier.fields == node.fields; };
  if (!is_condition || node.fields.empty() || std::any_of(asked.begin(), asked.end(), is_same)) return;
  if (node.fields[0] == fileindex::elastic::kKOVAMDTextContent) return;  // the passage shows it
  asked.push_back({NameOfFields(node.fields), node.fields});
}

}  // namespace

std::vector<AskedFields> FieldsAskedFor(const QueryNode& query) {
  std::vector<AskedFields> asked;
  Collect(query, asked);
  return asked;
}

}  // namespace ferrox::engine
