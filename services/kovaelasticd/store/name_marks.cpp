#include "services/kovaelasticd/store/name_marks.h"

#include <chrono>

#include "common/error.h"

namespace ferrox::engine {

namespace {

constexpr std::chrono::milliseconds kLongestTurn{50};

}  // namespace

void NameMarks::Load() {
  Statement row = database_.Prepare("SELECT rules, complete FROM name_rules");
  const bool there = row.Step();
  rules_ = there ? row.Text(0) : std::string_view();
  next_ = there && row.Int(1) == 0 ? 0 : kNone;
  places_.SetNameRules(base::NameRules(rules_));
}

void NameMarks::Save() {
  database_.Prepare("INSERT OR REPLACE INTO name_rules(id, rules, complete) VALUES(1, ?1, ?2)")
      .Bind(1, std::string_view(rules_))
      .Bind(2, int64_t{next_ == kNone ? 1 : 0})
      .Run();
}

/// That they are not complete is noted with the first places that are marked.
void NameMarks::Turn(const std::string& rules, int64_t version) {
  if (rules_ != rules) {
    rules_ = rules;
    next_ = 0;
    places_.SetNameRules(base::NameRules(rules_));
    Save();
  }
  if (next_ == kNone) return;
  const auto end = std::chrono::steady_clock::now() + kLongestTurn;
  while (next_ != kNone && std::chrono::steady_clock::now() < end) next_ = places_.MarkPart(next_, version);
  if (next_ == kNone) Save();
}

void NameMarks::Require(Database& database, const std::string& rules) {
  Statement row = database.Prepare("SELECT 1 FROM name_rules WHERE complete = 1 AND rules = ?1");
  if (row.Bind(1, std::string_view(rules)).Step()) return;
  throw Error(Error::kEngineIndexPreparing, "the names of its files are still being compared with the share's rules");
}

}  // namespace ferrox::engine
