// Dict: the reference-counted facade over a Dictionary, and the scalar text conventions of the
// whole library (booleans, integers, floats, long identifiers, byte strings).
//
// Scalar text conversions (the static Parse* and Format* members) need no dictionary: they are
// functions of their arguments and of the constant long-identifier prefix table. Only the
// byte-string conversions use their pool; the other results are plain strings. No parser
// reports failure separately: malformed text gives 0 (0.0, false), like a parsed zero. All of
// them are reentrant.
//
// A long identifier is a 64-bit number whose top 16 bits hold a prefix code (0 for none) and
// whose low 48 bits hold the number; its text is "prefix.number" ("tms.ep.12") or the plain
// number.
#pragma once

#include "sarn/Export.h"
#include "vek/VekByteString.h"
#include "vek/VekCore.h"
#include "vek/VekString.h"

namespace sarn {

struct LongIdPrefix {
  const char* pPrefixM;
  unsigned int codeM;  // the top 16 bits of the identifier
};
// rs 1, ts 2, bs 3, tms.ep 5, tms.sh 6, tms.mv 7, tms.sp 8, vp 9, dlna 10, vod 16384; searched
// in this order.
constexpr int nLongIdPrefixesG = 10;
SARN_EXPORT extern const LongIdPrefix longIdPrefixesG[nLongIdPrefixesG];

class SARN_EXPORT Dict : public VekCore {
 public:
  // ---- Scalar text conversions -------------------------------------------------------------
  static VekString FormatBool(VekMempool* pool, bool value);  // "true" or "false"
  static VekString FormatS32(VekMempool* pool, int value);
  static VekString FormatS64(VekMempool* pool, long long value);
  static VekString FormatU32(VekMempool* pool, unsigned int value);
  static VekString FormatU64(VekMempool* pool, unsigned long long value);
  // "%1.8g", with ".0" appended when that holds no '.': 1.0, 0.1, 1.2345679e+08, 1e+20.0.
  static VekString FormatFloat(VekMempool* pool, double value);
  // "prefix.number" for a known prefix code, "xxx.number" for an unknown one, the plain number
  // when the top 16 bits are 0.
  static VekString FormatLongId(VekMempool* pool, unsigned long long id);
  // The Base64 text of the bytes.
  static VekString FormatBytestring(VekMempool* pool, const ref<vek::ByteBuffer>& bytes);

  // True only for the exact text "true".
  static bool ParseBool(VekMempool* pool, const VekString& text);
  // '-' or a digit first, then base-10 digits to the end of the text; saturates at the 64-bit
  // limits. ParseS32 keeps the low 32 bits of that, without a range check.
  static int ParseS32(VekMempool* pool, const VekString& text);
  static long long ParseS64(VekMempool* pool, const VekString& text);
  // One or more ASCII digits and nothing else (null is 0); wraps modulo 2^64 on overflow.
  static unsigned long long ParseU64(VekMempool* pool, const char* text);
  // ParseU64, then 0 when the value does not fit 32 bits.
  static unsigned int ParseU32(VekMempool* pool, const char* text);
  // sscanf "%lg"; 0.0 when nothing converts.
  static double ParseFloat(VekMempool* pool, const VekString& text);
  // The inverse of FormatLongId: the prefix before the last '.' must be a known one (else 0);
  // the number after it is ParseU64 of the rest.
  static unsigned long long ParseLongId(VekMempool* pool, const char* text);
  // The bytes of Base64 text; never null, empty when the text does not decode.
  static ref<vek::ByteBuffer> ParseBytestring(VekMempool* pool, const VekString& text);
};

}  // namespace sarn
