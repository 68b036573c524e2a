// Counted byte strings.
//
// VekByteString     a growable byte string whose length the owner sets (SetLength keeps the
//                   bytes in front and zeroes new ones; SetLengthUnfilled leaves new ones
//                   unwritten); storage comes from the object's pool.
// vek::ByteBuffer   the counted byte string that holds byte-string values and finished binary
//                   results. Derivable: the storage (vek::SizedObjectArray<1, VekMempool>:
//                   pool, data, capacity, length) is a protected member that a derived class
//                   grows with Realloc. Append reallocates to exactly the new length (at
//                   least 8 bytes), so it suits byte strings filled once; the growable writers
//                   of the library grow geometrically on their own.
#pragma once

#include <cstddef>
#include <cstdint>

#include "vek/VekCore.h"

class VekByteString : public VekCore {
 public:
  VekByteString();
  ~VekByteString() override;
  // New bytes are zero. False (nothing changed) when memory runs out.
  bool SetLength(unsigned long length);
  // As SetLength, but new bytes are left unwritten: for an owner that tracks which bytes it has
  // written and reads no others (a growable buffer's spare room, which it fills by appending).
  bool SetLengthUnfilled(unsigned long length);
  // Offsets must lie inside the current length (asserted).
  void SetByte(unsigned long offset, unsigned char byte);
  void SetBytes(unsigned long offset, unsigned long count, const unsigned char* bytes);
  unsigned char* GetData() const { return pDataM; }
  unsigned long GetLength() const { return lengthM; }

 private:
  bool Resize(unsigned long length, bool isZeroFilled);

  unsigned char* pDataM;
  unsigned long lengthM;
};

namespace vek {

template <int N, class Pool>
class SizedObjectArray;

// Storage of N-byte elements in a pool: pool, data (null while empty), capacity, length.
template <>
class SizedObjectArray<1, VekMempool> {
 public:
  explicit SizedObjectArray(VekMempool* pool)
      : pMempoolM(pool != nullptr ? pool : VekMempool::Default()), pDataM(nullptr), capacityM(0), lengthM(0) {}
  ~SizedObjectArray() { pMempoolM->Free(pDataM); }
  SizedObjectArray(const SizedObjectArray&) = delete;
  SizedObjectArray& operator=(const SizedObjectArray&) = delete;

  // Allocates a zeroed block of max(k, 8) bytes, copies the first `lengthM` bytes into it,
  // frees the old block and sets the capacity. False (nothing changed) when k is negative,
  // smaller than the length, or memory runs out.
  bool Realloc(int k);

  VekMempool* pMempoolM;
  unsigned char* pDataM;
  uint32_t capacityM;
  uint32_t lengthM;
};

class ByteBuffer : public VekCore {
 public:
  explicit ByteBuffer(VekMempool* pool);
  ~ByteBuffer() override;

  // Null when memory runs out.
  static ref<ByteBuffer> New(VekMempool* pool);
  static ref<ByteBuffer> New(VekMempool* pool, const void* data, size_t length);

  // Appends `length` bytes; false (nothing changed) past 2 GiB or when memory runs out.
  bool Append(const void* data, size_t length);
  const unsigned char* GetData() const { return bytesM.pDataM; }
  size_t GetLength() const { return bytesM.lengthM; }
  size_t GetCapacity() const { return bytesM.capacityM; }

 protected:
  SizedObjectArray<1, VekMempool> bytesM;
};

}  // namespace vek
