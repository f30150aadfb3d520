#include "fileindex/optree/optree.h"

#include <syslog.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>

#include "common/log.h"
#include "common/new_class.h"
#include "fileindex/optree/op_arena.h"
#include "fileindex/optree/op_branch.h"
#include "fileindex/queue/event_line_reader.h"
#include "fileindex/queue/event_scan.h"
#include "fileindex/util.h"

namespace ferrox::fileindex {

namespace {

constexpr int kDebugLevel = 7;
/// Longer texts than this are cut in logs.
constexpr size_t kLoggedTextMaxBytes = 2048;

const Json::Value kNullData;

/// The text for a log line: a long one is cut, so that what follows it is not, and a NUL does not end it.
std::string ForLog(std::string_view text) {
  std::string out;
  for (const char c : text.substr(0, kLoggedTextMaxBytes)) {
    if (c == '\0') {
      out += "\\x00";
    } else {
      out += c;
    }
  }
  if (text.size() > kLoggedTextMaxBytes) out += "...";
  return out;
}

void LogBadLine(const char* function, int line, std::string_view event_raw, const Error& error) {
  const std::string text = ForLog(event_raw);
  const std::string reason = ForLog(error.what());
  const std::string module = ModuleName(__FILE__);
  if (errno != 0) {
    Log(LOG_ERR, "%s:%d (%d, %u) (%s) InsertEvent failed, event_raw=%s, code=%d, reason=%s [err: %m]", module.c_str(),
        line, getpid(), geteuid(), function, text.c_str(), error.Code(), reason.c_str());
  } else {
    Log(LOG_ERR, "%s:%d (%d, %u) (%s) InsertEvent failed, event_raw=%s, code=%d, reason=%s", module.c_str(), line,
        getpid(), geteuid(), function, text.c_str(), error.Code(), reason.c_str());
  }
}

/// How many bytes the two begin with alike. Paths of neighbouring lines share most of theirs, hence by words.
size_t CommonPrefixLength(std::string_view a, std::string_view b) {
  const size_t most = std::min(a.size(), b.size());
  size_t same = 0;
  uint64_t word_a = 0;
  uint64_t word_b = 0;
  for (; same + sizeof(word_a) <= most; same += sizeof(word_a)) {
    memcpy(&word_a, a.data() + same, sizeof(word_a));
    memcpy(&word_b, b.data() + same, sizeof(word_b));
    if (word_a != word_b) break;
  }
  while (same < most && a[same] == b[same]) ++same;
  return same;
}

}  // namespace

OPTree::OPTree(const std::string& path) : queue_path(path), root(newClass<OPNode>(nullptr, "")), arena_(new OPArena) {
  try {
    BuildTree();
  } catch (...) {
    BreakCycles();
    throw;
  }
}

OPTree::~OPTree() { BreakCycles(); }

/// Parents and children, nodes and operations hold each other by shared pointers; without this nothing would ever be
/// freed. What a caller keeps beyond the tree needs the way up only, for its path: pointers down go, those up stay.
///
/// The walk has no stack and no recursion, since a queue may hold paths as deep as it likes. It is bound by memory, so
/// the sibling that comes next is fetched while its brother is taken apart.
void OPTree::BreakCycles() noexcept {
  spare_.reset();
  ops.clear();
  // The path down to where the walk is: each node gives up its last child until it has none.
  std::shared_ptr<OPNode> node = root;
  while (node != nullptr) {
    node->ops.clear();
    node->settled_ = 0;
    if (node->children.size() > 1) {
      const char* const next = reinterpret_cast<const char*>(node->children[node->children.size() - 2].get());
      for (size_t line = 0; line < sizeof(OPNode); line += 64) __builtin_prefetch(next + line);
    }
    if (node->children.empty()) {
      node->branch_.reset();
      node = node->parent;
      continue;
    }
    std::shared_ptr<OPNode> child = std::move(node->children.back());
    node->children.pop_back();
    node = std::move(child);
  }
  root.reset();
  arena_->Close();
}

/// A line that cannot be folded costs itself and nothing else. After a crash marker the others do not count.
void OPTree::BuildTree() {
  EventLineReader reader(queue_path);
  FERROX_FAIL_IF_AS(!reader.Valid(), "!input_stream", Error::kInternal, "Failed to open queue, reason=" + ErrnoText());
  std::string_view line;
  while (!crashed && reader.Next(line)) {
    if (log_level == kDebugLevel) {
      Log(LOG_DEBUG, "%s:%d Got event: %s", ModuleName(__FILE__).c_str(), __LINE__, ForLog(line).c_str());
    }
    errno = 0;
    try {
      InsertLine(line);
    } catch (const Error& error) {
      LogBadLine(__func__, __LINE__, line, error);
    }
  }
}

/// Lines of the plain form are folded where they lie in the reader's buffer; any other becomes an Event first.
void OPTree::InsertLine(std::string_view line) {
  EventFields fields;
  if (line.size() <= kQueueLineMaxBytes && ScanPlainEvent(line, fields)) {
    Insert(fields, kNullData);
  } else {
    InsertEvent(newClass<Event>(std::string(line)));
  }
}

void OPTree::InsertEvent(std::shared_ptr<Event> event) {
  Insert({event->event, event->is_dir, event->path, event->path_old}, event->data);
}

void OPTree::Insert(const EventFields& event, const Json::Value& data) {
  OPNode& node = FindNode(event.path);
  // No rule applies to cancelled operations and renames, and neither ever changes again: those at the front of the list
  // need not be visited by later events, or a file that is written and renamed all day would cost more each time. Only
  // now, before this event's own operation is in the list, is an entry at its front settled for good.
  while (node.settled_ < node.ops.size() &&
         (node.ops[node.settled_]->op == OP_NONE || node.ops[node.settled_]->op == OP_RENAME)) {
    ++node.settled_;
  }
  Dispatch(node, TakeSpareOP(node), event, data);
  if ((event.event & EVENT_QUEUE_CRASHED) != 0) crashed = true;
}

/// A new operation of the node. One that the event before did not queue serves again: of repeated writes to one file,
/// all but the first need none. "Not queued" shows in its use count, which nobody else changes meanwhile.
std::shared_ptr<OP> OPTree::TakeSpareOP(OPNode& node) {
  if (spare_ == nullptr || spare_.use_count() != 1) {
    spare_ =
        std::allocate_shared<OP>(OPAllocator<OP>(arena_), node.shared_from_this(), OP_NONE, std::string(), kNullData);
    return spare_;
  }
  if (spare_->node.get() != &node) spare_->node = node.shared_from_this();
  spare_->op = OP_NONE;
  spare_->path.clear();
  if (!spare_->data.isNull()) spare_->data = Json::Value();
  return spare_;
}

std::shared_ptr<OPNode> OPTree::GetNodeByPath(const std::string& path) { return FindNode(path).shared_from_this(); }

/// Walks down from the deepest node that the path shares with the one found last, making what is missing. The steps of
/// that walk are kept in trail_: `end` is where a step's component ends in the path, so that a step is shared when the
/// common beginning reaches to its end and a slash, or the end of the path, follows there.
OPNode& OPTree::FindNode(std::string_view path) {
  const size_t same = CommonPrefixLength(path, trail_path_);
  while (!trail_.empty() &&
         (trail_.back().end > same || (trail_.back().end < path.size() && path[trail_.back().end] != '/'))) {
    trail_.pop_back();
  }
  OPNode* node = trail_.empty() ? root.get() : trail_.back().node;
  size_t at = trail_.empty() ? 0 : trail_.back().end;
  bool is_normalized = !path.empty() && path.front() == '/';
  while (at < path.size()) {
    const size_t start = path[at] == '/' ? at + 1 : at;
    at = std::min(path.find('/', start), path.size());
    if (at == start) {
      is_normalized = false;
    } else {
      node = &node->ChildOf(path.substr(start, at - start), arena_);
      trail_.push_back({at, node});
    }
  }
  trail_path_ = path;
  if (!is_normalized) [[unlikely]] {
    trail_.clear();
    Fail({FERROX_SOURCE, __LINE__, "GetNodeByPath", "!is_normalized"}, errno, Error::kTreeInconsistent,
         "GetNodeByPath failed, path=" + std::string(path));
  }
  return *node;
}

/// Without recursion, as in BreakCycles. `fn` may add nodes; those added to a node that the walk has come to are passed
/// over, those below one that it has yet to reach are visited.
void OPTree::TraverseNodeDescendant(std::shared_ptr<OPNode> node,
                                    const std::function<void(std::shared_ptr<OPNode>)>& fn, bool skip_self) {
  struct Visit {
    std::shared_ptr<OPNode> node;
    size_t next;
    size_t count;  // of its children when the walk came to it: later ones are appended and not visited
  };
  std::vector<Visit> way;
  way.push_back({node, 0, node->children.size()});
  while (!way.empty()) {
    Visit& visit = way.back();
    if (visit.next < visit.count) {
      std::shared_ptr<OPNode> child = visit.node->children[visit.next++];
      const size_t count = child->children.size();
      way.push_back({std::move(child), 0, count});
      continue;
    }
    const std::shared_ptr<OPNode> done = std::move(visit.node);
    way.pop_back();
    if (!way.empty() || !skip_self) fn(done);
  }
}

/// By index, since `fn` may insert events, whose operations come at the end and are handed out as well.
int OPTree::ProcessOP(const std::function<void(std::shared_ptr<OP>)>& fn) {
  if (crashed) {
    Log(LOG_WARNING, "%s:%d Queue crashed: %s", ModuleName(__FILE__).c_str(), __LINE__, queue_path.c_str());
    fn(newClass<OP>(root, OP_FULL_REINDEX, "", Json::Value()));
    return 1;
  }
  for (size_t i = 0; i < ops.size(); ++i) {
    const std::shared_ptr<OP> op = ops[i];
    if (op->op != OP_NONE) fn(op);
  }
  return static_cast<int>(ops.size());
}

}  // namespace ferrox::fileindex
