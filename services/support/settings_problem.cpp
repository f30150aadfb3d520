#include "services/support/settings_problem.h"

#include <json/value.h>

#include <kova/error.h>

#include "common/file_util.h"
#include "common/json_util.h"
#include "common/log.h"
#include "common/paths.h"
#include "common/subject_error.h"

namespace ferrox::services {

namespace {

std::string Named(const Json::Value& entry) {
  const Json::Value& path = entry["path"];
  return path.isString() ? " (" + path.asString() + ")" : "";
}

/// What of an entry the library would not take; empty when it takes all.
std::string EntryProblem(const Json::Value& entry) {
  if (!entry.isObject()) return " is no object";
  for (const char* key : {"path", "name", "document", "audio", "video", "photo"}) {
    const bool is_text = key == std::string("path") || key == std::string("name");
    if (!entry.isMember(key)) return Named(entry) + " lacks \"" + key + "\"";
    if (is_text && !isJsonType<std::string>(entry[key])) return Named(entry) + " has a \"" + key + "\" that is no text";
    if (!is_text && !isJsonType<bool>(entry[key])) {
      return Named(entry) + " has a \"" + key + "\" that is neither true nor false";
    }
  }
  return {};
}

std::string ListProblem(const std::string& path) {
  std::string text;
  Json::Value list;
  if (!IsFileExist(path)) return {};
  if (!ReadWholeFile(path, text)) return " cannot be read: " + ErrnoText();
  if (!fromString(list, text)) return " is not JSON";
  if (!IsJsonArray(list)) return " is not an array";
  for (Json::ArrayIndex i = 0; i < list.size(); ++i) {
    const std::string problem = EntryProblem(list[i]);
    if (!problem.empty()) return ": entry " + std::to_string(i + 1) + problem;
  }
  return {};
}

}  // namespace

std::string FoldersFileProblem() {
  const std::string path = InstancePath(kFileIndexFoldersCfgPath);
  const std::string problem = ListProblem(path);
  if (problem.empty()) return {};
  return "the list of indexed folders " + path + problem +
         "; correct the file, or move it away to start without indexed folders";
}

std::string Describe(const Error& error) {
  const std::string reason = error.what();
  const Subject subject = SubjectError::Of(error);
  const bool is_json = subject.kind == Subject::kJson;
  const bool is_of_shares = error.Code() == Error::kNoSuchShare || error.Code() == Error::kShareEnumFailed;
  std::string text = is_json ? subject.name : reason;
  if (error.Code() == Error::kLoadFailed || is_json) {
    const std::string problem = FoldersFileProblem();
    if (!problem.empty()) {
      text = problem;
    } else if (error.Code() == Error::kLoadFailed) {
      text += "; correct the file, or move it away to start without it";
    }
  } else if (is_of_shares && KLIBCErrGet() == KOVA_ERR_BAD_CONFIGURATION) {
    text = "the table of shares cannot be used; 'fileindexctl share list' says what is wrong with it";
  } else if (error.Code() == Error::kNoSuchShare) {
    text = "there is no share \"" + reason + "\"";
  }
  return text + " (" + std::to_string(error.Code()) + ")";
}

}  // namespace ferrox::services
