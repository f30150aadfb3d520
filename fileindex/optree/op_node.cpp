#include "common/new_class.h"
#include "fileindex/optree/op_arena.h"
#include "fileindex/optree/op_branch.h"
#include "fileindex/optree/optree.h"

namespace ferrox::fileindex {

OPNode::OPNode(std::shared_ptr<OPNode> parent_node, std::string node_name)
    : name(std::move(node_name)), parent(std::move(parent_node)) {}

OPNode::~OPNode() {
  // A node that outlives its tree may be the last to hold the way up, as long as that is.
  // One by one: the ancestors that only this node kept would otherwise be destroyed inside each other.
  std::shared_ptr<OPNode> up = std::move(parent);
  while (up != nullptr && up.use_count() == 1) up = std::move(up->parent);
}

std::shared_ptr<OPNode> OPNode::GetChild(const std::string& child_name) {
  return ChildOf(child_name, nullptr).shared_from_this();
}

/// A new child comes from the arena, or from the heap without one.
OPNode& OPNode::ChildOf(std::string_view child_name, OPArena* arena) {
  if (branch_ == nullptr) branch_ = std::make_unique<OPBranch>();
  const uint32_t hash = HashName(child_name);
  if (OPNode* const found = branch_->Find(*this, child_name, hash)) return *found;
  std::string text(child_name);
  children.push_back(arena != nullptr
                         ? std::allocate_shared<OPNode>(OPAllocator<OPNode>(arena), shared_from_this(), std::move(text))
                         : newClass<OPNode>(shared_from_this(), std::move(text)));
  OPNode& child = *children.back();
  child.position_ = static_cast<uint32_t>(children.size() - 1);
  branch_->Added(*this, hash);
  return child;
}

/// Goes up twice, for the length and for the names from the end on, so that one allocation does.
std::string OPNode::GetPath() const {
  size_t length = name.size();
  for (const OPNode* node = parent.get(); node != nullptr; node = node->parent.get()) length += node->name.size() + 1;
  std::string path(length, '/');
  size_t at = length;
  for (const OPNode* node = this; node != nullptr; node = node->parent.get()) {
    at -= node->name.size();
    path.replace(at, node->name.size(), node->name);
    if (node->parent != nullptr) --at;
  }
  return path;
}

/// Of a copy, since `fn` may queue further operations; whether one is cancelled is asked when its turn comes.
void OPNode::TraverseOP(const std::function<void(std::shared_ptr<OP>)>& fn) {
  const std::vector<std::shared_ptr<OP>> copy = ops;
  for (const auto& op : copy) {
    if (op->op != OP_NONE) fn(op);
  }
}

}  // namespace ferrox::fileindex
