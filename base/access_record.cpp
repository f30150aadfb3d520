#include "base/access_record.h"

#include <charconv>
#include <cstdio>
#include <utility>

namespace base {

namespace {

constexpr uint16_t kModeMax = 07777;

/// The part of `text` before the first `end`, which is cut off together with it; all of it where there is none.
std::string_view Cut(std::string_view& text, char end) {
  const size_t at = text.find(end);
  const std::string_view part = text.substr(0, at);
  text.remove_prefix(at == std::string_view::npos ? text.size() : at + 1);
  return part;
}

template <typename Number>
bool ReadNumber(std::string_view text, int base, Number& number) {
  const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), number, base);
  return error == std::errc() && end == text.data() + text.size() && !text.empty();
}

std::optional<AclEntry> ParseEntry(std::string_view text) {
  AclEntry entry{AclEntry::Kind::kUser, 0, 0};
  const std::string_view who = Cut(text, '=');
  if (!ReadNumber(text, 8, entry.permissions) || entry.permissions > 7) return std::nullopt;
  if (who == "g") {
    entry.kind = AclEntry::Kind::kOwningGroup;
    return entry;
  }
  if (who.empty() || !ReadNumber(who.substr(1), 10, entry.id)) return std::nullopt;
  if (who.front() == 'g') entry.kind = AclEntry::Kind::kGroup;
  return who.front() == 'g' || who.front() == 'u' ? std::optional(entry) : std::nullopt;
}

}  // namespace

std::optional<std::vector<AclEntry>> ParseAcl(std::string_view text) {
  std::vector<AclEntry> acl;
  bool owning_group = false;
  while (!text.empty()) {
    const std::optional<AclEntry> entry = ParseEntry(Cut(text, ','));
    if (!entry.has_value() || (entry->kind == AclEntry::Kind::kGroup) != owning_group) return std::nullopt;
    owning_group = entry->kind != AclEntry::Kind::kUser;
    acl.push_back(*entry);
  }
  return owning_group ? std::optional(std::move(acl)) : std::nullopt;
}

std::string AclText(const std::vector<AclEntry>& acl) {
  std::string text;
  for (const AclEntry& entry : acl) {
    if (!text.empty()) text += ',';
    text += entry.kind == AclEntry::Kind::kUser ? 'u' : 'g';
    if (entry.kind != AclEntry::Kind::kOwningGroup) text += std::to_string(entry.id);
    text += '=';
    text += static_cast<char>('0' + entry.permissions);
  }
  return text;
}

std::optional<AccessRecord> ParseAccess(std::string_view text) {
  AccessRecord record;
  std::string_view rest = text;
  const bool numbers = ReadNumber(Cut(rest, ':'), 10, record.uid) && ReadNumber(Cut(rest, ':'), 10, record.gid) &&
                       ReadNumber(Cut(rest, ':'), 8, record.mode) && record.mode <= kModeMax;
  if (!numbers) return std::nullopt;
  if (!rest.empty()) {
    std::optional<std::vector<AclEntry>> acl = ParseAcl(rest);
    if (!acl.has_value()) return std::nullopt;
    record.acl = *std::move(acl);
  }
  // One record has one spelling: without leading zeros, and what else from_chars passes over.
  return AccessText(record) == text ? std::optional(std::move(record)) : std::nullopt;
}

std::string AccessText(const AccessRecord& record) {
  char mode[8];
  (void)snprintf(mode, sizeof(mode), "%04o", static_cast<unsigned>(record.mode));
  std::string text = std::to_string(record.uid) + ":" + std::to_string(record.gid) + ":" + mode;
  if (!record.acl.empty()) text += ":" + AclText(record.acl);
  return text;
}

}  // namespace base
