#include "services/kovaelasticd/query/number_run.h"

#include <algorithm>

#include "base/text.h"

namespace ferrox::engine {

namespace {

bool IsDigit(char c) { return c >= '0' && c <= '9'; }
bool IsLetter(char c) { return (base::LowerAscii(c) >= 'a' && base::LowerAscii(c) <= 'z') || (c & 0x80) != 0; }

bool HasDigit(const QueryNode& node) {
  const bool plain = node.type == QueryNode::Type::kText && !node.phrase && !node.prefix && !node.pattern;
  return plain && std::any_of(node.text.begin(), node.text.end(), &IsDigit);
}

}  // namespace

void NumberRun::Add(std::vector<QueryNode>& siblings, size_t begin, size_t end) {
  if (!HasDigit(siblings.back())) return End();
  if (words_ == 0 || query_[begin] == '+') {
    words_ = 1;
    begin_ = begin;
    return;
  }
  ++words_;
  QueryNode& first = siblings[siblings.size() - words_];
  first.joined = query_.substr(begin_, end - begin_);
  first.joined_words = words_;
  for (QueryNode* word : {&first, &siblings.back()}) {
    if (std::none_of(word->text.begin(), word->text.end(), &IsLetter)) word->required = false;
  }
}

}  // namespace ferrox::engine
