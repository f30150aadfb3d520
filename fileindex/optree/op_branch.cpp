#include "fileindex/optree/op_branch.h"

#include <sys/random.h>

#include <bit>
#include <cstring>

namespace ferrox::fileindex {

namespace {

/// The key of this process, drawn when the first name is hashed.
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

}  // namespace

// SipHash-1-3: eight bytes a round, then the rest with the length, then three rounds more. Fast for the short names of
// files, and without the key nobody can tell which names collide.
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

/// Linear probing: from the slot that the hash names onwards, up to the first free one.
OPNode* OPBranch::Find(const OPNode& node, std::string_view name, uint32_t hash) {
  if (capacity_ == 0) {
    const bool is_first = !node.children.empty() && first_hash_ == hash && node.children.front()->name == name;
    return is_first ? node.children.front().get() : nullptr;
  }
  const uint32_t mask = capacity_ - 1;
  for (uint32_t at = hash & mask; slots_[at].child != 0; at = (at + 1) & mask) {
    if (slots_[at].hash != hash) continue;
    OPNode* const child = node.children[slots_[at].child - 1].get();
    if (child->name == name) return child;
  }
  return nullptr;
}

void OPBranch::Added(const OPNode& node, uint32_t hash) {
  const auto count = static_cast<uint32_t>(node.children.size());
  // A single child is compared as it is; the table begins with the second.
  if (count == 1) {
    first_hash_ = hash;
    return;
  }
  if (count * 4 > capacity_ * 3) Grow(count);
  Put({hash, count});
}

/// Makes room for twice `count` children; those so far are the ones in the slots, or the first alone.
void OPBranch::Grow(size_t count) {
  const std::unique_ptr<Slot[]> old = std::move(slots_);
  const uint32_t old_capacity = capacity_;
  capacity_ = static_cast<uint32_t>(std::bit_ceil(count * 2));
  slots_ = std::make_unique<Slot[]>(capacity_);
  if (old == nullptr) Put({first_hash_, 1});
  for (uint32_t i = 0; i < old_capacity; ++i) {
    if (old[i].child != 0) Put(old[i]);
  }
}

/// Takes the first free slot from the one that the hash names. There is one: the table is never full.
void OPBranch::Put(Slot entry) {
  const uint32_t mask = capacity_ - 1;
  uint32_t at = entry.hash & mask;
  while (slots_[at].child != 0) at = (at + 1) & mask;
  slots_[at] = entry;
}

}  // namespace ferrox::fileindex
