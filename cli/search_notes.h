#pragma once

#include <string>

#include <json/value.h>

/// What a search tells beside its hits: how its words were taken, and what a hit's score is made of. Words come from
/// files and queries and are escaped.
namespace ferrox::cli {

/// Before the hits: words that were searched for in another spelling or find none by themselves, and how many files
/// have all words. Nothing where the query was searched for as it is, and all that was found has all words.
void PrintHowSearched(const Json::Value& result);

/// The title of a hit's text; "" when there is none, or when it is the file's name again.
std::string TitleToShow(const Json::Value& hit, const std::string& path);

/// What the score of a hit is made of, for --explain: a line for each part.
void PrintExplanation(const Json::Value& hit);

/// One sentence on standard error: that nothing was found, unless the search was `complete` in what was searched; in
/// which other spellings words were searched for, too; and which words of the index are spelt alike.
void PrintNothingFound(const Json::Value& result, bool complete);

}  // namespace ferrox::cli
