#pragma once

#include <string>
#include <vector>

#include "services/kovaelasticd/commands/merged_search.h"
#include "services/kovaelasticd/query/query.h"

namespace ferrox::engine {

/// A query as it was read, and what is told about that.
struct AskedQuery {
  QueryNode tree;
  std::vector<std::string> hints;
};

/// Makes full paths of the paths in "path:" conditions that begin with a share's name, "/photo/2024", as people see
/// them; one that is a full path, too, means both. `indices` are of shares that whoever asks may know of. Of paths that
/// lie in none of these, the hints tell.
void ResolveSharePaths(AskedQuery& query, const std::vector<AskedIndex>& indices);

}  // namespace ferrox::engine
