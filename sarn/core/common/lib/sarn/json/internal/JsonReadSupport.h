// Internal: what the two JSON readers share to build trees quickly. Not installed.
#pragma once

#include <cstring>

#include "sarn/dict/Dictionary.h"

namespace sarn {
namespace internal {

class JsonReadSupport {
 public:
  explicit JsonReadSupport(VekMempool* pool) : pMempoolM(pool) {}

  // The key as a string in the pool. Documents repeat the same few keys in every record, so
  // short keys go through a small direct-mapped cache and equal keys share one representation
  // (a reference count instead of an allocation and a copy). Empty for a non-empty key when
  // memory runs out.
  VekString Key(const char* data, size_t n) {
    if (n == 0 || n > kMaxCachedKey) return VekString::FromUtf8Bytes(pMempoolM, n, data);
    uint64_t head = 0, tail = 0;
    std::memcpy(&head, data, n < 8 ? n : 8);
    std::memcpy(&tail, data + (n > 8 ? n - 8 : 0), n < 8 ? n : 8);
    uint64_t h = (head * 0x9E3779B97F4A7C15ull) ^ (tail * 0xC2B2AE3D27D4EB4Full) ^ n;
    VekString& slot = vSlotM[(h ^ (h >> 29)) & (kSlots - 1)];
    if (slot.NByte() != n || std::memcmp(slot.Utf8(), data, n) != 0) {
      slot = VekString::FromUtf8Bytes(pMempoolM, n, data);
    }
    return slot;
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
    value->UpRef();
    return true;
  }
  // After the values already under the name, taking over `name` when it becomes a new name's
  // (the streaming reader's key, which it no longer needs; untouched on failure); references
  // as for AddNew.
  static bool Add(Dictionary& dictionary, VekString&& name, DictValue* value) {
    if (!dictionary.AppendAny(static_cast<VekString&&>(name), value)) return false;
    value->UpRef();
    return true;
  }

  VekMempool* Pool() const { return pMempoolM; }

 private:
  static constexpr size_t kSlots = 64;
  static constexpr size_t kMaxCachedKey = 48;
  VekMempool* pMempoolM;
  VekString vSlotM[kSlots];
};

}  // namespace internal
}  // namespace sarn
