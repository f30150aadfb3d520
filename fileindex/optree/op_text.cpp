#include <iomanip>
#include <ostream>

#include "common/json_util.h"
#include "fileindex/optree/optree.h"

namespace ferrox::fileindex {

namespace {

/// Whether `data` is an object with a true flag of that name; `accept` tells which members count as flags.
bool HasFlag(const Json::Value& data, const char* key, bool (*accept)(const Json::Value&)) {
  if (!data.isObject()) return false;
  const Json::Value& flag = data[key];
  return accept(flag) && asJsonType<bool>(flag);
}

bool IsBool(const Json::Value& flag) { return flag.isBool(); }

}  // namespace

OP::OP(std::shared_ptr<OPNode> op_node, FileIndexOP kind, const std::string& old_path, const Json::Value& flags)
    : node(std::move(op_node)), op(kind), path(old_path), data(flags) {}

/// A flag that is there already must be a bool to count; an incoming one, which a line of the queue brought, whatever
/// reads as one.
void OP::MergeData(const Json::Value& incoming) {
  for (const char* key : {"document", "audio", "video", "photo"}) {
    const bool on = HasFlag(incoming, key, &isJsonType<bool>) || HasFlag(data, key, &IsBool);
    if (!data.isObject()) data = Json::Value(Json::objectValue);
    data[key] = on;
  }
}

std::ostream& operator<<(std::ostream& stream, std::shared_ptr<OP> op) {
  stream << "[" << std::setfill('0') << std::setw(2) << static_cast<int>(op->op) << "] ";
  if (op->op == OP_RENAME) stream << op->path << " -> ";
  stream << op->node->GetPath();
  if (op->op == OP_UPDATE_CFG) stream << ", data=" << toString(op->data);
  return stream;
}

std::ostream& operator<<(std::ostream& stream, std::shared_ptr<OPNode> node) {
  stream << "Node[" << node->name << "]: " << std::endl;
  for (const auto& op : node->ops) stream << "  " << op << std::endl;
  return stream;
}

}  // namespace ferrox::fileindex
