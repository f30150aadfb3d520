#pragma once

#include <string>
#include <utility>
#include <vector>

#include <json/value.h>

#include "services/kovacontentextractd/readers/reader.h"

namespace ferrox::extract::test {

/// What `reader` finds in a file of these bytes. The file lives in memory and has no path.
Json::Value Read(Reader reader, const std::string& bytes, const std::string& extension = {}, const Limits& limits = {});

/// Has `reader` read the sample cut off at 20 places and changed at random in so many ways (the seed is printed),
/// within the limits and in the time that honest files take.
void Abuse(Reader reader, const std::string& sample, const std::string& extension = {}, int changes = 300);

using Members = std::vector<std::pair<std::string, std::string>>;
/// A ZIP file with these members, packed.
std::string MakeZip(const Members& members);

/// Numbers as files hold them.
std::string Little(uint64_t value, int bytes);
std::string Big(uint64_t value, int bytes);

/// The member of a document as text, "" when there is none.
std::string Text(const Json::Value& document, const char* member = "KOVAMDTextContent");

}  // namespace ferrox::extract::test
