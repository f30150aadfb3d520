#pragma once

#include <cstdint>
#include <optional>
#include <string_view>

namespace ferrox::engine {

/// What "kind:" calls by a name: a kind of file as the index has it, or some extensions of one.
struct NamedKind {
  std::optional<int32_t> kind;  ///< docs.kind
  std::string_view extensions;  ///< with blanks between them, where there is no `kind`
};

/// The kind of a name, in any case, singular or plural; nothing when it is none.
std::optional<NamedKind> FindKind(std::string_view name);

/// The names that are told to people.
inline constexpr char kKnownKinds[] =
    "document, text, spreadsheet, presentation, pdf, ebook, mail, source, archive, audio, video, image, folder and "
    "other";

}  // namespace ferrox::engine
