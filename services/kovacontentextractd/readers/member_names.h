#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "services/kovacontentextractd/readers/reader.h"

namespace ferrox::extract {

/// The names of an archive's members, a line each. Those that are not UTF-8 are in the encoding of the system that made
/// the archive, which nothing in it tells: it is guessed from all of them together.
class MemberNames {
 public:
  explicit MemberNames(Findings& findings) : findings_(findings) {}
  /// `otherwise` is the name in UTF-8 where no encoding can be guessed; without it, it is read as Western.
  /// @return false when no more are wanted.
  bool Add(std::string_view name, std::string_view otherwise = {});
  /// Gives them all to the findings.
  void Finish();

 private:
  struct Name {
    std::string bytes;      ///< as the archive has it, until DecodeOld
    std::string otherwise;  ///< see Add; "" for a name in UTF-8
  };
  void DecodeOld();

  Findings& findings_;
  std::vector<Name> names_;
  size_t bytes_ = 0;  ///< of all names
};

/// The encoding of names that are not UTF-8, each ending a line; empty when they look Western.
std::string EncodingOfNames(std::string_view names);

}  // namespace ferrox::extract
