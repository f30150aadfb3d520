#pragma once

#include <cstdint>
#include <functional>
#include <iosfwd>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include <json/value.h>

#include "common/export.h"
#include "fileindex/queue/event.h"

/// The operations that queue lines (fileindex/queue/event.h) ask for, and the tree that folds the events of each path
/// into as few operations as give the same end state: a file that was written to ten times is indexed once.
///
/// The tree has one node per path component. A node holds the operations that were queued for its path; OPTree::ops
/// holds those of all nodes in the order in which they were queued, which is the order in which they are handed out. An
/// event either adds an operation behind both lists or changes a pending one in its place. An operation that came to
/// nothing stays in its lists as OP_NONE: removing it would cost a search.
namespace ferrox::fileindex {

class OPArena;
class OPTree;
struct EventFields;
struct OP;
struct OPBranch;
struct OPNode;

/// What the index daemon is to do. The numbers are fixed: they appear in logs, and kRules is indexed by them.
enum FileIndexOP : int32_t {
  OP_NONE = 0,          ///< cancelled, by a later operation that covers it: never handed out
  OP_DELETE = 1,        ///< remove the document of this path
  OP_UPSERT = 2,        ///< index content and metadata
  OP_ATTR = 3,          ///< refresh the metadata alone
  OP_UPDATE_CFG = 4,    ///< the folder's configuration changed; `data` holds the category flags
  OP_RENAME = 5,        ///< the node is the new place of what was at `path`
  OP_REINDEX = 6,       ///< reindex the path and all below it
  OP_FULL_REINDEX = 7,  ///< the queue lost events: reindex everything
};

/// One pending operation. It is shared by the node, the tree's list and callers that keep it; the tree changes it while
/// events are inserted, and not once they are handed out.
struct FERROX_EXPORT OP {
  OP(std::shared_ptr<OPNode> node, FileIndexOP op, const std::string& path, const Json::Value& data);

  /// Adds the category flags of another configuration change: each of "document", "audio", "video" and "photo" stays on
  /// once it is. What is not an object has no flags.
  void MergeData(const Json::Value& data);

  std::shared_ptr<OPNode> node;  ///< what it applies to; GetPath() tells the full path, after renames the new one
  FileIndexOP op;
  std::string path;  ///< of OP_RENAME, the old full path
  Json::Value data;  ///< of OP_UPDATE_CFG, the flags
};

/// One component of a path. `children` and `ops` are for reading; the tree alone changes them. A node is found from its
/// parent by a hash table, so that a folder of a million files costs no more per event than one of ten.
struct FERROX_EXPORT OPNode : std::enable_shared_from_this<OPNode> {
  OPNode(std::shared_ptr<OPNode> parent, std::string name);
  OPNode(const OPNode&) = delete;
  OPNode& operator=(const OPNode&) = delete;
  ~OPNode();

  /// The child of exactly that name, made when missing.
  std::shared_ptr<OPNode> GetChild(const std::string& name);
  /// The full path; "" for the root.
  std::string GetPath() const;
  /// Calls `fn` for a copy of the node's operations, in order, passing over those cancelled by then.
  void TraverseOP(const std::function<void(std::shared_ptr<OP>)>& fn);

  std::string name;
  std::shared_ptr<OPNode> parent;                 ///< null at the root
  std::vector<std::shared_ptr<OPNode>> children;  ///< in order of creation
  std::vector<std::shared_ptr<OP>> ops;           ///< in order of insertion, cancelled ones included

 private:
  friend class OPTree;

  OPNode& ChildOf(std::string_view child_name, OPArena* arena);
  bool MayHold(int live_class) const { return (live_ & (1u << live_class)) != 0; }

  std::unique_ptr<OPBranch> branch_;  ///< the children's hash table, once there are any
  OPNode* next_live_[2] = {};         ///< per LiveClass: the next of the parent's children with that bit of live_
  uint32_t position_ = 0;             ///< among the parent's children
  uint32_t settled_ : 30 = 0;  ///< as many entries at the front of `ops` are cancelled or renames: no rule applies
  uint32_t live_ : 2 = 0;      ///< a bit per LiveClass: an operation of that class may be pending here or below
};

/// Reads one queue file whole and folds its events. Belongs to one caller and takes no locks. Nodes and operations that
/// a caller keeps outlive the tree and still tell their paths.
///
/// Folding, in short (the table is in optree_rules.cpp): a new operation meets each pending one of its node, oldest
/// first. It is dropped where a pending one does as much or can be changed to, and queued otherwise; a file that was
/// deleted is only brought back by a create. A reindex of a folder cancels what is pending below it. A rename takes
/// what is pending below the old name along to the new one, but deletes, which concern documents of the old name, and
/// cancels what the file that it replaces had pending; it is never folded itself, since what follows depends on it.
///
/// Renames and idle nodes: a rename gives each node below the old name a counterpart below the new one, also where
/// nothing is pending, since the order in which siblings were made decides the order of later walks. That visits every
/// node, so that a thousand renames of a folder of a million files would take hours. Hence all renames of a tree
/// together visit at most kIdleNodesMax nodes; once they are used up, a rename visits only what has something pending.
/// The operations and their order stay the same, except after renames of a folder into itself or onto its own ancestor,
/// which no kernel makes: which of the operations moves first, and so where it ends, may then differ.
class FERROX_EXPORT OPTree {
 public:
  /// Builds the tree of the queue at `queue_path`. A bad line is logged and skipped; nothing after a crash marker is
  /// read. @throws Error kInternal "Failed to open queue, reason=...".
  explicit OPTree(const std::string& queue_path);
  OPTree(const OPTree&) = delete;
  OPTree& operator=(const OPTree&) = delete;
  ~OPTree();

  /// Called by the constructor.
  void BuildTree();
  /// The node of a normalised absolute path, made when missing.
  /// @throws Error kTreeInconsistent for any other path; the nodes of its components are then made all the same.
  std::shared_ptr<OPNode> GetNodeByPath(const std::string& path);
  /// Folds one event, as a line of the queue. @throws Error kTreeInconsistent as GetNodeByPath; of a rename whose old
  /// path is not normalised, what the path had pending may be cancelled by then.
  void InsertEvent(std::shared_ptr<Event> event);
  /// Calls `fn` for every node below `node`, descendants first, siblings in order of creation, then, unless
  /// `skip_self`, for `node`.
  void TraverseNodeDescendant(std::shared_ptr<OPNode> node, const std::function<void(std::shared_ptr<OPNode>)>& fn,
                              bool skip_self);
  /// Hands out the pending operations in the order in which they were first queued, or, after a crash marker, one
  /// OP_FULL_REINDEX on the root. @return the number of operations ever queued, cancelled ones included; 1 after a
  /// crash.
  int ProcessOP(const std::function<void(std::shared_ptr<OP>)>& fn);

  /// One event's bit each, folded into what `node` has pending; `op` is the event's new operation, whose kind they set.
  /// HandleUpdateCfg reads its `data`, HandleRename its `path`, the old one.
  void HandleCreate(std::shared_ptr<OPNode> node, std::shared_ptr<OP> op);
  void HandleModify(std::shared_ptr<OPNode> node, std::shared_ptr<OP> op);
  void HandleAttr(std::shared_ptr<OPNode> node, std::shared_ptr<OP> op);
  void HandleDelete(std::shared_ptr<OPNode> node, std::shared_ptr<OP> op);
  void HandleReindex(std::shared_ptr<OPNode> node, std::shared_ptr<OP> op);
  void HandleUpdateCfg(std::shared_ptr<OPNode> node, std::shared_ptr<OP> op);
  void HandleRename(std::shared_ptr<OPNode> node, std::shared_ptr<OP> op);

  bool crashed = false;                  ///< a crash marker was read
  std::string queue_path;                ///< as given to the constructor
  std::shared_ptr<OPNode> root;          ///< above all paths; its name and its path are ""
  std::vector<std::shared_ptr<OP>> ops;  ///< every operation ever queued, in order

 private:
  /// Nodes that renames may visit though nothing is pending there, over the life of the tree; see above.
  static constexpr size_t kIdleNodesMax = 10000;

  /// Classes of pending operations by who looks for them below a folder: a reindex for what it cancels, a rename for
  /// what it moves. A node's bit of a class is set whenever it or a node below it holds such an operation, and stays
  /// set until the next walk finds it idle; each node with the bit is in its parent's chain of that class. So a
  /// folder's event visits only what may concern it, not the idle nodes beside.
  enum LiveClass : int { kCancellable = 0, kMovable = 1, kEveryNode };
  enum Handler : int;
  struct Step {
    size_t end;  ///< where the component ends in trail_path_
    OPNode* node;
  };

  void InsertLine(std::string_view line);
  void Insert(const EventFields& event, const Json::Value& data);
  void Dispatch(OPNode& node, const std::shared_ptr<OP>& op, const EventFields& event, const Json::Value& data);
  OPNode& FindNode(std::string_view path);
  std::shared_ptr<OP> TakeSpareOP(OPNode& node);
  void BreakCycles() noexcept;

  void Fold(OPNode& node, Handler handler, const std::shared_ptr<OP>& op);
  void Reindex(OPNode& node, const std::shared_ptr<OP>& op);
  void Rename(OPNode& node, const std::shared_ptr<OP>& op);
  void MoveBelow(OPNode& old_node, const std::string& old_path, const std::string& new_path);
  bool MayVisitIdle(OPNode& old_node);
  void MoveAlong(OPNode& node, const std::string& old_path, const std::string& new_path, bool with_idle);
  void Queue(OPNode& node, const std::shared_ptr<OP>& op);

  static FileIndexOP MoveOwn(OPNode& from, OPNode& to);
  static void Take(OPNode& to, const std::vector<std::shared_ptr<OP>>& moved);
  static void Mark(OPNode& node, FileIndexOP op);
  static std::vector<OPNode*> NodesBelow(OPNode& top, LiveClass live_class);
  static void Unmark(OPNode& top, const std::vector<OPNode*>& below, LiveClass live_class);

  OPArena* arena_;             ///< deletes itself when the tree and the last object from it are gone
  std::shared_ptr<OP> spare_;  ///< made for an event that needed none in the end
  std::string trail_path_;     ///< the last path that was found,
  std::vector<Step> trail_;    ///< and the nodes on the way to it: the next path mostly shares its beginning
  size_t idle_nodes_left_ = kIdleNodesMax;
};

/// Text forms for logs: "[05] /old -> /new", "[04] /a, data={...}", "[02] /a"; a node is its name and its operations,
/// one a line.
FERROX_EXPORT std::ostream& operator<<(std::ostream& stream, std::shared_ptr<OP> op);
FERROX_EXPORT std::ostream& operator<<(std::ostream& stream, std::shared_ptr<OPNode> node);

}  // namespace ferrox::fileindex
