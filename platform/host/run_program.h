#pragma once

#include <chrono>
#include <string>
#include <vector>

namespace kova::host {

/// Runs a program without a shell, waits for it, and returns its exit status; below 0, with the failure recorded, when
/// it could not be started or was killed. `arguments` does not hold the program itself.
int RunProgram(const std::string& path, const std::vector<std::string>& arguments);

/// The same, with what the program writes to its standard output; nothing is read from standard input, and standard
/// error is dropped. Below 0 as well when it writes more than 16 MiB or does not end within `longest`; it is
/// killed then.
int RunForOutput(const std::string& path, const std::vector<std::string>& arguments, std::string& output,
                 std::chrono::seconds longest = std::chrono::seconds(10));

/// The arguments as the system takes them: pointers into `texts`, which must outlive them, and a null at the end.
std::vector<char*> ArgumentVector(const std::vector<std::string>& texts);

}  // namespace kova::host
