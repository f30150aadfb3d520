#include "services/fileindexd/linked_documents.h"

#include <sys/stat.h>

#include <cstddef>
#include <cstdint>

#include "services/fileindexd/file_presence.h"
#include "services/fileindexd/queue_tail.h"

namespace ferrox::indexd {

namespace {

constexpr unsigned kPage = 1000;

}  // namespace

void LinkedDocuments::RefreshChangedFiles() {
  if (context_.changed_files.size() > kChangedNumbersMax) return;  // the whole share is compared
  for (const uint64_t file : context_.changed_files) {
    RefreshPages([&](const std::string& after, unsigned limit) { return context_.index.OfFile(file, after, limit); },
                 [this](const IndexedEntry& entry) { return IsCurrent(entry); });
  }
}

void LinkedDocuments::RefreshSuspects() {
  RefreshPages([this](const std::string& after, unsigned limit) { return context_.index.Suspects(after, limit); },
               [](const IndexedEntry&) { return false; });
}

bool LinkedDocuments::IsCurrent(const IndexedEntry& entry) const {
  struct stat status = {};
  return PresenceOf(entry.path, status) == Presence::kThere && writer_.IsCurrent(entry, status);
}

/// Goes through the list once: what cannot be refreshed stays on it.
void LinkedDocuments::RefreshPages(const ListPage& list, const std::function<bool(const IndexedEntry&)>& skip) {
  std::string after;
  for (size_t found = kPage; found == kPage;) {
    context_.share.interruption.Check();
    const std::vector<IndexedEntry> page = list(after, kPage);
    for (const IndexedEntry& entry : page) {
      if (!skip(entry)) access_.Add(entry.path);
    }
    access_.Finish();
    commits_.CommitIfDue();
    found = page.size();
    if (found > 0) after = page.back().path;
  }
}

}  // namespace ferrox::indexd
