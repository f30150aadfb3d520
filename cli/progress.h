#pragma once

#include <chrono>
#include <string>

#include <json/value.h>

namespace ferrox::cli {

/// Shows how a share's comparison goes: a bar on a terminal, a line now and then elsewhere. On standard error, so that
/// it never mixes with results.
class Progress {
 public:
  explicit Progress(bool on_terminal);
  ~Progress();
  Progress(const Progress&) = delete;
  Progress& operator=(const Progress&) = delete;

  /// `share` is one share's entry of the index daemon's status.
  void Show(const Json::Value& share);
  /// Takes the bar away.
  void Clear();

  /// "[####    ] 48%  12,345 of 25,600 files, 2,300 a second, 6 s left"; the bar is left out when `bar_width` is 0.
  static std::string Text(const Json::Value& share, size_t bar_width);

 private:
  bool on_terminal_;
  bool shown_ = false;
  std::chrono::steady_clock::time_point next_line_;
};

}  // namespace ferrox::cli
