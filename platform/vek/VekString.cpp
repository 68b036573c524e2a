#include "vek/VekString.h"

#include <algorithm>
#include <cstdarg>
#include <cstdio>
#include <new>

#include "vek/VekServices.h"

VekStringRepN* VekString::NewRep(VekMempool* pool, size_t nByte) {
  if (pool == nullptr) pool = VekMempool::Default();
  // Lengths are 32-bit in the representation; a larger text is refused rather than wrapped.
  if (nByte > UINT32_MAX - sizeof(VekStringRepN) - 1) return nullptr;
  void* memory = pool->Malloc(sizeof(VekStringRepN) + nByte + 1);
  if (memory == nullptr) return nullptr;
  VekStringRepN* rep = static_cast<VekStringRepN*>(memory);
  new (&rep->refCountM) std::atomic<uint32_t>(1);
  rep->nByteM = static_cast<uint32_t>(nByte);
  rep->poolAndOffsetM = reinterpret_cast<uintptr_t>(pool);
  rep->Data()[nByte] = '\0';
  return rep;
}

VekString VekString::Embed(VekMempool* pool, void* block, size_t offset, size_t nByte, const void* bytes) {
  VekAssert(offset % 8 == 0 && offset <= VekStringRepN::kMaxEmbedOffset && nByte != 0 && nByte <= UINT32_MAX);
  VekStringRepN* rep = reinterpret_cast<VekStringRepN*>(static_cast<char*>(block) + offset);
  new (&rep->refCountM) std::atomic<uint32_t>(2);
  rep->nByteM = static_cast<uint32_t>(nByte);
  rep->poolAndOffsetM = reinterpret_cast<uintptr_t>(pool != nullptr ? pool : VekMempool::Default()) | offset / 8;
  std::memcpy(rep->Data(), bytes, nByte);
  rep->Data()[nByte] = '\0';
  VekString result;
  result.pRepM = rep;
  return result;
}

VekString::VekString(const char* text) : pRepM(nullptr) {
  if (text == nullptr || *text == '\0') return;
  size_t n = std::strlen(text);
  pRepM = NewRep(nullptr, n);
  if (pRepM != nullptr) std::memcpy(pRepM->Data(), text, n);
}

VekString VekString::FromUtf8Bytes(VekMempool* pool, size_t nByte, const void* bytes) {
  VekString result;
  if (nByte == 0) return result;
  result.pRepM = NewRep(pool, nByte);
  if (result.pRepM != nullptr) std::memcpy(result.pRepM->Data(), bytes, nByte);
  return result;
}

VekString VekString::Format(VekMempool* pool, const char* format, ...) {
  char stackText[256];
  va_list args;
  va_start(args, format);
  int n = std::vsnprintf(stackText, sizeof stackText, format, args);
  va_end(args);
  if (n <= 0) return VekString();
  if (n < static_cast<int>(sizeof stackText)) return FromUtf8Bytes(pool, static_cast<size_t>(n), stackText);
  VekString result;
  result.pRepM = NewRep(pool, static_cast<size_t>(n));
  if (result.pRepM == nullptr) return result;
  va_start(args, format);
  std::vsnprintf(result.pRepM->Data(), static_cast<size_t>(n) + 1, format, args);
  va_end(args);
  return result;
}

bool VekString::FEqual(const VekString& other) const {
  if (pRepM == other.pRepM) return true;
  size_t n = NByte();
  return n == other.NByte() && std::memcmp(Utf8(), other.Utf8(), n) == 0;
}

bool VekString::FEqual(const char* text) const {
  if (text == nullptr) return FEmpty();
  size_t n = std::strlen(text);
  return n == NByte() && std::memcmp(Utf8(), text, n) == 0;
}

namespace {
// Byte position of the first `needle` in `hay` at or after `startPos`, or -1. memchr finds
// candidates for the first byte so that long texts without it are skipped quickly.
long FindBytes(const char* hay, long size, const char* needle, long nNeedle, long startPos) {
  if (startPos < 0) startPos = 0;
  if (startPos > size || nNeedle > size - startPos) return -1;
  if (nNeedle == 0) return startPos;
  for (long i = startPos; i + nNeedle <= size;) {
    const void* hit = std::memchr(hay + i, needle[0], static_cast<size_t>(size - nNeedle + 1 - i));
    if (hit == nullptr) return -1;
    i = static_cast<const char*>(hit) - hay;
    if (std::memcmp(hay + i, needle, static_cast<size_t>(nNeedle)) == 0) return i;
    ++i;
  }
  return -1;
}
}  // namespace

long VekString::FindString(const VekString& needle, long startPos) const {
  return FindBytes(Utf8(), static_cast<long>(NByte()), needle.Utf8(), static_cast<long>(needle.NByte()), startPos);
}

long VekString::FindString(const char* needle, long startPos) const {
  if (needle == nullptr) needle = "";
  return FindBytes(Utf8(), static_cast<long>(NByte()), needle, static_cast<long>(std::strlen(needle)), startPos);
}

VekString VekString::Slice(long startPos, long endPos) const {
  long size = static_cast<long>(NByte());
  startPos = std::clamp(startPos, 0L, size);
  endPos = std::clamp(endPos, startPos, size);
  if (startPos == 0 && endPos == size) return *this;
  return FromUtf8Bytes(GetMempool(), static_cast<size_t>(endPos - startPos), Utf8() + startPos);
}

VekString VekString::Left(long pos) const { return Slice(0, pos); }
VekString VekString::Right(long pos) const { return Slice(pos, static_cast<long>(NByte())); }
VekString VekString::Middle(long startPos, long endPos) const { return Slice(startPos, endPos); }

long VekString::AdvancePos(long pos, long count) const {
  long size = static_cast<long>(NByte());
  pos = std::clamp(pos, 0L, size);
  if (count < 0) count = 0;
  return count > size - pos ? size : pos + count;
}

long VekString::GetCharacterPos(long index) const { return std::clamp(index, 0L, static_cast<long>(NByte())); }

VekStringArray::VekStringArray(VekMempool* pool)
    : pMempoolM(pool != nullptr ? pool : VekMempool::Default()), vDataM(nullptr), countM(0), capacityM(0),
      lockOwnerM(0) {}

bool VekStringArray::Grow() {
  if (capacityM == kMaxCount) return false;
  uint32_t wanted = capacityM == 0 ? 4 : static_cast<uint32_t>(capacityM) * 2;
  uint16_t capacity = static_cast<uint16_t>(std::min<uint32_t>(wanted, kMaxCount));
  VekString* data = static_cast<VekString*>(pMempoolM->Malloc(sizeof(VekString) * capacity));
  if (data == nullptr) return false;
  // VekString is one pointer with no self-reference, so moving the bytes moves the strings.
  if (countM != 0) std::memcpy(static_cast<void*>(data), vDataM, sizeof(VekString) * countM);
  pMempoolM->Free(vDataM);
  vDataM = data;
  capacityM = capacity;
  return true;
}

bool VekStringArray::Add(const VekString& text) {
  if (countM == capacityM && !Grow()) return false;
  new (&vDataM[countM]) VekString(text);
  ++countM;
  return true;
}

bool VekStringArray::RemoveAt(int i) {
  if (i < 0 || i >= countM) return false;
  vDataM[i].~VekString();
  std::memmove(static_cast<void*>(vDataM + i), vDataM + i + 1, sizeof(VekString) * (countM - i - 1));
  --countM;
  return true;
}

bool VekStringArray::Remove(const VekString& text) {
  for (int i = 0; i < countM; ++i) {
    if (vDataM[i].FEqual(text)) return RemoveAt(i);
  }
  return false;
}

void VekStringArray::Sort() {
  std::sort(vDataM, vDataM + countM, [](const VekString& a, const VekString& b) {
    size_t na = a.NByte(), nb = b.NByte();
    int c = std::memcmp(a.Utf8(), b.Utf8(), std::min(na, nb));
    return c != 0 ? c < 0 : na < nb;
  });
}

void VekStringArray::Clear() {
  for (int i = countM - 1; i >= 0; --i) vDataM[i].~VekString();
  countM = 0;
}

void VekStringArray::Destroy() {
  Clear();
  pMempoolM->Free(vDataM);
  vDataM = nullptr;
  capacityM = 0;
}
