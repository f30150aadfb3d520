#pragma once

#include <bit>
#include <cstdint>
#include <cstring>
#include <string_view>

namespace ferrox::wire {

/// One number for the documents directly in a folder, so that whoever knows what they ought to be can tell whether they
/// are, without seeing any (the command "folder_digests" in docs/formats/engine.md). Two lists of documents that
/// differ in a name, a stamp, a mark or their order have the same digest once in 2^64 times, whoever chose the names:
/// it is a keyed hash (SipHash-1-3), and each request brings a key of its own.
class FolderDigest {
 public:
  /// What a document says of itself beside its stamp.
  enum Mark : unsigned {
    kNone = 0,
    kWithContent = 1,       ///< its content was wanted ("_KOVANeedMeta")
    kNoAccess = 2,          ///< it has no access record
    kCutWithoutReason = 4,  ///< "_KOVATextCut" without "_KOVAExtractError"
    kUnusual = 8,           ///< a member by which it is compared is of an unusual type
  };

  explicit FolderDigest(uint64_t seed)
      : v0_(seed ^ 0x736F6D6570736575),
        v1_(~seed ^ 0x646F72616E646F6D),
        v2_(seed ^ 0x6C7967656E657261),
        v3_(~seed ^ 0x7465646279746573) {}

  /// The next document in the byte order of names. `stamp` is its "_KOVAStamp", "" for none.
  void Add(std::string_view name, std::string_view stamp, unsigned marks) {
    Absorb(uint64_t{name.size()} | uint64_t{stamp.size()} << 28 | uint64_t{marks} << 56);
    AbsorbText(name);
    AbsorbText(stamp);
    ++count_;
  }

  uint64_t Count() const { return count_; }
  uint64_t Value() const {
    FolderDigest end = *this;
    end.Absorb(count_);
    end.v2_ ^= 0xFF;
    for (int round = 0; round < 3; ++round) end.Round();
    return end.v0_ ^ end.v1_ ^ end.v2_ ^ end.v3_;
  }

 private:
  void Absorb(uint64_t word) {
    v3_ ^= word;
    Round();
    v0_ ^= word;
  }
  /// Zeros fill the last word; the sizes are in it already.
  void AbsorbText(std::string_view text) {
    for (; text.size() >= sizeof(uint64_t); text.remove_prefix(sizeof(uint64_t))) Absorb(Word(text, sizeof(uint64_t)));
    if (!text.empty()) Absorb(Word(text, text.size()));
  }
  static uint64_t Word(std::string_view text, size_t bytes) {
    uint64_t word = 0;
    memcpy(&word, text.data(), bytes);
    return word;
  }
  void Round() {
    v0_ += v1_;
    v1_ = std::rotl(v1_, 13) ^ v0_;
    v0_ = std::rotl(v0_, 32);
    v2_ += v3_;
    v3_ = std::rotl(v3_, 16) ^ v2_;
    v0_ += v3_;
    v3_ = std::rotl(v3_, 21) ^ v0_;
    v2_ += v1_;
    v1_ = std::rotl(v1_, 17) ^ v2_;
    v2_ = std::rotl(v2_, 32);
  }

  uint64_t v0_, v1_, v2_, v3_;
  uint64_t count_ = 0;
};

}  // namespace ferrox::wire
