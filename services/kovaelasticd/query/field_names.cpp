#include "services/kovaelasticd/query/field_names.h"

#include "base/edit_distance.h"
#include "base/text.h"
#include "services/kovaelasticd/query/query_values.h"
#include "services/kovaelasticd/text/schema.h"
#include "wire/fields.h"

namespace ferrox::engine {

namespace {

namespace names = fileindex::elastic;

/// Shorter names are too often one letter away from another word.
constexpr size_t kMeantLettersMin = 4;

struct ConditionName {
  const char* name;
  ConditionType type;
};
constexpr ConditionName kConditionNames[] = {
    {"name", ConditionType::kName},     {"filename", ConditionType::kName}, {"kind", ConditionType::kKind},
    {"ext", ConditionType::kExt},       {"extension", ConditionType::kExt}, {"filetype", ConditionType::kExt},
    {"path", ConditionType::kPath},     {"in", ConditionType::kPath},       {"folder", ConditionType::kPath},
    {"dir", ConditionType::kPath},      {"size", ConditionType::kSize},     {"date", ConditionType::kDate},
    {"modified", ConditionType::kDate}, {"changed", ConditionType::kDate},  {"before", ConditionType::kBefore},
    {"after", ConditionType::kAfter},   {"since", ConditionType::kAfter},   {"type", ConditionType::kType},
    {"has", ConditionType::kHas},
};

/// A name that people give a field, and the fields that it looks into.
struct FriendlyName {
  const char* name;
  std::vector<std::string> fields;
};
const FriendlyName kFriendlyNames[] = {
    {"title", {names::kKOVAMDTitle, names::kKOVAMDHeadline}},
    {"author", {names::kKOVAMDAuthors, names::kKOVAMDCreator, names::kKOVAMDContributors, names::kKOVAMDComposer}},
    {"artist", {names::kKOVAMDAuthors, names::kKOVAMDComposer, names::kKOVAMDParticipants}},
    {"composer", {names::kKOVAMDComposer}},
    {"album", {names::kKOVAMDAlbum}},
    {"genre", {names::kKOVAMDMusicalGenre}},
    {"subject", {names::kKOVAMDTitle, names::kKOVAMDHeadline}},
    {"from", {names::kKOVAMDAuthors, names::kKOVAMDAuthorAddresses}},
    {"sender", {names::kKOVAMDAuthors, names::kKOVAMDAuthorAddresses}},
    {"to", {names::kKOVAMDRecipients, names::kKOVAMDRecipientAddresses}},
    {"person", {names::kKOVAMDPeopleDisplayName, names::kKOVAMDParticipants}},
    {"place", {names::kKOVAMDNamedLocation, names::kKOVAMDCity, names::kKOVAStateOrProvince, names::kKOVAMDCountry}},
    {"publisher", {names::kKOVAMDPublishers, names::kKOVAMDOrganizations}},
    {"copyright", {names::kKOVAMDCopyright, names::kKOVAMDRights}},
    {"program", {names::kKOVAMDEncodingApplications, names::kKOVAMDAudioEncodingApplication, names::kKOVAMDCreator}},
    {"codec", {names::kKOVAMDCodecs}},
    {"rating", {names::kKOVAMDStarRating}},
    {"type", {names::kKOVAMDContentType}},
    {"keyword", {names::kKOVAMDKeywords, names::k_KOVAMDUserTags}},
    {"tag", {names::kKOVAMDKeywords, names::k_KOVAMDUserTags}},
    {"tags", {names::kKOVAMDKeywords, names::k_KOVAMDUserTags}},
    {"comment", {names::kKOVAMDComment, names::kKOVAMDFinderComment}},
    {"description", {names::kKOVAMDDescription, names::kKOVAMDHeadline}},
    {"camera", {names::kKOVAMDAcquisitionMake, names::kKOVAMDAcquisitionModel}},
    {"language", {names::kKOVAMDLanguages}},
    {"owner", {names::kKOVAMDOwnerUserID}},
    {"group", {names::kKOVAMDOwnerGroupID}},
    {"content", {names::kKOVAMDTextContent}},
    {"text", {names::kKOVAMDTextContent}},
};

std::string LowerName(std::string_view name) { return base::LowerAscii(std::string(name)); }

}  // namespace

ConditionType ConditionTypeOf(std::string_view name) {
  if (name == field::kExtension) return ConditionType::kExt;
  if (name == field::kFsName || name == field::kSearchName || name == field::kDisplayName) return ConditionType::kName;
  const std::string lower = LowerName(name);
  for (const ConditionName& known : kConditionNames) {
    if (lower == known.name) return known.type;
  }
  return ConditionType::kNone;
}

std::vector<std::string> FriendlyFields(std::string_view name) {
  const std::string lower = LowerName(name);
  for (const FriendlyName& known : kFriendlyNames) {
    if (lower == known.name) return known.fields;
  }
  return {};
}

std::string NameOfFields(const std::vector<std::string>& fields) {
  for (const FriendlyName& known : kFriendlyNames) {
    if (known.fields == fields) return known.name;
  }
  for (const RangeField& known : RangeFields()) {
    if (known.fields == fields) return known.name;
  }
  return fields[0];
}

bool IsFullFieldName(std::string_view name) { return name.starts_with("KOVA") || name.starts_with("_KOVAMD"); }

bool TakesRange(std::string_view name) {
  const ConditionType type = ConditionTypeOf(name);
  return type == ConditionType::kSize || type == ConditionType::kDate || type == ConditionType::kBefore ||
         type == ConditionType::kAfter || FindRangeField(name) != nullptr;
}

bool IsFieldName(std::string_view name) {
  return ConditionTypeOf(name) != ConditionType::kNone || FindRangeField(name) != nullptr ||
         !FriendlyFields(name).empty() || IsFullFieldName(name);
}

std::string FieldMeantBy(std::string_view name) {
  if (name.size() < kMeantLettersMin) return {};
  base::EditDistance distances(name, 1);
  const auto meant = [&distances](std::string_view known) {
    return known.size() >= kMeantLettersMin && distances.DistanceOf(known) == 1;
  };
  for (const ConditionName& known : kConditionNames) {
    if (meant(known.name)) return known.name;
  }
  for (const FriendlyName& known : kFriendlyNames) {
    if (meant(known.name)) return known.name;
  }
  for (const RangeField& known : RangeFields()) {
    if (meant(known.name)) return known.name;
  }
  return {};
}

}  // namespace ferrox::engine
