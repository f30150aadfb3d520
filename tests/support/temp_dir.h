#pragma once

#include <string>

namespace ferrox::test {

/// A fresh folder below the system's temporary folder, removed with all that is in it.
class TempDir {
 public:
  TempDir();
  /// The same below `parent`.
  explicit TempDir(const std::string& parent);
  TempDir(const TempDir&) = delete;
  TempDir& operator=(const TempDir&) = delete;
  ~TempDir();

  const std::string& Path() const { return path_; }
  /// The path of `name` in the folder.
  std::string operator/(const std::string& name) const { return path_ + "/" + name; }

 private:
  std::string path_;
};

/// The root of the instance in which this test program runs: a fresh folder, set as FERROX_ROOT before main.
const std::string& TestRoot();

void WriteFile(const std::string& path, const std::string& content);
std::string ReadFile(const std::string& path);

}  // namespace ferrox::test
