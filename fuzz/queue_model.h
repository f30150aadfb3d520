#pragma once

#include <cstdio>
#include <functional>
#include <sstream>
#include <stdexcept>
#include <string>
#include <vector>

#include "common/json_util.h"
#include "fileindex/optree/optree.h"

namespace ferrox::test {

/// The operation tree as plain lists: every rule written out, every walk over everything. Slow and obvious.
class ListModel {
 public:
  using Event = fileindex::Event;

  /// Applies the event; one with a path that no tree can hold changes no operation.
  void Insert(const Event& event) {
    try {
      InsertEvent(event);
    } catch (const std::invalid_argument&) {
    }
  }

  /// The operations handed out, one a line, and the returned count.
  std::string Text() const {
    if (crashed) return "[07] \n1";
    std::ostringstream text;
    for (const int op : queued_) {
      if (ops_[op].kind == 0) continue;
      char number[8];
      (void)snprintf(number, sizeof(number), "[%02d] ", ops_[op].kind);
      text << number << (ops_[op].kind == 5 ? ops_[op].path + " -> " : "") << nodes_[ops_[op].node].path;
      if (ops_[op].kind == 4) text << ", data=" << toString(ops_[op].data);
      text << "\n";
    }
    text << queued_.size();
    return text.str();
  }

  bool crashed = false;
  size_t walked = 0;  // nodes that renames passed so far

 private:
  struct Node {
    std::string path;
    std::vector<int> children;
    std::vector<int> ops;
  };
  struct Op {
    int node;
    int kind = 0;
    std::string path = {};
    Json::Value data = {};
  };

  int GetNode(const std::string& path) {
    int node = 0;
    std::istringstream parts(path);
    for (std::string part; std::getline(parts, part, '/');) {
      if (part.empty()) continue;
      node = Child(node, nodes_[node].path + "/" + part);
      if (nodes_[node].path == path) return node;
    }
    throw std::invalid_argument(path);
  }

  int Child(int node, const std::string& path) {
    for (const int child : nodes_[node].children) {
      if (nodes_[child].path == path) return child;
    }
    nodes_.push_back({path, {}, {}});
    nodes_[node].children.push_back(static_cast<int>(nodes_.size()) - 1);
    return nodes_[node].children.back();
  }

  void InsertEvent(const Event& event) {
    const int node = GetNode(event.path);
    ops_.push_back({node});
    const int op = static_cast<int>(ops_.size()) - 1;
    if (event.event & 0x40) event.is_dir ? Reindex(node, op) : Fold(node, op, 'c', 2);
    if (event.event & 0x4) Fold(node, op, 'a', 3);
    if (event.event & 0x2) Fold(node, op, 'm', 2);
    if (event.event & 0x80) event.is_dir ? Reindex(node, op) : Fold(node, op, 'd', 1);
    if (event.event & 0x100) {
      ops_[op].path = event.path_old;
      Rename(node, op);
    }
    if (event.event & 0x10000) Reindex(node, op);
    if (event.event & 0x20000) {
      ops_[op].data = event.data;
      Fold(node, op, 'u', 4);
    }
    if (event.event & 0x200) crashed = true;
  }

  void Fold(int node, int op, char handler, int kind) {
    ops_[op].kind = kind;
    const std::vector<int> copy = nodes_[node].ops;
    for (const int old : copy) {
      if (ops_[old].kind == 0) continue;
      if (FoldOne(ops_[old], ops_[op], handler)) ops_[op].kind = 0;
    }
    if (ops_[op].kind != 0) Store(node, op);
  }

  /// Whether the new operation is cancelled by the old one.
  static bool FoldOne(Op& old, const Op& op, char handler) {
    if (old.kind == 5) return false;
    if (handler == 'd' && (old.kind == 4 || old.kind == 6)) return false;
    if (handler == 'c' && (old.kind == 1 || old.kind == 3)) old.kind = 2;
    if (handler == 'm' && old.kind == 3) old.kind = 2;
    if (handler == 'd' && (old.kind == 2 || old.kind == 3)) old.kind = 1;
    if (handler == 'r' && (old.kind == 2 || old.kind == 3 || old.kind == 4)) old.kind = 6;
    if (handler == 'u' && old.kind == 4) {
      for (const char* key : {"document", "audio", "video", "photo"}) {
        bool on = false;
        GetJsonValue(on, op.data, key, false);
        old.data[key] = on || old.data[key] == Json::Value(true);
      }
    }
    if (handler == 'u' && (old.kind == 2 || old.kind == 3)) {
      old.kind = 4;
      old.data = op.data;
    }
    return true;
  }

  void Store(int node, int op) {
    queued_.push_back(op);
    nodes_[node].ops.push_back(op);
  }

  void Below(int node, const std::function<void(int)>& fn) {
    const std::vector<int> children = nodes_[node].children;
    for (const int child : children) {
      Below(child, fn);
      fn(child);
    }
  }

  void Reindex(int node, int op) {
    Fold(node, op, 'r', 6);
    Below(node, [this](int below) {
      for (const int old : nodes_[below].ops) ops_[old].kind = ops_[old].kind == 5 ? 5 : 0;
    });
  }

  void Rename(int node, int op) {
    const std::string from = ops_[op].path;
    const std::string to = nodes_[node].path;
    const int old_node = GetNode(from);
    ops_.push_back({node});
    const int carried = static_cast<int>(ops_.size()) - 1;
    ops_[op].kind = 5;
    for (const int old : nodes_[node].ops) {
      if (ops_[old].kind >= 1 && ops_[old].kind <= 3) ops_[old].kind = 0;
    }
    const std::vector<int> copy = nodes_[old_node].ops;
    for (const int old : copy) {
      if (ops_[old].kind == 0) continue;
      if (ops_[old].kind == 2 || ops_[old].kind == 3 || ops_[old].kind == 6) {
        ops_[carried].kind = ops_[old].kind;
        ops_[old].kind = 0;
      }
      Move(old, old_node, node);
    }
    std::vector<int> listed;
    const bool is_inside = (to + "/").rfind(from + "/", 0) == 0;
    Below(old_node, [&](int below) { is_inside ? listed.push_back(below) : MoveAlong(below, from, to); });
    for (const int below : listed) MoveAlong(below, from, to);
    Store(node, op);
    if (ops_[carried].kind != 0) Store(node, carried);
  }

  void MoveAlong(int node, const std::string& from, const std::string& to) {
    ++walked;
    const int target = GetNode(to + nodes_[node].path.substr(from.size()));
    const std::vector<int> copy = nodes_[node].ops;
    for (const int op : copy) {
      if (ops_[op].kind >= 2) Move(op, node, target);
    }
  }

  void Move(int op, int from, int to) {
    nodes_[to].ops.push_back(op);
    std::vector<int>& source = nodes_[from].ops;
    for (size_t i = 0; i < source.size(); ++i) {
      if (source[i] != op) continue;
      source.erase(source.begin() + static_cast<std::ptrdiff_t>(i));
      break;
    }
    ops_[op].node = to;
  }

  std::vector<Node> nodes_ = {{"", {}, {}}};
  std::vector<Op> ops_;
  std::vector<int> queued_;
};

/// What a tree hands out, in the form of ListModel::Text.
inline std::string TextOf(fileindex::OPTree& tree) {
  std::ostringstream text;
  const int count = tree.ProcessOP([&text](std::shared_ptr<fileindex::OP> op) { text << op << "\n"; });
  text << count;
  return text.str();
}

}  // namespace ferrox::test
