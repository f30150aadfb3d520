#pragma once

#include <chrono>
#include <string>

#include <json/value.h>

namespace ferrox::cli {

/// Shows how a share's comparison goes: a bar on a terminal, a line now and then elsewhere. On standard error, so that
/// it never mixes with results.
class Progress {
 public:
  /// `on_terminal`: standard error is one, so that a line can be replaced.
  explicit Progress(bool on_terminal);
  /// Leaves no bar behind, however the wait ends.
  ~Progress();
  Progress(const Progress&) = delete;
  Progress& operator=(const Progress&) = delete;

  /// `share` is one share's entry of the index daemon's status.
  void Show(const Json::Value& share);
  /// Takes the bar away.
  void Clear();

  /// What the share's worker does now, in one line. The percentage and the time left are given only once the daemon
  /// has counted the files: until then their total still grows.
  /// "[####    ] 48%  12,345 of 25,600 files, 2,300 a second, 6 s left"; the bar is left out when `bar_width` is 0.
  static std::string Text(const Json::Value& share, size_t bar_width);

 private:
  bool on_terminal_;
  bool shown_ = false;                               ///< a bar is on the screen
  std::chrono::steady_clock::time_point next_line_;  ///< not before then, where there is no terminal
};

}  // namespace ferrox::cli
