// Growable byte buffers.
//
// sarn::ByteBuffer      the accumulation buffer every text writer appends to (JSON, dictionary
//                       output, Base64, byte lists). A plain object for the stack or a member:
//                       not counted, not copyable. It owns one Vek1ByteBuffer.
// sarn::Vek1ByteBuffer  its storage: a counted VekByteString made in the buffer's pool, whose
//                       length is the capacity, and the count of bytes appended. Capacity grows
//                       by at least a fifth and at least 256 bytes and always keeps one spare
//                       byte, so appending stays linear: a new buffer appended to byte by byte
//                       reaches capacities 257, 514, 771, 1028, ...
// sarn::Vek1ByteBufferCore  a counted byte string (a vek::ByteBuffer) with append operations
//                       of its own: single bytes double the capacity (8, 16, 32, ...), runs
//                       reallocate to exactly the new length.
//
// Ownership and pools: a buffer's bytes live in the pool given to its constructor and are
// released by its destructor. GetData() stays valid until the next append.
//
// Out of memory: an append that cannot grow the storage fails the buffer for good. It drops
// what it held (GetLength() 0, GetData() null) and refuses every later append, so a writer that
// goes on appending after a failure never leaves a text with a piece missing in the middle;
// HasFailed() tells the writer's caller.
// Thread safety: none; one thread at a time per buffer.
#pragma once

#include <cstdint>
#include <cstring>

#include "sarn/base/Export.h"
#include "vek/VekByteString.h"
#include "vek/VekCore.h"

namespace sarn {

class SARN_EXPORT Vek1ByteBuffer {
 public:
  explicit Vek1ByteBuffer(VekMempool* pool);
  ~Vek1ByteBuffer();
  Vek1ByteBuffer(const Vek1ByteBuffer&) = delete;
  Vek1ByteBuffer& operator=(const Vek1ByteBuffer&) = delete;

  // Each append returns false, appending nothing, when the storage cannot grow (a total length
  // the platform cannot hold); when memory runs out it also fails the buffer (see above).
  bool AppendByte(unsigned char byte) {
    if (1 >= Capacity() - nUsedM && !Grow(1)) return false;
    bytesM->GetData()[nUsedM++] = byte;
    return true;
  }
  bool AppendBytes(const unsigned char* data, unsigned long length) {
    if (length == 0) return true;
    if (length > static_cast<unsigned long>(PTRDIFF_MAX)) return false;
    // Written as a difference so that a huge `length` cannot wrap the test (the capacity is
    // never below nUsedM).
    if (length >= Capacity() - nUsedM && !Grow(length)) return false;
    std::memcpy(bytesM->GetData() + nUsedM, data, length);
    nUsedM += length;
    return true;
  }
  // Makes room for `length` more bytes at once, growing as AppendBytes of that many would, so
  // that a writer that knows its output size grows once instead of step by step.
  bool Reserve(unsigned long length) {
    if (length > static_cast<unsigned long>(PTRDIFF_MAX)) return false;
    return length < Capacity() - nUsedM || Grow(length);
  }
  // Null while nothing was ever appended, and after a failure.
  const unsigned char* GetData() const { return bytesM ? bytesM->GetData() : nullptr; }
  unsigned long GetLength() const { return static_cast<unsigned long>(nUsedM); }
  // True once an append ran out of memory; the buffer is then empty for good.
  bool HasFailed() const { return isFailedM; }
  // Fails the buffer as an append that runs out of memory does: for a writer whose piece of
  // text could not be made.
  void Fail();

  ref<VekByteString> bytesM;  // its length is the capacity; null when it could not be made
  uint64_t nUsedM;            // bytes appended: the first nUsedM bytes of bytesM

 private:
  unsigned long Capacity() const { return bytesM ? bytesM->GetLength() : 0; }
  // Sets the capacity to c + n + max(c / 5, 256) for the current capacity c.
  bool Grow(unsigned long n);
  VekMempool* pMempoolM;  // where bytesM is made again when it could not be made at first
  bool isFailedM;
};

class SARN_EXPORT ByteBuffer {
 public:
  explicit ByteBuffer(VekMempool* pool) : bufferM(pool) {}
  virtual ~ByteBuffer();
  ByteBuffer(const ByteBuffer&) = delete;
  ByteBuffer& operator=(const ByteBuffer&) = delete;

  // Appends return false, appending nothing, when the storage cannot grow.
  bool AppendByte(unsigned char byte) { return bufferM.AppendByte(byte); }
  bool AppendBytes(const unsigned char* data, unsigned long length) { return bufferM.AppendBytes(data, length); }
  // The bytes of `text` up to its NUL (not included), one at a time; null appends nothing.
  bool AppendString(const char* text);
  // Makes room for `length` more bytes at once (see Vek1ByteBuffer::Reserve).
  bool Reserve(unsigned long length) { return bufferM.Reserve(length); }
  const unsigned char* GetData() const { return bufferM.GetData(); }
  unsigned long GetLength() const { return bufferM.GetLength(); }
  // True once an append ran out of memory: what was written is lost and the writer failed.
  bool HasFailed() const { return bufferM.HasFailed(); }
  void Fail() { bufferM.Fail(); }

  Vek1ByteBuffer bufferM;
};

class SARN_EXPORT Vek1ByteBufferCore : public vek::ByteBuffer {
 public:
  // Allocate with the counted new; the storage comes from the object's pool.
  Vek1ByteBufferCore();
  ~Vek1ByteBufferCore() override;

  unsigned int GetLength() const { return bytesM.lengthM; }
  // Equal lengths and equal bytes; false for null.
  bool FEqual(const Vek1ByteBufferCore* other) const;
  // When the length reaches the capacity, reallocates to twice the length (at least 8 bytes).
  bool AppendByte(unsigned char byte);
  // Reallocates to exactly the new length; only the low 32 bits of `length` count, as in the
  // platform's 32-bit lengths. False, appending nothing, past 2 GiB or out of memory.
  bool AppendBytes(const unsigned char* data, unsigned long length);
};

}  // namespace sarn
