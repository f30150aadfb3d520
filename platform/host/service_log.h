#pragma once

#include <string>

namespace kova::host {

/// For the logs of an instance's own services, which write to them as their standard output and cannot reopen them.
/// Keeps a log that running processes append to from growing without end: over 16 MiB it is copied to "<path>.1", in
/// place of what was there, and emptied. A line that is written between the two is lost.
void BoundLog(const std::string& path);

}  // namespace kova::host
