// One queue line: the quick reading and the JSON library's must agree on members, errors and texts.

#include <cstdlib>
#include <iostream>

#include "common/log.h"
#include "fuzz/event_reference.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  (void)ferrox::SetLogSink([](int, const char*) {});
  const std::string line(reinterpret_cast<const char*>(data), size);
  const std::string got = ferrox::test::Outcome(line);
  const std::string expected = ferrox::test::ReferenceOutcome(line);
  if (got == expected) return 0;
  std::cerr << "got      " << got << "\nexpected " << expected << "\n";
  abort();
}
