#pragma once

#include <string_view>

#include <json/value.h>

#include "services/kovaelasticd/text/stems.h"

namespace ferrox::engine {

/// The language whose stems the words of a document have. What the document itself says of its language counts
/// ("KOVAMDLanguages": codes such as "de" or "en-US", or English names), else a sample of its text. Without a text it
/// is English, which most names that machines and programs give are in. kNone: a language that is not stemmed, or
/// cannot be told. Takes some 30 us.
Language LanguageOf(const Json::Value& document, std::string_view text);

}  // namespace ferrox::engine
