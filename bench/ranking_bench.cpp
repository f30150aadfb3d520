// How good the order of hits is, by queries whose answers are known, and how the constants of ranking change it:
//
//   ranking_bench INDEX.sqlite FOLDER QUERIES.tsv [--tune KIND=WEIGHT,... [--seconds N]] [NAME=VALUE ...]
//
// A line of QUERIES ends with three columns: the kind, the query, and the paths below FOLDER that answer it, separated
// by "|". Prints for each kind MRR@10, the share of queries answered among the first ten, nDCG@10, the share without
// any hit, and times. NAME=VALUE changes a member of RankingConstants. --tune searches better values: from random
// starts, one constant at a time, for the mean of the kinds' MRR (nDCG for a kind written KIND:ndcg), weighted.

#include <time.h>

#include <algorithm>
#include <chrono>
#include <cmath>
#include <cstdio>
#include <fstream>
#include <iostream>
#include <map>
#include <memory>
#include <random>
#include <set>
#include <sstream>
#include <string>
#include <vector>

#include "services/kovaelasticd/query/query.h"
#include "services/kovaelasticd/search/ranking_constants.h"
#include "services/kovaelasticd/search/sqlite_search.h"

namespace {

using ferrox::engine::RankingConstants;

struct KnownQuery {
  std::string kind;
  std::string text;
  std::set<std::string> answers;
};

struct Figures {
  double queries = 0, mrr = 0, found = 0, ndcg = 0, none = 0;
  std::vector<double> ms;
};

/// The constants that can be given by name, with the step by which tuning multiplies them.
struct Named {
  const char* name;
  double RankingConstants::*member;
};
constexpr Named kNamed[] = {
    {"k1", &RankingConstants::k1},
    {"b", &RankingConstants::b},
    {"in_name", &RankingConstants::in_name},
    {"in_most_of_name", &RankingConstants::in_most_of_name},
    {"in_whole_name", &RankingConstants::in_whole_name},
    {"in_title", &RankingConstants::in_title},
    {"in_fields", &RankingConstants::in_fields},
    {"in_name_part", &RankingConstants::in_name_part},
    {"in_folder", &RankingConstants::in_folder},
    {"stem", &RankingConstants::stem},
    {"spelling", &RankingConstants::spelling},
    {"own_word", &RankingConstants::own_word},
    {"repaired_most", &RankingConstants::repaired_most},
    {"near_text", &RankingConstants::near_text},
    {"near_title", &RankingConstants::near_title},
    {"near_half", &RankingConstants::near_half},
    {"function_word", &RankingConstants::function_word},
    {"long_query", &RankingConstants::long_query},
    {"near_backwards", &RankingConstants::near_backwards},
};

std::vector<std::string> Split(const std::string& text, char by) {
  std::vector<std::string> parts;
  std::istringstream stream(text);
  for (std::string part; std::getline(stream, part, by);) parts.push_back(part);
  return parts;
}

std::vector<KnownQuery> ReadQueries(const std::string& path) {
  std::vector<KnownQuery> queries;
  std::ifstream file(path);
  for (std::string line; std::getline(file, line);) {
    const std::vector<std::string> columns = Split(line, '\t');
    if (columns.size() < 3 || columns.back() == "relevant") continue;
    const std::vector<std::string> answers = Split(columns.back(), '|');
    queries.push_back({columns[columns.size() - 3], columns[columns.size() - 2], {answers.begin(), answers.end()}});
  }
  return queries;
}

/// Times are those of the processor: others work on the machine.
double CpuMs() {
  timespec now{};
  (void)clock_gettime(CLOCK_THREAD_CPUTIME_ID, &now);
  return 1e3 * static_cast<double>(now.tv_sec) + 1e-6 * static_cast<double>(now.tv_nsec);
}

class Bench {
 public:
  Bench(const std::string& index, std::string folder, std::vector<KnownQuery> queries)
      : readers_(index), folder_(std::move(folder)), queries_(std::move(queries)) {
    if (folder_.empty() || folder_.back() != '/') folder_ += '/';
  }

  std::map<std::string, Figures> Run(const RankingConstants& constants) {
    std::map<std::string, Figures> figures;
    for (const KnownQuery& query : queries_) Ask(query, constants, figures[query.kind]);
    for (auto& [kind, of] : figures) {
      for (double* sum : {&of.mrr, &of.found, &of.ndcg, &of.none}) *sum /= of.queries;
      std::sort(of.ms.begin(), of.ms.end());
    }
    return figures;
  }

 private:
  void Ask(const KnownQuery& known, const RankingConstants& constants, Figures& figures) {
    const double start = CpuMs();
    const ferrox::engine::QueryNode query = ferrox::engine::ParseQuery(known.text, 1718000000);
    ferrox::engine::SearchRequest request;
    request.query = &query;
    request.limit = 10;
    request.snippet = false;
    std::unique_ptr<ferrox::engine::StoreReader> reader = readers_.Borrow();
    reader->database.Execute("BEGIN");
    reader->Refresh();
    const ferrox::engine::SearchReply reply = ferrox::engine::Searcher(*reader, request, constants).Run();
    reader->database.Execute("COMMIT");
    readers_.Return(std::move(reader));
    figures.ms.push_back(CpuMs() - start);
    Count(known, reply, figures);
  }

  void Count(const KnownQuery& known, const ferrox::engine::SearchReply& reply, Figures& figures) const {
    double ideal = 0;
    double gain = 0;
    size_t first = 0;
    for (size_t i = 0; i < std::min<size_t>(10, known.answers.size()); ++i) ideal += 1 / std::log2(i + 2.0);
    for (size_t i = 0; i < reply.hits.size(); ++i) {
      const std::string& path = reply.hits[i].path;
      if (path.rfind(folder_, 0) != 0 || known.answers.count(path.substr(folder_.size())) == 0) continue;
      if (first == 0) first = i + 1;
      gain += 1 / std::log2(i + 2.0);
    }
    figures.queries += 1;
    figures.mrr += first == 0 ? 0 : 1.0 / static_cast<double>(first);
    figures.found += first == 0 ? 0 : 1;
    figures.ndcg += gain / ideal;
    figures.none += reply.hits.empty() ? 1 : 0;
  }

  ferrox::engine::ReaderPool readers_;
  std::string folder_;
  const std::vector<KnownQuery> queries_;
};

void Print(const std::map<std::string, Figures>& figures) {
  std::vector<double> all;
  for (const auto& [kind, of] : figures) {
    const auto at = [&](double share) { return of.ms[static_cast<size_t>(share * static_cast<double>(of.ms.size()))]; };
    std::printf("%-10s n %4.0f  MRR@10 %.3f  found@10 %.3f  nDCG@10 %.3f  no hit %.2f  p50 %.1f ms  p99 %.1f ms\n",
                kind.c_str(), of.queries, of.mrr, of.found, of.ndcg, of.none, at(.5), at(.99));
    all.insert(all.end(), of.ms.begin(), of.ms.end());
  }
  std::sort(all.begin(), all.end());
  std::printf("all: p99 %.1f ms, longest %.1f ms\n",
              all.empty() ? 0 : all[static_cast<size_t>(.99 * static_cast<double>(all.size()))],
              all.empty() ? 0 : all.back());
  std::fflush(stdout);
}

using Goal = std::vector<std::pair<std::string, double>>;

double Reached(const std::map<std::string, Figures>& figures, const Goal& goal) {
  double sum = 0;
  for (const auto& [wanted, weight] : goal) {
    const std::string kind = wanted.substr(0, wanted.find(':'));
    const auto of = figures.find(kind);
    if (of != figures.end()) sum += weight * (wanted == kind ? of->second.mrr : of->second.ndcg);
  }
  return sum;
}

void PrintConstants(const RankingConstants& constants, double reached) {
  std::printf("%.4f ", reached);
  for (const Named& named : kNamed) std::printf(" %s=%.3g", named.name, constants.*named.member);
  std::printf("\n");
  std::fflush(stdout);
}

/// Climbs from `start` until no single step helps or the time is over.
double Climb(Bench& bench, RankingConstants& best, const Goal& goal, std::chrono::steady_clock::time_point until) {
  double reached = Reached(bench.Run(best), goal);
  for (double step : {1.5, 1.2}) {
    for (bool better = true; better;) {
      better = false;
      for (const Named& named : kNamed) {
        for (const double factor : {step, 1 / step}) {
          if (std::chrono::steady_clock::now() > until) return reached;
          RankingConstants tried = best;
          tried.*named.member = named.member == &RankingConstants::b ? std::min(1.0, tried.*named.member * factor)
                                                                     : tried.*named.member * factor;
          const double now = Reached(bench.Run(tried), goal);
          if (now <= reached + 1e-4) continue;
          reached = now;
          best = tried;
          better = true;
          PrintConstants(best, reached);
          break;
        }
      }
    }
  }
  return reached;
}

void Tune(Bench& bench, const RankingConstants& from, const Goal& goal, std::chrono::seconds time) {
  const auto until = std::chrono::steady_clock::now() + time;
  std::mt19937 random(1);
  std::uniform_real_distribution<double> spread(-0.7, 0.7);
  RankingConstants best = from;
  double best_reached = -1;
  for (RankingConstants start = from; std::chrono::steady_clock::now() < until;) {
    const double reached = Climb(bench, start, goal, until);
    std::printf("%s: ", reached > best_reached ? "best so far" : "no better");
    PrintConstants(start, reached);
    if (reached > best_reached) best = start;
    best_reached = std::max(best_reached, reached);
    start = from;
    for (const Named& named : kNamed) start.*named.member *= std::exp(spread(random));
    start.b = std::min(1.0, start.b);
  }
  Print(bench.Run(best));
}

}  // namespace

int main(int argc, char** argv) {
  if (argc < 4) {
    std::cerr << "usage: ranking_bench INDEX.sqlite FOLDER QUERIES.tsv [--tune KIND=WEIGHT,...] [--seconds N] "
                 "[NAME=VALUE ...]\n";
    return 2;
  }
  RankingConstants constants;
  Goal goal;
  std::chrono::seconds time(600);
  for (int i = 4; i < argc; ++i) {
    const std::string argument = argv[i];
    if (argument == "--tune" && i + 1 < argc) {
      for (const std::string& part : Split(argv[++i], ',')) {
        goal.emplace_back(part.substr(0, part.find('=')), std::stod(part.substr(part.find('=') + 1)));
      }
    } else if (argument == "--seconds" && i + 1 < argc) {
      time = std::chrono::seconds(std::stoi(argv[++i]));
    } else {
      const auto named = std::find_if(std::begin(kNamed), std::end(kNamed), [&](const Named& one) {
        return argument.rfind(one.name + std::string("="), 0) == 0;
      });
      if (named == std::end(kNamed)) {
        std::cerr << "unknown: " << argument << "\n";
        return 2;
      }
      constants.*named->member = std::stod(argument.substr(argument.find('=') + 1));
    }
  }
  Bench bench(argv[1], argv[2], ReadQueries(argv[3]));
  Print(bench.Run(constants));
  if (!goal.empty()) Tune(bench, constants, goal, time);
  return 0;
}
