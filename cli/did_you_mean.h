#pragma once

#include <string>
#include <vector>

/// What somebody may have meant who typed a name that does not exist.
namespace ferrox::cli {

/// The candidates that are spelt most like what was typed, whatever the case, three at most: a few letters left out,
/// added, changed or swapped, more of them in longer names. A candidate that begins with what was typed, or of whose
/// words it is one, counts as one letter away.
std::vector<std::string> Alike(const std::string& typed, const std::vector<std::string>& candidates);

/// ". Did you mean: a or b?" for the end of a sentence that says what does not exist; "" where nothing is alike.
std::string DidYouMean(const std::string& typed, const std::vector<std::string>& candidates);

}  // namespace ferrox::cli
