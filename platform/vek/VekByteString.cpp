#include "vek/VekByteString.h"

#include <climits>
#include <cstring>

#include "vek/VekServices.h"

VekByteString::VekByteString() : pDataM(nullptr), lengthM(0) {}

VekByteString::~VekByteString() { GetMempool()->Free(pDataM); }

bool VekByteString::SetLength(unsigned long length) { return Resize(length, true); }

bool VekByteString::SetLengthUnfilled(unsigned long length) { return Resize(length, false); }

bool VekByteString::Resize(unsigned long length, bool isZeroFilled) {
  if (length == lengthM) return true;
  if (length == 0) {
    GetMempool()->Free(pDataM);
    pDataM = nullptr;
    lengthM = 0;
    return true;
  }
  void* data = GetMempool()->Realloc(pDataM, length);
  if (data == nullptr) return false;
  pDataM = static_cast<unsigned char*>(data);
  if (isZeroFilled && length > lengthM) std::memset(pDataM + lengthM, 0, length - lengthM);
  lengthM = length;
  return true;
}

void VekByteString::SetByte(unsigned long offset, unsigned char byte) {
  VekAssert(offset < lengthM);
  pDataM[offset] = byte;
}

void VekByteString::SetBytes(unsigned long offset, unsigned long count, const unsigned char* bytes) {
  VekAssert(offset <= lengthM && count <= lengthM - offset);
  if (count != 0) std::memcpy(pDataM + offset, bytes, count);
}

namespace vek {

bool SizedObjectArray<1, VekMempool>::Realloc(int k) {
  if (k < 0 || static_cast<uint32_t>(k) < lengthM) return false;
  uint32_t capacity = k < 8 ? 8 : static_cast<uint32_t>(k);
  unsigned char* data = static_cast<unsigned char*>(pMempoolM->Calloc(capacity));
  if (data == nullptr) return false;
  if (lengthM != 0) std::memcpy(data, pDataM, lengthM);
  pMempoolM->Free(pDataM);
  pDataM = data;
  capacityM = capacity;
  return true;
}

ByteBuffer::ByteBuffer(VekMempool* pool) : bytesM(pool != nullptr ? pool : GetMempool()) {}

ByteBuffer::~ByteBuffer() {}

ref<ByteBuffer> ByteBuffer::New(VekMempool* pool) { return ref<ByteBuffer>(new (pool) ByteBuffer(pool)); }

ref<ByteBuffer> ByteBuffer::New(VekMempool* pool, const void* data, size_t length) {
  ref<ByteBuffer> buffer = New(pool);
  if (!buffer || (length != 0 && !buffer->Append(data, length))) return ref<ByteBuffer>();
  return buffer;
}

bool ByteBuffer::Append(const void* data, size_t length) {
  if (length == 0) return true;
  if (length > static_cast<size_t>(INT_MAX) - bytesM.lengthM) return false;
  if (!bytesM.Realloc(static_cast<int>(bytesM.lengthM + length))) return false;
  std::memcpy(bytesM.pDataM + bytesM.lengthM, data, length);
  bytesM.lengthM += static_cast<uint32_t>(length);
  return true;
}

}  // namespace vek
