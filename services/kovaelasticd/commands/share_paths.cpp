#include "services/kovaelasticd/commands/share_paths.h"

#include <utility>

#include "base/path.h"

namespace ferrox::engine {

namespace {

QueryNode PathNode(std::string path) {
  QueryNode node(QueryNode::Type::kPath);
  node.text = std::move(path);
  return node;
}

void ResolveNode(QueryNode& query, const std::vector<ShareNotePtr>& shares, std::vector<std::string>& hints) {
  for (QueryNode& child : query.children) ResolveNode(child, shares, hints);
  if (query.type != QueryNode::Type::kPath || query.text.empty()) return;
  bool is_full = false;
  QueryNode meant(QueryNode::Type::kOr);
  for (const ShareNotePtr& share : shares) {
    is_full = is_full || base::IsAtOrBelow(query.text, share->root) || base::IsAtOrBelow(share->root, query.text);
    const std::string as_seen = "/" + share->share;
    if (!base::IsAtOrBelow(query.text, as_seen)) continue;
    meant.children.push_back(PathNode(share->root + query.text.substr(as_seen.size())));
  }
  if (meant.children.empty()) {
    if (!is_full && hints.size() < kQueryHintsMax) {
      hints.push_back("no share that is searched holds " + query.text +
                      "; a path begins with a share's name, as in path:/photo/2024, or is a full path");
    }
    return;
  }
  if (is_full) meant.children.push_back(PathNode(query.text));
  if (meant.children.size() > 1) {
    query = std::move(meant);
  } else {
    query.text = std::move(meant.children.front().text);
  }
}

}  // namespace

void ResolveSharePaths(AskedQuery& query, const std::vector<AskedIndex>& indices) {
  std::vector<ShareNotePtr> shares;
  for (const AskedIndex& index : indices) {
    if (index.open.share != nullptr) shares.push_back(index.open.share);
  }
  if (!shares.empty()) ResolveNode(query.tree, shares, query.hints);
}

}  // namespace ferrox::engine
