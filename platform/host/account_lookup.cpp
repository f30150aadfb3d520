#include "platform/host/account_lookup.h"

#include <syslog.h>

#include <chrono>

#include "platform/host/child_service.h"
#include "platform/host/log.h"
#include "platform/host/run_program.h"

namespace kova::host {

std::optional<std::string> LookUpAccount(const std::vector<std::string>& arguments) {
  constexpr std::chrono::seconds kLongest{5};
  constexpr char kProgram[] = "kova-accounts";
  const std::string program = FindProgram(kProgram);
  std::string output;
  const int status = program.empty() ? -1 : RunForOutput(program, arguments, output, kLongest);
  if (status == 0) {
    LogChange(LOG_NOTICE, kProgram, "users for whom other programs ask can be looked up");
    return output;
  }
  LogChange(LOG_ERR, kProgram,
            program.empty() ? "users for whom other programs ask cannot be looked up: kova-accounts is not installed"
                            : "users for whom other programs ask cannot be looked up: kova-accounts failed, or had no "
                              "answer from the name service within 5 s");
  return std::nullopt;
}

}  // namespace kova::host
