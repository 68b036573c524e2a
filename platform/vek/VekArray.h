// Platform arrays with 16-bit counts: at most 65,535 elements. An Add past that is refused
// (returns false and changes nothing); counts never wrap.
//
// VekGenericArray     counted pointers (each element holds one reference; null allowed)
// VekGenericIntArray  fixed-width elements of 1, 4 or 8 bytes, copied in and out
// VekArray<T>         counted pointers to T, a plain (not counted) class for the stack or new
//
// None of them is locked; each is used by one thread at a time. They are not copyable.
#pragma once

#include <cstddef>
#include <cstdint>

#include "vek/VekCore.h"

class VekGenericArray {
 public:
  static constexpr uint16_t kMaxCount = 65535;
  // `initialCapacity` is a hint; storage is taken at the first Add.
  VekGenericArray(VekMempool* pool, int initialCapacity);
  explicit VekGenericArray(VekMempool* pool) : VekGenericArray(pool, 0) {}
  ~VekGenericArray() { Destroy(); }
  VekGenericArray(const VekGenericArray&) = delete;
  VekGenericArray& operator=(const VekGenericArray&) = delete;

  // Appends `object` (null allowed) and takes a reference to it.
  bool Add(VekCore* object);
  // Add with VekCore::UpRefUnshared, for an object that no other thread can reach yet.
  bool AddUnshared(VekCore* object);
  uint16_t Count() const { return countM; }
  // Non-owning: the array keeps its reference. i must be below Count().
  VekCore* Get(int i) const { return vDataM[i]; }
  // Replaces element i, releasing the old one.
  bool Set(int i, VekCore* object);
  bool RemoveAt(int i);
  // Removes the first element that is `object` itself; false when there is none.
  bool Remove(const VekCore* object);
  // Releases every element; keeps the storage.
  void Clear();
  // Releases every element and frees the storage; the array stays usable.
  void Destroy();
  VekMempool* GetMempool() const { return pMempoolM; }

 private:
  bool Grow();
  VekMempool* pMempoolM;
  VekCore** vDataM;
  uint16_t countM;
  uint16_t capacityM;
  uint32_t initialCapacityM;
};
static_assert(sizeof(VekGenericArray) == 24 && alignof(VekGenericArray) == 8, "VekGenericArray layout");

class VekGenericIntArray {
 public:
  static constexpr uint16_t kMaxCount = 65535;
  // `width` is 1, 4 or 8 (anything else asserts). A null pool means the default pool.
  VekGenericIntArray(int width, VekMempool* pool, int initialCapacity);
  ~VekGenericIntArray() { Destroy(); }
  VekGenericIntArray(const VekGenericIntArray&) = delete;
  VekGenericIntArray& operator=(const VekGenericIntArray&) = delete;

  // Copies `width` bytes from `element`.
  bool Add(const void* element);
  uint16_t Count() const { return countM; }
  int GetWidth() const { return widthM; }
  // Points at element i inside the array (valid until the next Add or removal).
  void* Get(int i) const { return vDataM + static_cast<size_t>(i) * widthM; }
  bool RemoveAt(int i);
  // Removes the first element whose bytes equal `element`'s; false when there is none.
  bool Remove(const void* element);
  void Clear() { countM = 0; }
  void Destroy();
  VekMempool* GetMempool() const { return pMempoolM; }

 private:
  bool Grow();
  VekMempool* pMempoolM;
  unsigned char* vDataM;
  uint16_t countM;
  uint16_t capacityM;
  uint8_t widthM;
};
static_assert(sizeof(VekGenericIntArray) == 24 && alignof(VekGenericIntArray) == 8, "VekGenericIntArray layout");

template <class T>
class VekArray {
 public:
  explicit VekArray(VekMempool* pool) : arrayM(pool, 0) {}
  bool Add(T* object) { return arrayM.Add(object); }
  bool Add(const ref<T>& object) { return arrayM.Add(object.Get()); }
  uint16_t Count() const { return arrayM.Count(); }
  T* Get(int i) const { return static_cast<T*>(arrayM.Get(i)); }
  T* operator[](int i) const { return Get(i); }
  bool RemoveAt(int i) { return arrayM.RemoveAt(i); }
  bool Remove(const T* object) { return arrayM.Remove(object); }
  void Clear() { arrayM.Clear(); }

 private:
  VekGenericArray arrayM;
};
