#include "cli/progress.h"

#include <unistd.h>

#include <algorithm>
#include <cstdio>

#include "cli/escape.h"
#include "cli/format.h"
#include "cli/terminal.h"

namespace ferrox::cli {

namespace {

/// Between two lines in a log.
constexpr std::chrono::seconds kLineInterval(2);
/// In characters, without the brackets.
constexpr size_t kBarWidth = 24;

}  // namespace

Progress::Progress(bool on_terminal)
    : on_terminal_(on_terminal), next_line_(std::chrono::steady_clock::now() + kLineInterval) {}

Progress::~Progress() { Clear(); }

std::string Progress::Text(const Json::Value& share, size_t bar_width) {
  const std::string state = TextOf(share, "state");
  if (state != "indexing") return state + (TextOf(share, "detail").empty() ? "" : ": " + TextOf(share, "detail"));
  const Json::Value& comparison = share["comparison"];
  if (!BoolOf(comparison, "running")) {
    return Count(UintOf(share, "operations_done")) + " of " + Count(UintOf(share, "operations")) + " changes";
  }
  const uint64_t examined = UintOf(comparison, "examined");
  const double seconds = static_cast<double>(UintOf(comparison, "elapsed_ms")) / 1000;
  const double rate = seconds > 0 ? static_cast<double>(examined) / seconds : 0;
  const std::string speed = Count(static_cast<uint64_t>(rate)) + " a second";
  // Files that come while the comparison goes on are examined, but were not counted.
  const uint64_t total = std::max(UintOf(comparison, "estimate"), examined);
  if (!comparison["estimate_complete"].asBool() || total == 0) return Count(examined) + " files, " + speed;

  const double part = static_cast<double>(examined) / static_cast<double>(total);
  const auto filled = static_cast<size_t>(part * static_cast<double>(bar_width));
  std::string text;
  if (bar_width > 0) text = "[" + std::string(filled, '#') + std::string(bar_width - filled, ' ') + "] ";
  text += std::to_string(static_cast<int>(part * 100)) + "%  " + Count(examined) + " of " + Count(total) + " files, " +
          speed;
  if (rate > 0) text += ", " + Duration(static_cast<double>(total - examined) / rate) + " left";
  return text;
}

/// Cut to the width of the terminal: a line that wraps could not be replaced.
void Progress::Show(const Json::Value& share) {
  if (on_terminal_) {
    const std::string text = EscapeForTerminal(Text(share, kBarWidth)).substr(0, ColumnsOf(STDERR_FILENO) - 1);
    (void)fprintf(stderr, "\r\033[K%s", text.c_str());
    shown_ = true;
    return;
  }
  const auto now = std::chrono::steady_clock::now();
  if (now < next_line_) return;
  next_line_ = now + kLineInterval;
  (void)fprintf(stderr, "%s\n", EscapeForTerminal(Text(share, 0)).c_str());
}

void Progress::Clear() {
  if (shown_) (void)fputs("\r\033[K", stderr);
  shown_ = false;
}

}  // namespace ferrox::cli
