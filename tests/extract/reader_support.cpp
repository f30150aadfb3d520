#include "tests/extract/reader_support.h"

#include <sys/mman.h>
#include <unistd.h>
#include <zip.h>

#include <chrono>
#include <random>

#include <gtest/gtest.h>

namespace ferrox::extract::test {

Json::Value Read(Reader reader, const std::string& bytes, const std::string& extension, const Limits& limits) {
  const int fd = memfd_create("sample", MFD_CLOEXEC);
  EXPECT_EQ(static_cast<ssize_t>(bytes.size()), write(fd, bytes.data(), bytes.size()));
  Findings findings(limits);
  EXPECT_NO_THROW(reader({fd, bytes.size(), "sample." + extension, extension}, findings));
  EXPECT_EQ(0, close(fd));  // it is not the reader's to close
  const Json::Value document = findings.ToDocument();
  EXPECT_LE(Text(document).size(), limits.text_bytes);
  return document;
}

void Abuse(Reader reader, const std::string& sample, const std::string& extension, int changes) {
  constexpr uint32_t kSeed = 20240301;
  SCOPED_TRACE("seed " + std::to_string(kSeed) + " of a " + extension);
  std::mt19937 random(kSeed);
  const auto below = [&](size_t end) { return static_cast<size_t>(random() % end); };
  const auto start = std::chrono::steady_clock::now();
  for (size_t i = 0; i < 20; ++i) (void)Read(reader, sample.substr(0, sample.size() * i / 20), extension);
  for (int i = 0; i < changes; ++i) {
    std::string changed = sample;
    for (size_t count = 1 + below(8); count > 0; --count) {
      const size_t at = below(changed.size());
      const size_t length = std::min<size_t>(1 + below(4), changed.size() - at);
      const char byte = below(3) == 0 ? '\xFF' : static_cast<char>(random());
      if (below(8) == 0) {
        changed.erase(at, length);
      } else if (below(8) == 0) {
        changed.insert(at, changed.substr(below(changed.size()), below(64)));
      } else {
        changed.replace(at, length, std::string(length, byte));
      }
      if (changed.empty()) changed = "x";
    }
    (void)Read(reader, changed, extension);
  }
  EXPECT_LT(std::chrono::steady_clock::now() - start, std::chrono::seconds(60));
}

std::string MakeZip(const Members& members) {
  zip_error_t error;
  zip_error_init(&error);
  zip_source_t* target = zip_source_buffer_create(nullptr, 0, 0, &error);
  zip_t* archive = zip_open_from_source(target, ZIP_TRUNCATE, &error);
  zip_source_keep(target);
  for (const auto& [name, content] : members) {
    zip_source_t* source = zip_source_buffer(archive, content.data(), content.size(), 0);
    EXPECT_GE(zip_file_add(archive, name.c_str(), source, ZIP_FL_ENC_UTF_8), 0) << name;
  }
  EXPECT_EQ(0, zip_close(archive));
  EXPECT_EQ(0, zip_source_open(target));
  std::string bytes;
  char buffer[65536];
  for (zip_int64_t got = 0; (got = zip_source_read(target, buffer, sizeof buffer)) > 0;) {
    bytes.append(buffer, static_cast<size_t>(got));
  }
  (void)zip_source_close(target);
  zip_source_free(target);
  return bytes;
}

std::string Little(uint64_t value, int bytes) {
  std::string out;
  for (int i = 0; i < bytes; ++i) out += static_cast<char>(i < 8 ? value >> (8 * i) : 0);
  return out;
}

std::string Big(uint64_t value, int bytes) {
  const std::string little = Little(value, bytes);
  return {little.rbegin(), little.rend()};
}

std::string Text(const Json::Value& document, const char* member) {
  return document.isMember(member) ? document[member].asString() : std::string();
}

}  // namespace ferrox::extract::test
