// GoogleInt: the base-128 variable-length integers of the protocol-buffer encoding, signed values
// in zig-zag form (0, -1, 1, -2, 2 become 0, 1, 2, 3, 4).
//
// A varint holds the value's bits in groups of 7, least significant group first, one group a byte;
// every byte but the last has its top bit set. A 32-bit value takes 1 to 5 bytes, a 64-bit value
// 1 to 10.
//
// The readers take untrusted input: they never read at or past `end`, refuse a varint longer than
// 5 (32-bit) or 10 (64-bit) bytes, and drop the bits of the last byte that do not fit without
// complaint. On failure they return false and leave `*cursor` and `*value` unchanged.
//
// Thread safety: no state; every function is reentrant.
#pragma once

#include "sarn/base/Export.h"

namespace sarn {

class ProtoBufByteOutputStream;

class SARN_EXPORT GoogleInt {
 public:
  // The varint of the value, each byte through ProtoBufByteOutputStream::WriteByte.
  static void WriteGoogleU32(unsigned int value, ProtoBufByteOutputStream* out);
  static void WriteGoogleU64(unsigned long long value, ProtoBufByteOutputStream* out);
  // The varint of the value's zig-zag form.
  static void WriteGoogleS32(int value, ProtoBufByteOutputStream* out);
  static void WriteGoogleS64(long long value, ProtoBufByteOutputStream* out);

  static bool ReadGoogleU32(const unsigned char** cursor, const unsigned char* end, unsigned int* value);
  static bool ReadGoogleU64(const unsigned char** cursor, const unsigned char* end, unsigned long long* value);
  // The unsigned varint with the zig-zag form undone.
  static bool ReadGoogleS32(const unsigned char** cursor, const unsigned char* end, int* value);
  static bool ReadGoogleS64(const unsigned char** cursor, const unsigned char* end, long long* value);
};

}  // namespace sarn
