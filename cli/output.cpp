#include "cli/output.h"

#include <cstdio>

#include "cli/command.h"
#include "cli/escape.h"

namespace ferrox::cli {

namespace {

constexpr char kNotWritten[] = "standard output cannot be written";

}  // namespace

void Warn(const std::string& text) { (void)fprintf(stderr, "fileindexctl: %s\n", EscapeForTerminal(text).c_str()); }

void PrintJson(const Json::Value& value) { (void)printf("%s\n", ToScriptJson(value).c_str()); }

void FlushOutput() {
  if (fflush(stdout) != 0) throw Failure(kNotWritten);
}

void PrintBytes(const std::string& bytes) {
  if (fwrite(bytes.data(), 1, bytes.size(), stdout) != bytes.size()) throw Failure(kNotWritten);
}

}  // namespace ferrox::cli
