// A whole queue file: the tree must hand out what the model of plain lists does.

#include <sys/mman.h>
#include <unistd.h>

#include <cstdlib>
#include <iostream>

#include "base/unique_fd.h"
#include "common/error.h"
#include "common/log.h"
#include "common/new_class.h"
#include "fuzz/queue_model.h"

using ferrox::test::ListModel;

namespace {

constexpr size_t kInputMaxBytes = 16 * 1024;
// With more than that, renames that no kernel makes may find nodes in another order than the model's.
constexpr size_t kWalkedMax = 5000;

void Feed(ListModel& model, const std::string& queue) {
  std::istringstream lines(queue);
  for (std::string line; !model.crashed && model.walked <= kWalkedMax && std::getline(lines, line);) {
    try {
      model.Insert(ferrox::fileindex::Event(line));
    } catch (const ferrox::Error&) {
    }
  }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  (void)ferrox::SetLogSink([](int, const char*) {});
  if (size > kInputMaxBytes) return 0;
  const base::UniqueFd file(memfd_create("queue", MFD_CLOEXEC));
  if (write(file.Get(), data, size) != static_cast<ssize_t>(size)) abort();
  ferrox::fileindex::OPTree tree("/proc/self/fd/" + std::to_string(file.Get()));
  ListModel model;
  Feed(model, {reinterpret_cast<const char*>(data), size});
  const std::string got = ferrox::test::TextOf(tree);
  if (model.walked > kWalkedMax || got == model.Text()) return 0;
  std::cerr << "got\n" << got << "\nexpected\n" << model.Text() << "\n";
  abort();
}
