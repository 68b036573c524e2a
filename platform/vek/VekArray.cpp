#include "vek/VekArray.h"

#include <algorithm>
#include <cstring>

#include "vek/VekServices.h"

namespace {
uint16_t NextCapacity(uint16_t capacity, uint32_t hint) {
  uint32_t wanted = capacity == 0 ? std::max<uint32_t>(hint, 4) : static_cast<uint32_t>(capacity) * 2;
  return static_cast<uint16_t>(std::min<uint32_t>(wanted, 65535));
}
}  // namespace

VekGenericArray::VekGenericArray(VekMempool* pool, int initialCapacity)
    : pMempoolM(pool != nullptr ? pool : VekMempool::Default()), vDataM(nullptr), countM(0), capacityM(0),
      initialCapacityM(initialCapacity > 0 ? static_cast<uint32_t>(initialCapacity) : 0) {}

bool VekGenericArray::Grow() {
  if (capacityM == kMaxCount) return false;
  uint16_t capacity = NextCapacity(capacityM, initialCapacityM);
  void* data = pMempoolM->Realloc(vDataM, sizeof(VekCore*) * capacity);
  if (data == nullptr) return false;
  vDataM = static_cast<VekCore**>(data);
  capacityM = capacity;
  return true;
}

bool VekGenericArray::Add(VekCore* object) {
  if (countM == capacityM && !Grow()) return false;
  if (object != nullptr) object->UpRef();
  vDataM[countM++] = object;
  return true;
}

bool VekGenericArray::AddUnshared(VekCore* object) {
  if (countM == capacityM && !Grow()) return false;
  if (object != nullptr) object->UpRefUnshared();
  vDataM[countM++] = object;
  return true;
}

bool VekGenericArray::Set(int i, VekCore* object) {
  if (i < 0 || i >= countM) return false;
  if (object != nullptr) object->UpRef();
  VekCore* old = vDataM[i];
  vDataM[i] = object;
  if (old != nullptr) old->DownRef();
  return true;
}

bool VekGenericArray::RemoveAt(int i) {
  if (i < 0 || i >= countM) return false;
  VekCore* old = vDataM[i];
  std::memmove(vDataM + i, vDataM + i + 1, sizeof(VekCore*) * (countM - i - 1));
  --countM;
  if (old != nullptr) old->DownRef();
  return true;
}

bool VekGenericArray::Remove(const VekCore* object) {
  for (int i = 0; i < countM; ++i) {
    if (vDataM[i] == object) return RemoveAt(i);
  }
  return false;
}

void VekGenericArray::Clear() {
  // Detach first: releasing an element may run code that looks at this array.
  while (countM > 0) {
    VekCore* old = vDataM[--countM];
    if (old != nullptr) old->DownRef();
  }
}

void VekGenericArray::Destroy() {
  Clear();
  pMempoolM->Free(vDataM);
  vDataM = nullptr;
  capacityM = 0;
}

VekGenericIntArray::VekGenericIntArray(int width, VekMempool* pool, int initialCapacity)
    : pMempoolM(pool != nullptr ? pool : VekMempool::Default()), vDataM(nullptr), countM(0), capacityM(0),
      widthM(static_cast<uint8_t>(width)) {
  VekAssert(width == 1 || width == 4 || width == 8);
  (void)initialCapacity;
}

bool VekGenericIntArray::Grow() {
  if (capacityM == kMaxCount) return false;
  uint16_t capacity = NextCapacity(capacityM, 4);
  void* data = pMempoolM->Realloc(vDataM, static_cast<size_t>(widthM) * capacity);
  if (data == nullptr) return false;
  vDataM = static_cast<unsigned char*>(data);
  capacityM = capacity;
  return true;
}

bool VekGenericIntArray::Add(const void* element) {
  if (countM == capacityM && !Grow()) return false;
  std::memcpy(vDataM + static_cast<size_t>(countM) * widthM, element, widthM);
  ++countM;
  return true;
}

bool VekGenericIntArray::RemoveAt(int i) {
  if (i < 0 || i >= countM) return false;
  std::memmove(vDataM + static_cast<size_t>(i) * widthM, vDataM + static_cast<size_t>(i + 1) * widthM,
               static_cast<size_t>(countM - i - 1) * widthM);
  --countM;
  return true;
}

bool VekGenericIntArray::Remove(const void* element) {
  for (int i = 0; i < countM; ++i) {
    if (std::memcmp(vDataM + static_cast<size_t>(i) * widthM, element, widthM) == 0) return RemoveAt(i);
  }
  return false;
}

void VekGenericIntArray::Destroy() {
  countM = 0;
  pMempoolM->Free(vDataM);
  vDataM = nullptr;
  capacityM = 0;
}
