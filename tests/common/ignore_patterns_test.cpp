// Catches patterns that choose other files than gitignore's would, as git itself answers.
#include "base/ignore_patterns.h"

#include <algorithm>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <random>
#include <set>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "tests/support/temp_dir.h"

namespace ferrox::test {
namespace {

using base::IgnorePatterns;

IgnorePatterns Read(const std::string& text) {
  IgnorePatterns patterns;
  for (size_t at = 0; at < text.size();) {
    const size_t end = std::min(text.find('\n', at), text.size());
    (void)patterns.Add(text.substr(at, end - at), 1);
    at = end + 1;
  }
  return patterns;
}

/// The path, and the folders above it: a "/" at the end makes it one.
bool IsChosen(const IgnorePatterns& patterns, std::string path) {
  const bool is_folder = path.ends_with('/');
  if (is_folder) path.pop_back();
  IgnorePatterns::State state = patterns.Begin();
  for (size_t at = 0;;) {
    const size_t end = path.find('/', at);
    const std::string name = path.substr(at, end - at);
    const bool last = end == std::string::npos;
    const int match = patterns.Match(state, name, !last || is_folder);
    if (match != IgnorePatterns::kNone && !patterns.TakesBack(match)) return true;
    if (last) return false;
    state = patterns.Enter(state, name);
    at = end + 1;
  }
}

struct Case {
  std::string patterns;
  std::vector<std::string> chosen;
  std::vector<std::string> kept;
};

const std::vector<Case>& Cases() {
  static const std::vector<Case> cases = {
      {"a.txt", {"a.txt", "d/a.txt"}, {"A.txt", "a.txt2"}},
      {"/a.txt\nd/b", {"a.txt", "d/b"}, {"d/a.txt", "e/d/b"}},
      {"build/", {"build/", "build/x", "d/build/"}, {"build", "d/build"}},
      {"*.log\n!keep.log", {"a.log", "d/b.log"}, {"keep.log", "d/keep.log"}},
      {"d/\n!d/x", {"d/", "d/x"}, {}},
      {"d/*\n!d/x", {"d/y", "d/y2/"}, {"d/", "d/x"}},
      {"a/**/b", {"a/b", "a/c/b", "a/c/d/b"}, {"b", "x/a/b"}},
      {"**/t\ns/**", {"t", "x/y/t", "s/q", "s/r/q"}, {"s/", "tt"}},
      {"**", {"anything", "d/"}, {}},
      {"# no\n\\#yes\n\\!no\n  \n", {"#yes", "!no"}, {"# no", "no", "  "}},
      {"end  \nkept\\ ", {"end", "kept "}, {"kept", "end  "}},
      {"[a-c]?[!x]\n[]-]z", {"ayb", "]z", "-z"}, {"dyb", "ayx", "ay"}},
      {"[[:digit:]]x\n[open\n\\", {"1x"}, {"ax", "[open", "\\"}},
      {"*.tar.gz\n~$*", {"a.tar.gz", ".tar.gz", "~$letter.docx"}, {"a.gz", "letter~$"}},
      {"*a*b*c", {"abc", "xaybzc", "aabbcc"}, {"acb", "abcd"}},
      {"foo**bar\nx/foo**/y", {"foobar", "foo_bar", "x/foo1/y"}, {"x/foo/z/y"}},
  };
  return cases;
}

TEST(IgnorePatternsTest, ChooseWhatGitignoreChooses) {
  for (const Case& each : Cases()) {
    const IgnorePatterns patterns = Read(each.patterns);
    for (const std::string& path : each.chosen) EXPECT_TRUE(IsChosen(patterns, path)) << each.patterns << ": " << path;
    for (const std::string& path : each.kept) EXPECT_FALSE(IsChosen(patterns, path)) << each.patterns << ": " << path;
  }
}

/// Patterns of few bytes, so that they match often.
std::string SomePatterns(std::mt19937& random) {
  constexpr const char* kPieces[] = {"a",    "b",   "ab", "*",  "**",  "/",  "?", "[ab]",
                                     "[!a]", "\\a", "!",  "a/", "**/", "/b", "."};
  std::string text;
  for (unsigned line = 1 + random() % 4; line > 0; --line) {
    for (unsigned piece = 1 + random() % 4; piece > 0; --piece) {
      const std::string next = kPieces[random() % std::size(kPieces)];
      if (!text.ends_with('/') || next[0] != '/') text += next;  // what "//" means, git itself hardly knows
    }
    text += "\n";
  }
  return text;
}

/// Git is asked once, of a repository with a folder for each set of patterns.
TEST(IgnorePatternsTest, AgreeWithGit) {
  const TempDir dir;
  const std::string git = "cd '" + dir.Path() + "' && GIT_CONFIG_NOSYSTEM=1 HOME=/nonexistent git ";
  if (system((git + "init -q . 2>/dev/null").c_str()) != 0) GTEST_SKIP() << "git is not there";
  const std::vector<std::string> paths = {"a",    "b/",    "ab/",    "b/a/", "b/b", "b/a/ab",
                                          "ab/a", "ab/b/", "ab/b/a", "x",    "a.b"};
  std::mt19937 random(20);
  std::vector<std::string> sets;
  std::ofstream asked(dir / "asked");
  for (int i = 0; i < 120; ++i) {
    sets.push_back(SomePatterns(random));
    const std::string below = "c" + std::to_string(i);
    for (const std::string& path : paths) {
      const std::string full = dir / (below + "/" + path);
      if (full.ends_with('/')) {
        std::filesystem::create_directories(full);
      } else {
        std::filesystem::create_directories(std::filesystem::path(full).parent_path());
        std::ofstream(full).flush();
      }
      asked << below << "/" << (path.ends_with('/') ? path.substr(0, path.size() - 1) : path) << "\n";
    }
    std::ofstream(dir / (below + "/.gitignore")) << sets.back();
  }
  asked.close();
  (void)system((git + "check-ignore --no-index --stdin <asked >answered").c_str());
  std::set<std::string> chosen;
  std::ifstream answered(dir / "answered");
  for (std::string line; std::getline(answered, line);) chosen.insert(line);
  ASSERT_FALSE(chosen.empty());
  for (size_t i = 0; i < sets.size(); ++i) {
    const IgnorePatterns patterns = Read(sets[i]);
    for (const std::string& path : paths) {
      const std::string bare = path.ends_with('/') ? path.substr(0, path.size() - 1) : path;
      EXPECT_EQ(chosen.count("c" + std::to_string(i) + "/" + bare) != 0, IsChosen(patterns, path)) << sets[i] << path;
    }
  }
}

}  // namespace
}  // namespace ferrox::test
