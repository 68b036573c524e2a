// Internal: what the two JSON readers share to build trees quickly. Not installed.
#pragma once

#include <cstdint>
#include <cstring>

#include "sarn/dict/Dictionary.h"

namespace sarn {
namespace internal {

class JsonReadSupport {
 public:
  explicit JsonReadSupport(VekMempool* pool) : pMempoolM(pool) {}

  // The key as a string in the pool. Documents repeat the same few keys in every record, so
  // short keys go through a small two-way cache and equal keys share one representation
  // (a reference count instead of an allocation and a copy). Empty for a non-empty key when
  // memory runs out.
  VekString Key(const char* data, size_t n) {
    if (n == 0 || n > kMaxCachedKey) return VekString::FromUtf8Bytes(pMempoolM, n, data);
    // Two words that hold every byte of a key of up to 16 bytes, loaded without a byte loop
    // (whose narrow stores the wide load after it would wait for).
    uint64_t head, tail;
    if (n >= 8) {
      head = Load<uint64_t>(data);
      tail = Load<uint64_t>(data + n - 8);
    } else if (n >= 4) {
      head = Load<uint32_t>(data);
      tail = Load<uint32_t>(data + n - 4);
    } else {
      head = static_cast<unsigned char>(data[0]) | static_cast<unsigned char>(data[n / 2]) << 8 |
             static_cast<unsigned char>(data[n - 1]) << 16;
      tail = 0;
    }
    uint64_t h = (head * 0x9E3779B97F4A7C15ull) ^ (tail * 0xC2B2AE3D27D4EB4Full) ^ n;
    h ^= h >> 29;
    // Two ways per set: the twenty-odd keys of a typical record would otherwise keep evicting
    // each other in pairs, each eviction a new text for every later use of the key.
    Slot* set = &vSlotM[(h * 0xFF51AFD7ED558CCDull >> 59) * kWays];
    for (size_t way = 0; way < kWays; ++way) {
      Slot& slot = set[way];
      if (slot.textM.NByte() == n && slot.headM == head && slot.tailM == tail &&
          (n <= 16 || std::memcmp(slot.textM.Utf8(), data, n) == 0)) {
        // The cache's texts are this read's own until the read returns its tree.
        return slot.textM.CopyUnshared();
      }
    }
    // A miss: the newest key takes the first way, the one there moves to the second.
    set[1] = static_cast<Slot&&>(set[0]);
    set[0].textM = VekString::FromUtf8Bytes(pMempoolM, n, data);
    set[0].headM = head;
    set[0].tailM = tail;
    return set[0].textM.CopyUnshared();
  }

  // Dictionary access for the readers: lookups by bytes and appends that skip a second lookup.
  // `hash` is for the AddNew that follows, on the same dictionary.
  static bool Has(const Dictionary& dictionary, const char* name, size_t n, uint64_t& hash) {
    return dictionary.FindFirst(name, n, &hash) >= 0;
  }
  // For a name known to be absent. The dictionary takes a reference to `value` on success; on
  // failure nothing changes (a fresh node is then the caller's to delete).
  static bool AddNew(Dictionary& dictionary, VekString&& name, DictValue* value, uint64_t hash) {
    if (!dictionary.AppendNewName(static_cast<VekString&&>(name), value, hash)) return false;
    value->UpRefUnshared();
    return true;
  }
  // After the values already under the name, taking over `name` when it becomes a new name's
  // (the streaming reader's key, which it no longer needs; untouched on failure); references
  // as for AddNew.
  static bool Add(Dictionary& dictionary, VekString&& name, DictValue* value) {
    if (!dictionary.AppendAny(static_cast<VekString&&>(name), value)) return false;
    value->UpRefUnshared();
    return true;
  }

  VekMempool* Pool() const { return pMempoolM; }

 private:
  static constexpr size_t kSets = 32;
  static constexpr size_t kWays = 2;
  static constexpr size_t kSlots = kSets * kWays;
  static_assert(kSets == 32, "a set is picked by the top five bits of a hash");
  static_assert(kWays == 2, "a miss moves the first way to the second");
  static constexpr size_t kMaxCachedKey = 48;
  struct Slot {
    VekString textM;
    uint64_t headM = 0;
    uint64_t tailM = 0;
  };
  template <class T>
  static T Load(const char* p) {
    T value;
    std::memcpy(&value, p, sizeof value);
    return value;
  }
  VekMempool* pMempoolM;
  Slot vSlotM[kSlots];
};

}  // namespace internal
}  // namespace sarn
