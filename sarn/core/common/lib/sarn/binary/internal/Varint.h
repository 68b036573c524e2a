// AppendVarint: the varint writer that GoogleInt exports, inline for the protocol-buffer writer,
// which writes a tag and usually a varint value for every field and should not pay a call through
// the library's symbol table for each.
//
// It appends what WriteByte would append byte by byte, after one room check for the whole varint
// (ten bytes, each possibly doubled as the marker). Internal to the library. Thread safety: that
// of the stream.
#pragma once

#include <cstddef>

#include "sarn/binary/ProtoBufByteOutputStream.h"

namespace sarn {
namespace internal {

template <class U>
inline void AppendVarint(U value, ProtoBufByteOutputStream* out) {
  if (!out->Reserve(20)) return;
  unsigned char* bytes = out->bytesM.pDataM;
  size_t n = out->bytesM.nSizeM;
  while (value >= 0x80) {
    unsigned char byte = static_cast<unsigned char>((value & 0x7F) | 0x80);  // never the marker
    bytes[n++] = byte;
    value >>= 7;
  }
  bytes[n++] = static_cast<unsigned char>(value);
  if (value == 0x64) bytes[n++] = 0x64;
  out->bytesM.nSizeM = n;
}

inline void AppendZigZag32(int value, ProtoBufByteOutputStream* out) {
  unsigned int u = static_cast<unsigned int>(value);
  AppendVarint((u << 1) ^ (0u - (u >> 31)), out);
}

inline void AppendZigZag64(long long value, ProtoBufByteOutputStream* out) {
  unsigned long long u = static_cast<unsigned long long>(value);
  AppendVarint((u << 1) ^ (0ull - (u >> 63)), out);
}

}  // namespace internal
}  // namespace sarn
