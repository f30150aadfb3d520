#include "fileindex/op_branch.h"

#include <sys/random.h>

#include <bit>
#include <cstring>

namespace ferrox::fileindex {

namespace {

constexpr size_t kFewChildren = 8;

struct HashKey {
  uint64_t k0 = 0x0706050403020100u;
  uint64_t k1 = 0x0f0e0d0c0b0a0908u;

  HashKey() {
    // Without entropy the fixed key still hashes well; it is only no secret.
    (void)!getrandom(this, sizeof(*this), GRND_NONBLOCK);
  }
};

struct SipState {
  uint64_t v0, v1, v2, v3;

  void Round() {
    v0 += v1;
    v2 += v3;
    v1 = std::rotl(v1, 13) ^ v0;
    v3 = std::rotl(v3, 16) ^ v2;
    v0 = std::rotl(v0, 32);
    v2 += v1;
    v0 += v3;
    v1 = std::rotl(v1, 17) ^ v2;
    v3 = std::rotl(v3, 21) ^ v0;
    v2 = std::rotl(v2, 32);
  }
  void Mix(uint64_t word) {
    v3 ^= word;
    Round();
    v0 ^= word;
  }
};

/// SipHash-1-3 with a key of this process: whoever may name files must not be able to choose names that collide.
uint32_t HashName(std::string_view name) {
  static const HashKey key;
  SipState state = {key.k0 ^ 0x736f6d6570736575u, key.k1 ^ 0x646f72616e646f6du, key.k0 ^ 0x6c7967656e657261u,
                    key.k1 ^ 0x7465646279746573u};
  const char* at = name.data();
  size_t left = name.size();
  uint64_t word = 0;
  for (; left >= sizeof(word); at += sizeof(word), left -= sizeof(word)) {
    memcpy(&word, at, sizeof(word));
    state.Mix(word);
  }
  word = 0;
  if (left != 0) memcpy(&word, at, left);
  state.Mix(word ^ (static_cast<uint64_t>(name.size()) << 56));
  state.v2 ^= 0xff;
  state.Round();
  state.Round();
  state.Round();
  const uint64_t hash = state.v0 ^ state.v1 ^ state.v2 ^ state.v3;
  return static_cast<uint32_t>(hash ^ (hash >> 32));
}

}  // namespace

OPNode* OPBranch::Find(const OPNode& node, std::string_view name) {
  if (node.children.size() <= kFewChildren) {
    for (const auto& child : node.children) {
      if (child->name == name) return child.get();
    }
    return nullptr;
  }
  if (indexed_ != node.children.size()) Rebuild(node);
  const uint32_t hash = HashName(name);
  const size_t mask = slots_.size() - 1;
  for (size_t at = hash & mask; slots_[at].child != 0; at = (at + 1) & mask) {
    if (slots_[at].hash != hash) continue;
    OPNode* const child = node.children[slots_[at].child - 1].get();
    if (child->name == name) return child;
  }
  return nullptr;
}

void OPBranch::Added(const OPNode& node) {
  const size_t count = node.children.size();
  if (count <= kFewChildren) return;
  if (indexed_ + 1 != count || count * 4 > slots_.size() * 3) {
    Rebuild(node);
    return;
  }
  Put({HashName(node.children.back()->name), static_cast<uint32_t>(count)});
  indexed_ = count;
}

void OPBranch::Rebuild(const OPNode& node) {
  const size_t count = node.children.size();
  const std::vector<Slot> old = std::move(slots_);
  slots_.assign(std::bit_ceil(count * 2), Slot{0, 0});
  for (const Slot& entry : old) {
    if (entry.child != 0) Put(entry);
  }
  for (size_t i = indexed_; i < count; ++i) Put({HashName(node.children[i]->name), static_cast<uint32_t>(i + 1)});
  indexed_ = count;
}

void OPBranch::Put(Slot entry) {
  const size_t mask = slots_.size() - 1;
  size_t at = entry.hash & mask;
  while (slots_[at].child != 0) at = (at + 1) & mask;
  slots_[at] = entry;
}

}  // namespace ferrox::fileindex
