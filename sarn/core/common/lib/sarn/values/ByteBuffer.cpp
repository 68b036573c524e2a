#include "sarn/values/ByteBuffer.h"

#include <climits>

namespace sarn {

Vek1ByteBuffer::Vek1ByteBuffer(VekMempool* pool)
    : bytesM(new (pool) VekByteString()), nUsedM(0), pDataM(nullptr), capacityM(0), pMempoolM(pool), isFailedM(false) {}

Vek1ByteBuffer::~Vek1ByteBuffer() {}

bool Vek1ByteBuffer::Grow(unsigned long n) {
  if (isFailedM) return false;
  unsigned long capacity = capacityM;
  unsigned long extra = capacity / 5 > 256 ? capacity / 5 : 256;
  // The sum must not wrap: a wrapped capacity would be smaller than what is appended.
  if (n > ULONG_MAX - capacity - extra) return false;
  if (!bytesM) bytesM = new (pMempoolM) VekByteString();
  // The spare room is written by the appends before anything reads it (GetData covers only
  // the nUsedM bytes appended), so growing need not zero it first.
  if (bytesM && bytesM->SetLengthUnfilled(capacity + n + extra)) {
    pDataM = bytesM->GetData();
    capacityM = bytesM->GetLength();
    return true;
  }
  Fail();
  return false;
}

void Vek1ByteBuffer::Fail() {
  // Keeping the bytes would let a later, smaller append succeed behind the missing piece.
  isFailedM = true;
  bytesM = nullptr;
  pDataM = nullptr;
  capacityM = 0;
  nUsedM = 0;
}

ByteBuffer::~ByteBuffer() {}

bool ByteBuffer::AppendString(const char* text) {
  if (text == nullptr) return true;
  // One byte at a time on purpose: the growth steps are those of single-byte appends.
  for (const char* p = text; *p != '\0'; ++p) {
    if (!bufferM.AppendByte(static_cast<unsigned char>(*p))) return false;
  }
  return true;
}

Vek1ByteBufferCore::Vek1ByteBufferCore() : vek::ByteBuffer(nullptr) {}

Vek1ByteBufferCore::~Vek1ByteBufferCore() {}

bool Vek1ByteBufferCore::FEqual(const Vek1ByteBufferCore* other) const {
  if (other == nullptr || other->bytesM.lengthM != bytesM.lengthM) return false;
  return bytesM.lengthM == 0 || std::memcmp(bytesM.pDataM, other->bytesM.pDataM, bytesM.lengthM) == 0;
}

bool Vek1ByteBufferCore::AppendByte(unsigned char byte) {
  if (bytesM.lengthM == bytesM.capacityM) {
    if (bytesM.lengthM > static_cast<uint32_t>(INT_MAX) / 2) return false;
    if (!bytesM.Realloc(static_cast<int>(2 * bytesM.lengthM))) return false;
  }
  bytesM.pDataM[bytesM.lengthM++] = byte;
  return true;
}

bool Vek1ByteBufferCore::AppendBytes(const unsigned char* data, unsigned long length) {
  uint32_t n = static_cast<uint32_t>(length);
  if (n == 0) return true;
  if (n > static_cast<uint32_t>(INT_MAX) - bytesM.lengthM) return false;
  if (!bytesM.Realloc(static_cast<int>(bytesM.lengthM + n))) return false;
  std::memcpy(bytesM.pDataM + bytesM.lengthM, data, n);
  bytesM.lengthM += n;
  return true;
}

}  // namespace sarn
