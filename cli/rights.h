#pragma once

#include <string>

#include "cli/command.h"

/// What the calling user may do in this instance. Asked before a command begins, so that what is not permitted is not
/// taken for what is not there, and nothing is left half done.
namespace ferrox::cli {

/// "user <name> may not <do> <path>, which belongs to <owner>; <the remedy>". `path` need not be reachable.
NotPermitted MayNot(const std::string& act, const std::string& path);

/// The same of a daemon's socket; to an ordinary user it says what lets users in.
NotPermitted MayNotConnect(const std::string& socket);

/// @throws NotPermitted for a command that may not be run; Failure when something else keeps the instance from being
/// used.
void RequireRights(Needs needs);

/// @throws NotPermitted when the caller may not look into a folder of the instance; one that is missing will do.
void RequireReadable(const std::string& folder);

/// Where the table of shares cannot be used, a command that needs it is not begun, and the others say so on standard
/// error. @throws Failure.
void RequireShareTable(Needs needs);

/// MayNot for an errno value that says so, else Failure: "cannot <act> <path>: <the system's reason><remedy>".
[[noreturn]] void ThrowSystemFailure(int error, const std::string& act, const std::string& path,
                                     const std::string& remedy = "");

}  // namespace ferrox::cli
