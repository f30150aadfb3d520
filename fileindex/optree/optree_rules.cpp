#define FERROX_SOURCE "optree"

#include <algorithm>
#include <utility>

#include "common/new_class.h"
#include "fileindex/optree/op_arena.h"
#include "fileindex/optree/op_branch.h"
#include "fileindex/optree/optree.h"
#include "fileindex/queue/event_scan.h"

// How an event is folded into what is pending already for its path and, of folders, below it.
//
// The index daemon looks at the disk when it carries an operation out, which is after all events of the queue. So it
// does not matter when a file was written, only whether it has to be read once more: of all that happened to a path,
// the table below keeps the operation that makes the daemon compare as much as it must, and no more.

namespace ferrox::fileindex {

/// The columns of kRules.
enum OPTree::Handler : int { kCreate, kModify, kAttr, kDelete, kUpdateCfg, kReindex };

namespace {

constexpr size_t kPendingKinds = 8;
constexpr size_t kHandlers = 6;

/// What becomes of a pending operation and of the new one that meets it.
enum class Rule : uint8_t {
  kKeep,      ///< both stay
  kDrop,      ///< the pending one stays, the new one is cancelled; so it is in all that follow
  kUpsert,    ///< the pending one becomes an upsert
  kDelete,    ///< ... a delete
  kTakeData,  ///< ... an update-config with the new data
  kMerge,     ///< ... gets the new flags added
  kReindex,   ///< ... a reindex
};

/// The kind of a handler's new operation.
constexpr FileIndexOP kNewKinds[kHandlers] = {OP_UPSERT, OP_UPSERT, OP_ATTR, OP_DELETE, OP_UPDATE_CFG, OP_REINDEX};

constexpr Rule Kp = Rule::kKeep;
constexpr Rule Dr = Rule::kDrop;
constexpr Rule Up = Rule::kUpsert;
constexpr Rule De = Rule::kDelete;
constexpr Rule Cf = Rule::kTakeData;
constexpr Rule Mg = Rule::kMerge;
constexpr Rule Re = Rule::kReindex;

constexpr Rule kRules[kPendingKinds][kHandlers] = {
    // create modify attr delete update-config reindex
    {Kp, Kp, Kp, Kp, Kp, Kp},  // none: cancelled, never visited
    {Up, Dr, Dr, Dr, Dr, Dr},  // delete: only a create brings the file back; of what is gone nothing else is news
    {Dr, Dr, Dr, De, Cf, Re},  // upsert: covers content and metadata; gives way to what does more
    {Up, Up, Dr, De, Cf, Re},  // attr: likewise, and grows with the content
    {Dr, Dr, Dr, Kp, Mg, Re},  // update-config: redoes the folder; a delete is carried out beside it
    {Kp, Kp, Kp, Kp, Kp, Kp},  // rename: neither absorbs nor is absorbed
    {Dr, Dr, Dr, Kp, Dr, Dr},  // reindex: covers all but a delete
    {Kp, Kp, Kp, Kp, Kp, Kp},  // full reindex: never pending
};

/// Applies the rule to the pending operation; whether the new one survives it.
bool Apply(Rule rule, OP& pending, const Json::Value& data) {
  switch (rule) {
    case Rule::kKeep:
      return true;
    case Rule::kDrop:
      break;
    case Rule::kUpsert:
      pending.op = OP_UPSERT;
      break;
    case Rule::kDelete:
      pending.op = OP_DELETE;
      break;
    case Rule::kTakeData:
      pending.op = OP_UPDATE_CFG;
      pending.data = data;
      break;
    case Rule::kMerge:
      pending.MergeData(data);
      break;
    case Rule::kReindex:
      pending.op = OP_REINDEX;
      break;
  }
  return false;
}

bool IsCancellable(FileIndexOP op) { return op != OP_NONE && op != OP_RENAME; }
bool IsMovable(FileIndexOP op) { return op >= OP_UPSERT; }

}  // namespace

/// Hands the event to the handler of each of its bits in turn, with the same operation. Deliberate: a later handler so
/// meets what an earlier one has just queued; a line with EVENT_ATTR and EVENT_MODIFY comes to nothing.
void OPTree::Dispatch(OPNode& node, const std::shared_ptr<OP>& op, const EventFields& event, const Json::Value& data) {
  const auto has = [&event](EventBit bit) { return (event.event & bit) != 0; };
  if (has(EVENT_CREATE)) event.is_dir ? Reindex(node, op) : Fold(node, kCreate, op);
  if (has(EVENT_ATTR)) Fold(node, kAttr, op);
  if (has(EVENT_MODIFY)) Fold(node, kModify, op);
  if (has(EVENT_DELETE)) event.is_dir ? Reindex(node, op) : Fold(node, kDelete, op);
  if (has(EVENT_RENAME)) {
    op->path = event.path_old;
    Rename(node, op);
  }
  if (has(EVENT_REINDEX)) Reindex(node, op);
  if (has(EVENT_UPDATE_CFG)) {
    op->data = data;
    Fold(node, kUpdateCfg, op);
  }
}

void OPTree::HandleCreate(std::shared_ptr<OPNode> node, std::shared_ptr<OP> op) { Fold(*node, kCreate, op); }
void OPTree::HandleModify(std::shared_ptr<OPNode> node, std::shared_ptr<OP> op) { Fold(*node, kModify, op); }
void OPTree::HandleAttr(std::shared_ptr<OPNode> node, std::shared_ptr<OP> op) { Fold(*node, kAttr, op); }
void OPTree::HandleDelete(std::shared_ptr<OPNode> node, std::shared_ptr<OP> op) { Fold(*node, kDelete, op); }
void OPTree::HandleUpdateCfg(std::shared_ptr<OPNode> node, std::shared_ptr<OP> op) { Fold(*node, kUpdateCfg, op); }
void OPTree::HandleReindex(std::shared_ptr<OPNode> node, std::shared_ptr<OP> op) { Reindex(*node, op); }
void OPTree::HandleRename(std::shared_ptr<OPNode> node, std::shared_ptr<OP> op) { Rename(*node, op); }

/// Folds the new operation into the node's pending ones and queues it if it survives them all. It may be one of them.
void OPTree::Fold(OPNode& node, Handler handler, const std::shared_ptr<OP>& op) {
  op->op = kNewKinds[handler];
  for (size_t i = node.settled_; i < node.ops.size(); ++i) {
    OP& pending = *node.ops[i];
    if (pending.op == OP_NONE) continue;
    if (Apply(kRules[pending.op][handler], pending, op->data)) continue;
    Mark(node, pending.op);
    op->op = OP_NONE;
  }
  if (op->op != OP_NONE) Queue(node, op);
}

void OPTree::Reindex(OPNode& node, const std::shared_ptr<OP>& op) {
  Fold(node, kReindex, op);
  // Deliberate: also when the reindex itself was dropped.
  const std::vector<OPNode*> below = NodesBelow(node, kCancellable);
  for (OPNode* const covered : below) {
    for (size_t i = covered->settled_; i < covered->ops.size(); ++i) {
      if (covered->ops[i]->op != OP_RENAME) covered->ops[i]->op = OP_NONE;
    }
  }
  Unmark(node, below, kCancellable);
}

void OPTree::Queue(OPNode& node, const std::shared_ptr<OP>& op) {
  ops.push_back(op);
  node.ops.push_back(op);
  Mark(node, op->op);
}

/// Sets the bits of the classes of `op`, which the node now holds, on it and on its ancestors, and puts each into its
/// parent's chain. Stops at the first node that has the bit: so do all above it. Amortized, a node is marked once for
/// each time that it was unmarked.
void OPTree::Mark(OPNode& node, FileIndexOP op) {
  for (const LiveClass live_class : {kCancellable, kMovable}) {
    if (!(live_class == kMovable ? IsMovable(op) : IsCancellable(op))) continue;
    for (OPNode* at = &node; at != nullptr && !at->MayHold(live_class); at = at->parent.get()) {
      at->live_ |= 1u << live_class;
      if (at->parent == nullptr || at->parent->branch_ == nullptr) continue;
      OPNode*& first_live = at->parent->branch_->first_live[live_class];
      at->next_live_[live_class] = first_live;
      first_live = at;
    }
  }
}

/// The nodes below `top` with the class's bit, or all of them, each after those below it, siblings in order of
/// creation.
std::vector<OPNode*> OPTree::NodesBelow(OPNode& top, LiveClass live_class) {
  std::vector<OPNode*> nodes;
  std::vector<OPNode*> open = {&top};
  while (!open.empty()) {
    OPNode* const node = open.back();
    open.pop_back();
    nodes.push_back(node);
    if (node->branch_ == nullptr) continue;
    if (live_class == kEveryNode) {
      for (const auto& child : node->children) open.push_back(child.get());
      continue;
    }
    const auto found = static_cast<std::ptrdiff_t>(open.size());
    for (OPNode* at = node->branch_->first_live[live_class]; at != nullptr; at = at->next_live_[live_class]) {
      open.push_back(at);
    }
    // The chain is newest first, which is often the reverse of what is wanted.
    std::reverse(open.begin() + found, open.end());
    const auto by_position = [](const OPNode* a, const OPNode* b) { return a->position_ < b->position_; };
    if (!std::is_sorted(open.begin() + found, open.end(), by_position)) {
      std::sort(open.begin() + found, open.end(), by_position);
    }
  }
  // Every node came before those below it and the last sibling first.
  std::reverse(nodes.begin(), nodes.end());
  nodes.pop_back();
  return nodes;
}

/// Takes the class's bit from those of NodesBelow that hold no such operation any more, and takes them out of the
/// chains. Children come before their parents in the list, so a parent whose children all lost the bit loses it too.
void OPTree::Unmark(OPNode& top, const std::vector<OPNode*>& below, LiveClass live_class) {
  const auto drop_idle_children = [live_class](OPNode& node) {
    if (node.branch_ == nullptr) return false;
    OPNode** link = &node.branch_->first_live[live_class];
    while (*link != nullptr) {
      OPNode* const child = *link;
      OPNode*& next = child->next_live_[live_class];
      if (child->MayHold(live_class)) {
        link = &next;
      } else {
        *link = std::exchange(next, nullptr);
      }
    }
    return node.branch_->first_live[live_class] != nullptr;
  };
  const auto holds = [live_class](const std::shared_ptr<OP>& op) {
    return live_class == kMovable ? IsMovable(op->op) : IsCancellable(op->op);
  };
  for (OPNode* const node : below) {
    const bool has_live_child = drop_idle_children(*node);
    const bool has_live_op = std::any_of(node->ops.begin(), node->ops.end(), holds);
    if (!has_live_child && !has_live_op) node->live_ &= ~(1u << live_class);
  }
  (void)drop_idle_children(top);
}

}  // namespace ferrox::fileindex
