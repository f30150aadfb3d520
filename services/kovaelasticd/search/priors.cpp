#include "services/kovaelasticd/search/priors.h"

#include <algorithm>
#include <iterator>
#include <string_view>
#include <utility>

#include "common/clock.h"
#include "services/kovaelasticd/store/folder_tree.h"
#include "services/kovaelasticd/text/schema.h"
#include "services/kovaelasticd/text/words.h"

namespace ferrox::engine {

namespace {

constexpr int32_t kByExtension = -1;

/// Files that a word of a query names: those of a kind, or with an extension. Words are folded; lists have blanks.
struct NamedFiles {
  std::string_view words;
  int32_t kind;
  std::string_view extensions;
};
constexpr NamedFiles kNamedFiles[] = {
    {"photo photos picture pictures image images screenshot screenshots"
     " foto fotos bild bilder bildschirmfoto bildschirmfotos",
     kImage, ""},
    {"song songs music audio recording recordings podcast podcasts"
     " lied lieder musik aufnahme aufnahmen",
     kAudio, ""},
    {"video videos film films movie movies filme", kVideo, ""},
    {"folder folders directory directories ordner verzeichnis verzeichnisse", kFolder, ""},
    {"spreadsheet spreadsheets excel tabelle tabellen", kByExtension, "xlsx xls xlsm ods csv"},
    {"presentation presentations slides powerpoint prasentation praesentation folien", kByExtension, "pptx ppt odp"},
    {"letter letters word brief briefe", kByExtension, "docx doc odt rtf pdf"},
    {"invoice invoices receipt receipts contract contracts"
     " rechnung rechnungen beleg belege quittung quittungen vertrag vertrage vertraege",
     kByExtension, "pdf docx odt"},
    {"manual manuals handbook guide handbuch handbucher handbuecher anleitung anleitungen bedienungsanleitung",
     kByExtension, "pdf epub html htm chm man 1 2 3 4 5 6 7 8"},
    {"ebook ebooks book books buch bucher buecher", kByExtension, "epub mobi azw3 fb2 djvu pdf"},
    {"mail mails email emails", kByExtension, "eml msg mbox"},
    {"archive archives archiv", kByExtension, "zip tar gz tgz xz bz2 zst 7z rar"},
    {"script scripts skript skripte", kByExtension, "sh py pl rb js ps1 bat"},
    {"calendar appointment kalender termin termine", kByExtension, "ics"},
    {"contact contacts kontakt kontakte", kByExtension, "vcf"},
    {"drawing drawings zeichnung zeichnungen", kByExtension, "svg dwg dxf odg vsdx"},
    {"subtitle subtitles untertitel", kByExtension, "srt vtt sub ass"},
    {"jpg jpeg", kByExtension, "jpg jpeg"},
    {"tif tiff", kByExtension, "tif tiff"},
    {"htm html", kByExtension, "htm html"},
};

/// Folders whose files are seldom meant, by their whole names in small letters, or by a word of them.
struct SpecialFolders {
  const char* what;
  double PriorConstants::*value;
  std::string_view names;
  std::string_view words;
};
constexpr SpecialFolders kSpecialFolders[] = {
    {"in a folder of backups", &PriorConstants::in_backup, "",
     "backup backups bak sicherung sicherungen sicherungskopie sicherungskopien datensicherung snapshot snapshots"},
    {"in a folder of build results", &PriorConstants::in_build, "build _build builds dist obj", ""},
    {"in a cache", &PriorConstants::in_cache, "cache caches .cache tmp temp .thumbnails thumbnails __pycache__", ""},
    {"in the trash", &PriorConstants::in_trash, "#recycle $recycle.bin recycled recycler lost+found",
     "trash trashes papierkorb trashbin"},
    {"among installed packages", &PriorConstants::in_packages,
     "node_modules bower_components site-packages dist-packages .npm .cargo .m2 .gradle .venv venv", ""},
    {"in a version control's folder", &PriorConstants::in_versions, ".git .svn .hg .bzr cvs", ""},
};
constexpr SpecialFolders kHiddenFolders = {"in a hidden folder", &PriorConstants::in_hidden, "", ""};

/// Calls `take` with each word of a list until it returns true; whether it did.
template <typename Take>
bool AnyListed(std::string_view list, Take take) {
  while (!list.empty()) {
    const size_t end = std::min(list.find(' '), list.size());
    if (take(list.substr(0, end))) return true;
    list.remove_prefix(std::min(end + 1, list.size()));
  }
  return false;
}

bool IsListed(std::string_view list, std::string_view wanted) {
  return AnyListed(list, [wanted](std::string_view listed) { return listed == wanted; });
}

}  // namespace

/// Ages count from the end of the day, so that pages that are asked for one after the other agree.
Priors::Priors(StoreReader& reader, const QueryNode& query)
    : reader_(reader), now_((Clock::Get().Now() / kDaySec + 1) * kDaySec) {
  CollectWords(query);
  for (const std::string& word : words_) AskFor(word);
  ways_[FolderTree::kTop] = ways_[FolderTree::kNone] = ways_[FolderTree::kGone] = Way();
}

void Priors::CollectWords(const QueryNode& node) {
  if (node.type == QueryNode::Type::kNot) return;
  if (node.type == QueryNode::Type::kText || node.type == QueryNode::Type::kName) {
    for (std::string& word : SplitQueryText(node.text, false).words) words_.insert(std::move(word));
  }
  for (const QueryNode& child : node.children) CollectWords(child);
}

void Priors::AskFor(const std::string& word) {
  if (word.size() > 1) extensions_.insert(word);
  for (const NamedFiles& files : kNamedFiles) {
    if (!IsListed(files.words, word)) continue;
    if (files.kind != kByExtension) kinds_.insert(files.kind);
    (void)AnyListed(files.extensions, [this](std::string_view extension) {
      extensions_.emplace(extension);
      return false;
    });
  }
}

double Priors::Recency(int64_t mtime) const {
  const double age_days = std::max(0.0, static_cast<double>(now_ - mtime) / kDaySec);
  return constants_.recent / (1 + age_days / constants_.recent_half_days);
}

/// What a folder is by its own name. One that the query asks for by a word of its name is as good as any.
void Priors::Judge(const std::string& name, Way& way) const {
  std::vector<std::string> words;
  for (WordScanner scanner(name); scanner.Next();) words.emplace_back(scanner.Word());
  if (std::any_of(words.begin(), words.end(), [this](const std::string& word) { return words_.contains(word); }))
    return;
  std::string small = name.substr(0, name.size() - 1);  // without the "/"
  for (char& c : small) c = c >= 'A' && c <= 'Z' ? static_cast<char>(c | 0x20) : c;
  const auto lower = [&](const SpecialFolders& special) {
    const double value = constants_.*special.value;
    if (value < way.value) way = {way.depth, value, special.what};
  };
  for (const SpecialFolders& special : kSpecialFolders) {
    const bool has_word =
        std::any_of(words.begin(), words.end(), [&](const std::string& word) { return IsListed(special.words, word); });
    if (has_word || IsListed(special.names, small)) lower(special);
  }
  if (small.starts_with('.')) lower(kHiddenFolders);
}

Priors::Way Priors::WayTo(int64_t folder) {
  constexpr size_t kDeepest = 1 << 12;  // deeper than any path; only a damaged file has a circle
  std::vector<std::pair<int64_t, std::string>> below;
  auto known = ways_.find(folder);
  for (; known == ways_.end() && below.size() < kDeepest; known = ways_.find(folder)) {
    auto [above, name] = reader_.tree.PlaceOf(folder);
    below.emplace_back(folder, std::move(name));
    folder = above;
  }
  Way way = known == ways_.end() ? Way() : known->second;
  for (; !below.empty(); below.pop_back()) {
    ++way.depth;
    Judge(below.back().second, way);
    ways_[below.back().first] = way;
  }
  return way;
}

double Priors::Of(const RankedRow& row, std::vector<ScorePart>* parts) {
  double sum = 0;
  const auto add = [&](const char* what, double adds) {
    sum += adds;
    if (parts != nullptr && adds != 0) parts->push_back({what, "", adds});
  };
  add("recent", Recency(row.mtime));
  const Way way = WayTo(row.folder);
  add("few folders above", constants_.high / (1 + way.depth / constants_.high_half_depth));
  if (way.what != nullptr) add(way.what, way.value);
  if (kinds_.contains(row.kind) || extensions_.contains(row.ext)) add("of the kind asked for", constants_.asked_for);
  return sum;
}

}  // namespace ferrox::engine
