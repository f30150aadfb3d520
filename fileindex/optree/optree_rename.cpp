#include <algorithm>

#include "base/path.h"
#include "common/new_class.h"
#include "fileindex/optree/optree.h"

// How a rename takes what is pending under the old name along to the new one. The index daemon carries operations out
// in their order, looking at the disk as it is by then: an event of the old name that came before the rename has
// nothing to look at there any more, so its operation moves to where the file is now.

namespace ferrox::fileindex {

namespace {

/// Takes the operations for which `leaves` answers true out of the list, both parts in the order they had.
template <typename Leaves>
std::vector<std::shared_ptr<OP>> TakeOut(std::vector<std::shared_ptr<OP>>& ops, Leaves leaves) {
  std::vector<std::shared_ptr<OP>> taken;
  std::vector<std::shared_ptr<OP>> staying;
  for (std::shared_ptr<OP>& op : ops) (leaves(*op) ? taken : staying).push_back(std::move(op));
  ops = std::move(staying);
  return taken;
}

}  // namespace

/// `node` is the new place; `op`, the rename, has the old path. In the end the node's list reads: what it had before,
/// what came from the old node, the rename, and last the content work of the old node, which is to be done on the
/// document that the rename brings along.
void OPTree::Rename(OPNode& node, const std::shared_ptr<OP>& op) {
  const std::string old_path = op->path;
  const std::string new_path = node.GetPath();
  OPNode& old_node = FindNode(old_path);
  op->op = OP_RENAME;
  // What was pending for a file that the rename replaces is void.
  for (size_t i = node.settled_; i < node.ops.size(); ++i) {
    FileIndexOP& pending = node.ops[i]->op;
    if (pending == OP_DELETE || pending == OP_UPSERT || pending == OP_ATTR) pending = OP_NONE;
  }
  const FileIndexOP carried = MoveOwn(old_node, node);
  MoveBelow(old_node, old_path, new_path);
  Queue(node, op);
  // The content work is done again after the rename, at the new place.
  if (carried != OP_NONE) Queue(node, newClass<OP>(node.shared_from_this(), carried, "", Json::Value()));
}

/// Moves the pending operations of the renamed node itself; content work is cancelled. @return its last kind, or none.
FileIndexOP OPTree::MoveOwn(OPNode& from, OPNode& to) {
  FileIndexOP carried = OP_NONE;
  const auto leaves = [&carried](OP& op) {
    if (op.op == OP_NONE) return false;
    if (op.op == OP_UPSERT || op.op == OP_ATTR || op.op == OP_REINDEX) {
      carried = op.op;
      op.op = OP_NONE;
    }
    return true;
  };
  from.settled_ = 0;
  Take(to, TakeOut(from.ops, leaves));
  return carried;
}

/// Whether also the idle nodes below get their counterparts (see OPTree). Counts the nodes below against what is left,
/// and stops as soon as that is used up, which it then stays.
bool OPTree::MayVisitIdle(OPNode& old_node) {
  std::vector<const OPNode*> open = {&old_node};
  while (!open.empty() && idle_nodes_left_ != 0) {
    const OPNode* const node = open.back();
    open.pop_back();
    idle_nodes_left_ -= std::min(idle_nodes_left_, node->children.size());
    if (idle_nodes_left_ == 0) break;
    for (const auto& child : node->children) open.push_back(child.get());
  }
  return idle_nodes_left_ != 0;
}

/// Moves what is pending below the old node, the deepest nodes first. While it goes on, the tree grows: FindNode makes
/// the counterparts. Where these lie apart from the old node, as after each rename that a kernel makes, the walk does
/// not meet them, and it is enough to visit the nodes with movable operations.
void OPTree::MoveBelow(OPNode& old_node, const std::string& old_path, const std::string& new_path) {
  const bool with_idle = MayVisitIdle(old_node);
  const auto move = [&](const std::shared_ptr<OPNode>& node) { MoveAlong(*node, old_path, new_path, with_idle); };
  if (base::IsAtOrBelow(new_path, old_path)) {
    // The nodes are listed first, or the walk would go on into those that it makes.
    for (OPNode* const node : NodesBelow(old_node, kEveryNode)) move(node->shared_from_this());
  } else if (with_idle || base::IsAtOrBelow(old_path, new_path)) {
    // To an ancestor, an operation may come to a node that the walk has yet to pass.
    TraverseNodeDescendant(old_node.shared_from_this(), move, true);
  } else {
    const std::vector<OPNode*> below = NodesBelow(old_node, kMovable);
    for (OPNode* const node : below) move(node->shared_from_this());
    Unmark(old_node, below, kMovable);
  }
}

/// Moves the operations of a node below the old path to its counterpart below the new one. Deletes stay: they concern
/// the document of the old name.
void OPTree::MoveAlong(OPNode& node, const std::string& old_path, const std::string& new_path, bool with_idle) {
  const auto leaves = [](const std::shared_ptr<OP>& op) { return op->op >= OP_UPSERT; };
  if (!with_idle && std::none_of(node.ops.begin(), node.ops.end(), leaves)) return;
  OPNode& target = FindNode(new_path + node.GetPath().substr(old_path.size()));
  node.settled_ = 0;
  Take(target, TakeOut(node.ops, [](const OP& op) { return op.op >= OP_UPSERT; }));
}

/// Appends the operations to the node's, in their order, and tells them that they are its. Their places in the tree's
/// own list do not change.
void OPTree::Take(OPNode& to, const std::vector<std::shared_ptr<OP>>& moved) {
  if (moved.empty()) return;
  const std::shared_ptr<OPNode> node = to.shared_from_this();
  for (const auto& op : moved) {
    op->node = node;
    to.ops.push_back(op);
    Mark(to, op->op);
  }
}

}  // namespace ferrox::fileindex
