#include "cli/escape.h"

#include <gtest/gtest.h>

namespace ferrox::cli {
namespace {

TEST(EscapeTest, TerminalGetsNoControlAndNoInvalidByte) {
  const struct {
    std::string raw;
    const char* shown;
  } rows[] = {
      {"plain name.txt", "plain name.txt"},
      {"z\xC3\xBCrich \xE6\x97\xA5\xF0\x9F\x98\x80", "z\xC3\xBCrich \xE6\x97\xA5\xF0\x9F\x98\x80"},
      {"a\nb\tc\x1B[31m", "a\\x0Ab\\x09c\\x1B[31m"},
      {std::string("nul\0x", 5), "nul\\x00x"},
      {"\x7F", "\\x7F"},
      {"\xC2\x9B", "\\xC2\\x9B"},                    // a control that some terminals obey
      {"a\xE2\x80\xAEgpj", "a\\xE2\\x80\\xAEgpj"},   // turns the direction
      {"\xFF\xC3", "\\xFF\\xC3"},                    // no UTF-8; cut short
      {"\xC0\xAF", "\\xC0\\xAF"},                    // overlong
      {"\xED\xA0\x80", "\\xED\\xA0\\x80"},           // a surrogate
      {"\xF4\x90\x80\x80", "\\xF4\\x90\\x80\\x80"},  // beyond the last
  };
  for (const auto& row : rows) EXPECT_EQ(row.shown, EscapeForTerminal(row.raw));
}

TEST(EscapeTest, ScriptJsonIsUtf8AndKeepsEachByte) {
  Json::Value value;
  value["k"] = "a\"\n\xC3\xBC\xFFz\xED\xA0\x80";
  EXPECT_EQ("{\"k\":\"a\\\"\\n\xC3\xBC\\udcffz\\udced\\udca0\\udc80\"}", ToScriptJson(value));
}

TEST(EscapeTest, SnippetsBecomeOneLine) { EXPECT_EQ("a b \\x01", EscapeOneLine("a \r\n\t b\n\x01")); }

}  // namespace
}  // namespace ferrox::cli
