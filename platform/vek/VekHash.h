// Hash tables keyed by strings.
//
// VekHashStringToCore<T>     name -> counted pointer to T (the table holds a reference)
// VekHashStringToStringNew   name -> string (used as an interning table: equal texts share
//                            one stored instance)
//
// Keys are unique; Put replaces the value of an existing key. The iteration order is
// unspecified (callers that need a stable order sort the keys). Entries and buckets come from
// the table's pool. Not locked: one thread at a time.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>
#include <new>
#include <utility>

#include "vek/VekCore.h"
#include "vek/VekString.h"

namespace vekinternal {

// FNV-1a over the key's bytes.
inline uint32_t HashBytes(const char* data, size_t n) {
  uint32_t h = 2166136261u;
  for (size_t i = 0; i < n; ++i) {
    h ^= static_cast<unsigned char>(data[i]);
    h *= 16777619u;
  }
  return h;
}

// Chained table shared by both public tables; V must be copyable.
template <class V>
class StringHashMap {
 public:
  struct Entry {
    VekString keyM;
    V valueM;
    uint32_t hashM;
    Entry* pNextM;
  };

  explicit StringHashMap(VekMempool* pool) : pMempoolM(pool != nullptr ? pool : VekMempool::Default()) {}
  ~StringHashMap() { Destroy(); }
  StringHashMap(const StringHashMap&) = delete;
  StringHashMap& operator=(const StringHashMap&) = delete;

  Entry* FindEntry(const char* data, size_t n) const {
    if (nBucketM == 0) return nullptr;
    uint32_t h = HashBytes(data, n);
    for (Entry* e = vBucketM[h & (nBucketM - 1)]; e != nullptr; e = e->pNextM) {
      if (e->hashM == h && e->keyM.NByte() == n && std::memcmp(e->keyM.Utf8(), data, n) == 0) return e;
    }
    return nullptr;
  }

  // Finds or adds the entry for `key`; `wasPresent` tells which. Null only when out of memory.
  Entry* Insert(const VekString& key, bool& wasPresent) {
    Entry* found = FindEntry(key.Utf8(), key.NByte());
    wasPresent = found != nullptr;
    if (found != nullptr) return found;
    if (nEntryM + 1 > nBucketM * 3 / 4 && !Rehash(nBucketM == 0 ? 8 : nBucketM * 2)) return nullptr;
    void* memory = pMempoolM->Malloc(sizeof(Entry));
    if (memory == nullptr) return nullptr;
    Entry* e = new (memory) Entry{key, V(), HashBytes(key.Utf8(), key.NByte()), nullptr};
    Entry*& bucket = vBucketM[e->hashM & (nBucketM - 1)];
    e->pNextM = bucket;
    bucket = e;
    ++nEntryM;
    return e;
  }

  bool Remove(const char* data, size_t n) {
    if (nBucketM == 0) return false;
    uint32_t h = HashBytes(data, n);
    for (Entry** link = &vBucketM[h & (nBucketM - 1)]; *link != nullptr; link = &(*link)->pNextM) {
      Entry* e = *link;
      if (e->hashM == h && e->keyM.NByte() == n && std::memcmp(e->keyM.Utf8(), data, n) == 0) {
        *link = e->pNextM;
        --nEntryM;
        DestroyEntry(e);
        return true;
      }
    }
    return false;
  }

  template <class F>
  void ForEach(F&& f) const {
    for (size_t b = 0; b < nBucketM; ++b) {
      for (Entry* e = vBucketM[b]; e != nullptr; e = e->pNextM) f(e->keyM, e->valueM);
    }
  }

  size_t Count() const { return nEntryM; }

  void Destroy() {
    // Unlink everything before releasing: a value's destructor may not look at this table.
    Entry** buckets = vBucketM;
    size_t n = nBucketM;
    vBucketM = nullptr;
    nBucketM = 0;
    nEntryM = 0;
    for (size_t b = 0; b < n; ++b) {
      Entry* e = buckets[b];
      while (e != nullptr) {
        Entry* next = e->pNextM;
        DestroyEntry(e);
        e = next;
      }
    }
    pMempoolM->Free(buckets);
  }

 private:
  void DestroyEntry(Entry* e) {
    e->~Entry();
    pMempoolM->Free(e);
  }

  bool Rehash(size_t nBucket) {
    Entry** buckets = static_cast<Entry**>(pMempoolM->Calloc(nBucket, sizeof(Entry*)));
    if (buckets == nullptr) return false;
    for (size_t b = 0; b < nBucketM; ++b) {
      Entry* e = vBucketM[b];
      while (e != nullptr) {
        Entry* next = e->pNextM;
        Entry*& bucket = buckets[e->hashM & (nBucket - 1)];
        e->pNextM = bucket;
        bucket = e;
        e = next;
      }
    }
    pMempoolM->Free(vBucketM);
    vBucketM = buckets;
    nBucketM = nBucket;
    return true;
  }

  VekMempool* pMempoolM;
  Entry** vBucketM = nullptr;
  size_t nBucketM = 0;
  size_t nEntryM = 0;
};

}  // namespace vekinternal

template <class T>
class VekHashStringToCore {
 public:
  explicit VekHashStringToCore(VekMempool* pool) : mapM(pool) {}
  // The value under `key`, or null. Non-owning.
  T* Find(const VekString& key) const { return Find(key.Utf8(), key.NByte()); }
  T* Find(const char* data, size_t n) const {
    auto* e = mapM.FindEntry(data, n);
    return e != nullptr ? e->valueM.Get() : nullptr;
  }
  // Sets the value of `key` (replacing and releasing an old one). False when out of memory.
  bool Put(const VekString& key, const ref<T>& value) {
    bool wasPresent;
    auto* e = mapM.Insert(key, wasPresent);
    if (e == nullptr) return false;
    e->valueM = value;
    return true;
  }
  bool Remove(const VekString& key) { return mapM.Remove(key.Utf8(), key.NByte()); }
  size_t Count() const { return mapM.Count(); }
  void Clear() { mapM.Destroy(); }
  // Calls f(const VekString& key, const ref<T>& value) for every entry.
  template <class F>
  void ForEach(F&& f) const { mapM.ForEach(std::forward<F>(f)); }

 private:
  vekinternal::StringHashMap<ref<T>> mapM;
};

class VekHashStringToStringNew {
 public:
  explicit VekHashStringToStringNew(VekMempool* pool) : mapM(pool) {}
  // The stored value of `key`, or null.
  const VekString* Find(const char* data, size_t n) const {
    auto* e = mapM.FindEntry(data, n);
    return e != nullptr ? &e->valueM : nullptr;
  }
  const VekString* Find(const VekString& key) const { return Find(key.Utf8(), key.NByte()); }
  bool Put(const VekString& key, const VekString& value) {
    bool wasPresent;
    auto* e = mapM.Insert(key, wasPresent);
    if (e == nullptr) return false;
    e->valueM = value;
    return true;
  }
  bool Remove(const VekString& key) { return mapM.Remove(key.Utf8(), key.NByte()); }
  size_t Count() const { return mapM.Count(); }
  void Clear() { mapM.Destroy(); }
  template <class F>
  void ForEach(F&& f) const { mapM.ForEach(std::forward<F>(f)); }

 private:
  vekinternal::StringHashMap<VekString> mapM;
};
