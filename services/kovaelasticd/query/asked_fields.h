#pragma once

#include <string>
#include <vector>

#include "services/kovaelasticd/query/query.h"

namespace ferrox::engine {

/// A condition of a query on fields of documents: the name that people give them ("camera"), and which they are.
struct AskedFields {
  std::string name;
  std::vector<std::string> fields;
};

/// Those of a query that ask for what a document says of itself, each once, in their order, so that a hit can show the
/// values that it was found by. Names, kinds, paths, sizes and dates are not among them: a hit shows these anyway; nor
/// is what must not be there.
std::vector<AskedFields> FieldsAskedFor(const QueryNode& query);

}  // namespace ferrox::engine
