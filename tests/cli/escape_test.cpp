// Catches names of files that could steer a terminal, and names that a script would not get back byte for byte.
#include "cli/escape.h"

#include <gtest/gtest.h>

#include "common/json_util.h"

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
      {"\xC2\x9B", "\\xC2\\x9B"},                   // a control that some terminals obey
      {"a\xE2\x80\xAEgpj", "a\\xE2\\x80\\xAEgpj"},  // turns the direction
      {"\xD8\x9C\xE2\x81\xA9", "\\xD8\\x9C\\xE2\\x81\\xA9"},
      {"\xC2\xA0\xE2\x80\x90", "\xC2\xA0\xE2\x80\x90"},  // a fixed blank and a hyphen, just beside them
      {"\xFF\xC3", "\\xFF\\xC3"},                        // no UTF-8; cut short
      {"\xC0\xAF", "\\xC0\\xAF"},                        // overlong
      {"\xED\xA0\x80", "\\xED\\xA0\\x80"},               // a surrogate
      {"\xF4\x90\x80\x80", "\\xF4\\x90\\x80\\x80"},      // beyond the last
  };
  for (const auto& row : rows) EXPECT_EQ(row.shown, EscapeForTerminal(row.raw));
}

TEST(EscapeTest, ScriptJsonIsUtf8AndKeepsEachByte) {
  Json::Value value;
  value["k"] = "a\"\n\xC3\xBC\xFFz\xED\xA0\x80";
  EXPECT_EQ("{\"k\":\"a\\\"\\n\xC3\xBC\\udcffz\\udced\\udca0\\udc80\"}", ToScriptJson(value));
  const std::string controls = "\x1B\x7F\xC2\x9B\xD8\x9C\xE2\x80\xAE\xE2\x80\xA8\xE2\x81\xA6";
  EXPECT_EQ("\"\\u001b\\u007f\\u009b\\u061c\\u202e\\u2028\\u2066\"", ToScriptJson(controls));
  Json::Value read;
  EXPECT_TRUE(fromString(read, ToScriptJson(controls)) && read == controls) << "the value is the same";
}

TEST(EscapeTest, SnippetsBecomeOneLine) { EXPECT_EQ("a b \\x01", EscapeOneLine("a \r\n\t b\n\x01")); }

TEST(EscapeTest, TextKeepsItsLines) { EXPECT_EQ("a\n\tb\\x0D\\xC2\\x9B", EscapeText("a\r\n\tb\r\xC2\x9B")); }

}  // namespace
}  // namespace ferrox::cli
