// JSON text primitives: writing one string as a JSON token, reading one string or bare token
// back, and the two input cursors of the hand-written JSON readers.
//
// Backslash-u escapes are never converted: a reader keeps the six characters of such an escape
// in the text as they are, and the writer passes a backslash followed by 'u' through without
// doubling it, so the escape comes out as it went in. All other bytes, UTF-8 included, pass
// through unchanged. Whitespace is exactly TAB, LF, CR and SPACE.
//
// InputPointer            a cursor over a byte range the caller owns and keeps alive while
//                         reading; the range need not end with NUL. pCurM never passes pEndM.
// InputPointerBytesource  a buffered cursor over a wynbaselib::Bytesource it does not own, or
//                         over a byte range in memory. About 16 KB: build it on the stack. It
//                         reads blocks of 16,384 bytes as it needs them and can echo the bytes
//                         it consumes to a sink.
//
// Strings read are made in the pool passed to the reader. Everything here is reentrant and
// takes no lock; a cursor and its source belong to one reader at a time.
#pragma once

#include <cstddef>
#include <cstdint>

#include "sarn/values/ByteBuffer.h"
#include "sarn/base/Export.h"
#include "vek/VekHash.h"
#include "vek/VekString.h"
#include "wynbaselib/Bytestream.h"

namespace sarn {

struct SARN_EXPORT InputPointer {
  InputPointer() : pCurM(nullptr), pEndM(nullptr) {}
  InputPointer(const unsigned char* data, size_t length) : pCurM(data), pEndM(data + length) {}

  // Advances past TAB, LF, CR and SPACE.
  void SkipWhitespace() {
    while (pCurM != pEndM && (*pCurM == ' ' || *pCurM == '\n' || *pCurM == '\r' || *pCurM == '\t')) ++pCurM;
  }

  const unsigned char* pCurM;  // the next byte to read
  const unsigned char* pEndM;  // one past the last byte
};

struct SARN_EXPORT InputPointerBytesource {
  static constexpr size_t kBlockBytes = 16384;

  // Over a byte source: the first access reads the first block.
  explicit InputPointerBytesource(wynbaselib::Bytesource* source);
  // Over bytes in memory that the caller keeps alive; no source is ever read.
  InputPointerBytesource(const unsigned char* data, size_t length);
  InputPointerBytesource(const InputPointerBytesource&) = delete;
  InputPointerBytesource& operator=(const InputPointerBytesource&) = delete;

  // Echoes the pending bytes, then reads the next block. False at the end of the input.
  bool Refill();
  // The next byte, or 0 at the end of the input (a NUL byte reads the same).
  char Peek() {
    if (pCurM == pEndM && !Refill()) return 0;
    return static_cast<char>(*pCurM);
  }
  // Consumes and returns the next byte, or 0 at the end of the input.
  char Next() {
    if (pCurM == pEndM && !Refill()) return 0;
    return static_cast<char>(*pCurM++);
  }
  void SkipWhitespace();
  // Every byte the source has delivered so far, consumed or not.
  uint64_t BytesDelivered() const { return nEarlierBytesM + nLastReadM; }

  // From now on every consumed byte is also written to `sink`, in order, across blocks.
  void StartEcho(wynbaselib::Bytesink* sink);
  // Writes the bytes consumed since the last echo and stops echoing. False when the sink
  // refused bytes at any point of the echo.
  bool StopEcho();

  wynbaselib::Bytesource* pSourceM;
  unsigned char bufferM[kBlockBytes];
  const unsigned char* pCurM;   // the unread part of the current block
  const unsigned char* pEndM;
  uint64_t nLastReadM;          // bytes delivered by the most recent read
  uint64_t nEarlierBytesM;      // bytes delivered by all reads before it
  bool fMoreM;                  // the source may still be read
  bool fEchoM;                  // consumed bytes are copied to pEchoSinkM
  const unsigned char* pEchoStartM;  // first byte of the block not yet echoed
  wynbaselib::Bytesink* pEchoSinkM;
  bool wasEchoFailedM;            // a Write to the echo sink returned false

 private:
  void FlushEcho();
};

namespace Json {

// Appends the JSON form of `text` to `out`. The text goes without quotes when `fBareAllowed`
// is true, it is not empty and every byte up to its first NUL is an ASCII letter, digit or
// '-'; otherwise in double quotes. Both overloads write the same bytes. False when the buffer
// could not grow or the sink refused a write.
SARN_EXPORT bool StringToJson(const VekString& text, bool fBareAllowed, ByteBuffer& out);
SARN_EXPORT bool StringToJson(const VekString& text, bool fBareAllowed, wynbaselib::Bytesink& out);

// The byte a one-letter escape stands for (" / \ b f n r t); false for any other letter.
SARN_EXPORT bool EscapedCharToChar(char escaped, char& result);

// Reads one quoted string or bare token (a run of letters, digits, '+', '-', '.', possibly
// empty) after skipping whitespace. A quoted string may end at the end of the range without a
// closing quote. Fails on a NUL in a quoted string, an unknown escape, or a backslash as the
// last byte; the cursor then rests at the offending byte. With `internTable`, a text that the
// table maps to a non-empty string gives that stored string (the table is not modified). When
// memory runs out it fails with the cursor back where the text starts (its opening quote, where
// malformed text never fails), so the caller can tell the two apart.
SARN_EXPORT bool JsonToString(VekMempool* mempool, VekHashStringToStringNew* internTable, InputPointer& input,
                              VekString& result);

}  // namespace Json

}  // namespace sarn

// The same grammar over a byte source, except that a quoted string must be closed, and a bare
// token also ends at a NUL byte. `internTable` is not consulted (callers pass null).
SARN_EXPORT bool JsonBytesourceToString(VekMempool* mempool, VekHashStringToStringNew* internTable,
                                        sarn::InputPointerBytesource& input, VekString& result);
