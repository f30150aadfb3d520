#pragma once

#include <chrono>
#include <string>

#include <json/value.h>

#include "cli/command.h"
#include "cli/left_out.h"

/// What searches have in common, whoever asks: the options of "search", and how hits are shown.
namespace ferrox::cli {

/// Said when --fresh shows nothing.
inline constexpr char kWithoutFresh[] =
    "Without --fresh, or with --partial, the search shows what has been indexed so far.";

/// The members of the engine's "search" that follow from words and options; which shares are searched is not among
/// them. @throws UsageError, so that wrong usage is found before anything waits.
Json::Value SearchMembers(const Arguments& arguments);

/// How long --fresh is to wait. @throws UsageError.
std::chrono::seconds FreshWait(const Arguments& arguments);

/// What a search has come to.
struct Found {
  Json::Value result;       ///< the engine's reply; its "left_out" is replaced
  LeftOut left_out;         ///< the shares that are missing from it
  bool searched = true;     ///< false: no share was
  bool stale = false;       ///< some shares are not known to hold all that was changed before
  std::string not_noticed;  ///< why what has changed since may be missing; "" when it is not
};

/// The reply where no share is left to ask about.
Json::Value NothingSearched();

/// Hits on standard output, from `offset` on; on standard error what may be missing from them. @return the exit code,
/// which says so, too, unless --partial makes do with what there is.
int PrintFound(const Arguments& arguments, Found found);

}  // namespace ferrox::cli
