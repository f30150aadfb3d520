#include <stdlib.h>

#include <filesystem>

#include <gtest/gtest.h>

#include "tests/support/temp_dir.h"

namespace ferrox::test {

namespace {

const TempDir* g_root = nullptr;

}  // namespace

const std::string& TestRoot() { return g_root->Path(); }

}  // namespace ferrox::test

int main(int argc, char** argv) {
  const ferrox::test::TempDir root;
  ferrox::test::g_root = &root;
  for (const char* folder : {"/tmp", "/var/run", "/var/packages/Ferrox/etc"}) {
    std::filesystem::create_directories(root.Path() + folder);
  }
  (void)setenv("FERROX_ROOT", root.Path().c_str(), 1);
  testing::InitGoogleTest(&argc, argv);
  return RUN_ALL_TESTS();
}
