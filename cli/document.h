#pragma once

#include <string>

#include <json/value.h>

/// How a document of the index is shown. Its fields are named in wire/fields.h; those that begin with "_KOVA" are the
/// service's own.
namespace ferrox::cli {

/// In which way a document is shown, and what it has.
enum class Fields {
  kAll,     ///< also the service's own: whether the content was read, by what, and why not
  kPublic,  ///< what ordinary users get
};

/// Everything that the index has of the file, the fields under short names, and the beginning of `text`. `unwanted`:
/// why its content was not wanted, where that is known.
void PrintDocument(const Json::Value& document, const std::string& text, Fields fields,
                   const std::string& unwanted = {});

/// "KOVAMDTitle" is "Title", "KOVAStateOrProvince" "StateOrProvince".
std::string FriendlyName(const std::string& field);
/// A field's value in one line, escaped: seconds as a date, a list joined.
std::string FieldText(const std::string& field, const Json::Value& value);

/// A text as it is; on a terminal made safe for it.
void PrintWholeText(const std::string& text);

}  // namespace ferrox::cli
