#pragma once

// What most tests of the library need.

#include <filesystem>
#include <functional>
#include <string>
#include <vector>

#include <gtest/gtest.h>
#include <json/value.h>

#include "common/error.h"
#include "common/json_util.h"
#include "common/paths.h"
#include "tests/support/fake_clock.h"
#include "tests/support/fake_platform.h"
#include "tests/support/log_capture.h"
#include "tests/support/temp_dir.h"

namespace ferrox::test {

/// "<code> <reason>" of the Error that the call throws, "" when it throws none.
inline std::string FailureOf(const std::function<void()>& call) {
  try {
    call();
    return {};
  } catch (const Error& error) {
    return std::to_string(error.Code()) + " " + error.what();
  }
}

inline Json::Value Parse(const std::string& text) {
  Json::Value value;
  EXPECT_TRUE(fromString(value, text)) << text;
  return value;
}

/// A fresh fake platform, clock and log.
class LibraryTest : public testing::Test {
 protected:
  LibraryTest() { platform_.Reset(); }

  FakePlatform& platform_ = FakePlatform::Get();
  FakeClock clock_;
  LogCapture log_;
};

}  // namespace ferrox::test
