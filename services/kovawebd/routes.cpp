#include "services/kovawebd/routes.h"

#include "services/kovawebd/search.h"

namespace ferrox::web {

namespace {

using Kind = Parameter::Kind;

const Parameter kShare = {
    .name = "share", .description = "In this share only; may be given several times", .repeated = true, .high = 255};

Route SearchRoute() {
  return {"GET",
          "/api/v1/search",
          "search",
          "Files that the user may read, the best first, one page of them.",
          Route::For::kUser,
          {{.name = "q", .description = "The query, in the language of docs/formats/engine.md", .required = true},
           kShare,
           {.name = "sort",
            .description = "The order, by default relevance",
            .values = {"relevance", "date", "name", "size"}},
           {.name = "order", .description = "By default asc for name, else desc", .values = {"asc", "desc"}},
           {.name = "all_words", .kind = Kind::kYesNo, .description = "Every word is required"},
           {.name = "limit", .kind = Kind::kNumber, .description = "Hits of a page, by default 20", .high = 2000},
           {.name = "cursor",
            .kind = Kind::kNumber,
            .description = "Of the answer before: where this page begins",
            .low = 0,
            .high = 100000},
           {.name = "fresh",
            .kind = Kind::kNumber,
            .description = "Seconds to wait until all that was changed before the request can be found; else 504",
            .low = 0,
            .high = 60}},
          {},
          &Search};
}

}  // namespace

std::vector<Route> SearchRoutes() {
  return {SearchRoute(),
          {"GET",
           "/api/v1/complete",
           "complete",
           "What the last word may become.",
           Route::For::kUser,
           {{.name = "q", .description = "What has been typed", .required = true},
            kShare,
            {.name = "limit", .kind = Kind::kNumber, .description = "By default 10", .high = 100}},
           {},
           &Complete},
          {"GET",
           "/api/v1/file",
           "file",
           "What the index holds of one file.",
           Route::For::kUser,
           {{.name = "path",
             .kind = Kind::kFileName,
             .description = "Its full path, or one that begins with its share's name",
             .required = true},
            {.name = "text", .kind = Kind::kYesNo, .description = "Its text, too"}},
           {},
           &ShowFile},
          {"GET",
           "/api/v1/shares",
           "shares",
           "The shares that the user can enter, and how they are.",
           Route::For::kUser,
           {},
           {},
           &ListShares}};
}

}  // namespace ferrox::web
