#include <sys/stat.h>

#include <cstdint>
#include <stdexcept>
#include <string>
#include <utility>

#include <json/value.h>

#include <kova/content_extract.h>
#include <kova/content_type.h>

#include "base/file_stamp.h"
#include "platform/host/content/access_record.h"
#include "platform/host/content/extract_client.h"
#include "platform/host/content/facts.h"
#include "platform/host/content/programs.h"
#include "wire/fields.h"

namespace kova::content {

namespace {

namespace field = ferrox::fileindex::elastic;

/// So many times the content of a file is read whose rights change meanwhile.
constexpr int kReadsMax = 3;

/// Whether another file has taken the place of the one that was examined. There are file systems on which the numbers
/// of an open file are always others than those of its path.
bool IsReplaced(const std::string& path, const Extraction& extraction, const struct statx& examined) {
  struct stat now = {};
  return extraction.inode != 0 && extraction.inode != examined.stx_ino &&
         (lstat(path.c_str(), &now) != 0 || now.st_ino != examined.stx_ino);
}

/// @throws std::runtime_error when the file is no longer at the path: a document that calls it unreadable, or that has
/// the content of another, would be taken for true where it has gone; and when content cannot be read at present.
void AddContent(const std::string& path, const Facts& facts, Json::Value& document) {
  Extraction extraction = ExtractContent(path);
  if (extraction.gone) throw std::runtime_error(path + " is gone");
  if (IsReplaced(path, extraction, facts.info)) throw std::runtime_error(path + " is another file now");
  for (const auto& name : extraction.document.getMemberNames()) document[name] = std::move(extraction.document[name]);
}

bool WantsContent(const Json::Value& config) {
  return config.isObject() && config.isMember("need_meta") && config["need_meta"].isBool() &&
         config["need_meta"].asBool();
}

/// Makes the document of the file as it is now, with its content where that is wanted.
/// @return whether its rights were the same before the content was read and afterwards.
bool Parse(const std::string& path, bool wants_content, Facts& facts, Json::Value& document) {
  facts = AddFacts(path, document);
  const char* special = TypeByMode(facts.info.stx_mode);
  const char* type = special != nullptr ? special : TypeByExtension(facts.extension);
  if (type != nullptr) document[field::kKOVAMDContentType] = type;
  if (!wants_content || S_ISDIR(facts.info.stx_mode)) return true;
  document[field::k_KOVANeedMeta] = true;
  document[field::k_KOVAExtractVersion] = KOVA::CONTENT_EXTRACT::ExtractVersion(type != nullptr ? type : "");
  if (special != nullptr) {
    document[field::k_KOVAExtractError] = "not a regular file";
  } else if (facts.info.stx_size > 0 && (type == nullptr || FormatOf(type) != nullptr)) {
    AddContent(path, facts, document);
    return AccessRecord(path) == facts.access;
  }
  return true;
}

/// Says of the document of a name why it has no content, so that it is tried again: a stamp of no content is none that
/// the file has.
void MarkUnsettled(const Facts& facts, Json::Value& document) {
  document[field::k_KOVANeedMeta] = true;
  document[field::k_KOVAExtractVersion] = 0;
  document[field::k_KOVAExtractError] = "its rights kept changing while it was read";
  using base::FileStamp;
  const int64_t changed = FileStamp::Nanoseconds(facts.info.stx_ctime.tv_sec, facts.info.stx_ctime.tv_nsec);
  document[field::k_KOVAStamp] = FileStamp{0, 0, changed, facts.info.stx_ino}.Text();
}

}  // namespace

}  // namespace kova::content

namespace KOVA::CONTENT_EXTRACT {

void ParseFile(const std::string& path, const Json::Value& config, Json::Value& document) {
  using namespace kova::content;
  ClearExtractionProblem();
  Facts facts;
  for (int read = 0; read < kReadsMax; ++read) {
    if (Parse(path, WantsContent(config), facts, document)) return;
  }
  (void)Parse(path, false, facts, document);
  if (!S_ISDIR(facts.info.stx_mode)) MarkUnsettled(facts, document);
}

int ExtractVersion(const std::string& content_type) {
  using namespace kova::content;
  const Format* format = FormatOf(content_type);
  return format != nullptr && IsInstalled(format->program) ? format->version : 0;
}

}  // namespace KOVA::CONTENT_EXTRACT
