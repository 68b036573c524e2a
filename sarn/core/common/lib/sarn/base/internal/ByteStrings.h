// Private helper: counted byte strings (vek::ByteBuffer) that the library fills in place.
//
// vek::ByteBuffer::Append reallocates to exactly the new length on every call, which suits a
// string filled once from a finished buffer. Decoders know an upper bound of their output in
// advance; they allocate it once, write straight into it and then cut the length to what they
// produced, instead of accumulating in a scratch buffer and copying.
#pragma once

#include <climits>
#include <cstddef>

#include "vek/VekByteString.h"

namespace sarn {
namespace internal {

class SizedByteString : public vek::ByteBuffer {
 public:
  explicit SizedByteString(VekMempool* pool) : vek::ByteBuffer(pool) {}
  // Sets the capacity and the length to `length` (new bytes zero) and returns the storage;
  // null when `length` is past the platform's 2 GiB or memory runs out.
  unsigned char* Resize(size_t length) {
    if (length > static_cast<size_t>(INT_MAX)) return nullptr;
    if (length > bytesM.capacityM && !bytesM.Realloc(static_cast<int>(length))) return nullptr;
    bytesM.lengthM = static_cast<uint32_t>(length);
    return bytesM.pDataM;
  }
  // Shortens the string; the capacity stays.
  void Truncate(size_t length) {
    if (length < bytesM.lengthM) bytesM.lengthM = static_cast<uint32_t>(length);
  }
};

// A new byte string of `length` bytes in `pool`, with `data` pointing at its storage; null
// (and `data` null) when it cannot be allocated.
inline ref<SizedByteString> NewSizedByteString(VekMempool* pool, size_t length, unsigned char*& data) {
  ref<SizedByteString> bytes(new (pool) SizedByteString(pool));
  data = nullptr;
  if (!bytes) return bytes;
  data = bytes->Resize(length);
  if (data == nullptr && length != 0) return ref<SizedByteString>();
  return bytes;
}

}  // namespace internal
}  // namespace sarn
