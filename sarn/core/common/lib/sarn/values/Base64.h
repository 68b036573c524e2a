// Base64 with a choice of code set, and hexadecimal byte lists.
//
// Base64      a codec built from 64 code characters and a padding character. The library's
//             own conversions (EncodeBase64, DecodeBase64, and through them the byte-string
//             text of dictionaries and objects) use DEFAULT_CODE_SET with '='. Immutable after
//             construction, so one codec may serve several threads at once.
// Byte lists  "01 AB " text: two upper-case hexadecimal digits and a space per byte.
//
// Results are new strings and byte strings in the pool passed in; the caller owns them.
#pragma once

#include "sarn/base/Export.h"
#include "vek/VekByteString.h"
#include "vek/VekCore.h"
#include "vek/VekString.h"

namespace sarn {

class SARN_EXPORT Base64 {
 public:
  static const char DEFAULT_CODE_SET[];
  static const unsigned char DEFAULT_TERMINATOR;
  static const char YAHOO_CODE_SET[];
  static const unsigned char YAHOO_TERMINATOR;

  // `codeSet` must hold 64 distinct characters, none of them NUL or the terminator. Any other
  // code set (null, shorter, a repeat, the terminator inside) is rejected: fBadCodeSetM is set,
  // Encode gives an empty text and Decode fails.
  Base64(const char* codeSet, unsigned char terminator);

  // `output` becomes a new byte string in `pool` with the text; an empty or null input gives
  // an empty text. `output` becomes null when the text would pass 2 GiB or memory runs out.
  void Encode(VekMempool* pool, const ref<vek::ByteBuffer>& input, ref<vek::ByteBuffer>& output) const;
  // On success `output` becomes a new byte string with the bytes (an empty or null input gives
  // an empty one). Fails, leaving `output` untouched, on a length that is not a multiple of 4,
  // a character outside the code set, or padding anywhere but in the last group. In the last
  // group, the character after a padding character is not examined.
  bool Decode(VekMempool* pool, const ref<vek::ByteBuffer>& input, ref<vek::ByteBuffer>& output) const;

  unsigned char codesM[64];    // the character of each 6-bit value
  unsigned char decodeM[256];  // the 6-bit value of each byte, 255 outside the code set
  bool fBadCodeSetM;
  unsigned char terminatorM;   // the padding character
};

// The default codec's text of `bytes` (null counts as empty).
SARN_EXPORT VekString EncodeBase64(VekMempool* pool, const ref<vek::ByteBuffer>& bytes);
// The default codec's bytes of `text`: a text that does not decode gives an empty byte string,
// as does the empty text. Null only when memory runs out.
SARN_EXPORT ref<vek::ByteBuffer> DecodeBase64(VekMempool* pool, const VekString& text);

// "%02X " for every byte, the space also after the last one.
SARN_EXPORT VekString FormatBytes(VekMempool* pool, const VekString& bytes);
SARN_EXPORT VekString FormatBytesFromBytestring(VekMempool* pool, const ref<vek::ByteBuffer>& bytes);

// The inverse, never failing: tokens between TAB, LF, CR and SPACE are read as strtol(token,
// nullptr, 16) and the low 8 bits of each appended, so "1FF" gives 0xFF and "zz" gives 0.
// A token also ends at a NUL or any other isspace byte; such a delimiter is skipped.
SARN_EXPORT VekString ParseBytes(VekMempool* pool, const VekString& text);
SARN_EXPORT ref<vek::ByteBuffer> ParseBytesToBytestring(VekMempool* pool, const VekString& text);

}  // namespace sarn
