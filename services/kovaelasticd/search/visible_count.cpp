#include "services/kovaelasticd/search/visible_count.h"

#include "services/kovaelasticd/search/term_hits.h"
#include "services/kovaelasticd/store/fts.h"

namespace ferrox::engine {

int64_t CountVisible(Database& database, const Visible& visible, const std::string& word, size_t& hits) {
  HitCollector found(0, visible);
  const std::string phrase = PhraseExpression({word}, false);
  Collect(database, "content_fts", phrase, false, found);
  Collect(database, "meta_fts", "{name title} : " + phrase, false, found);
  hits += found.Seen();
  return found.Set().Count();
}

bool AnyVisible(Database& database, const Visible& visible, const WordForm& form) {
  TermCollector found(database, visible, 0);
  found.StopAfter(0);
  found.Collect(form);
  return found.HasStopped();
}

}  // namespace ferrox::engine
