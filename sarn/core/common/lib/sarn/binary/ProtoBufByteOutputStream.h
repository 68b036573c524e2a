// ProtoBufByteOutputStream: the buffer the protocol-buffer writer writes into, which lets it write
// a nested message without knowing its length first.
//
// The writer opens a section, writes its content and closes it; Finish then makes one backward
// pass over the buffer and replaces every section by the varint of its finished length followed
// by its content. Sections are marked in-band, and the marker byte is escaped in the data:
//   0x01 0x64   section start (StartSection)
//   0x02 0x64   section end (EndSection)
//   0x64 0x64   one data byte 0x64, escaped (WriteByte doubles every 0x64)
//   other       itself
// Read from the end, every 0x64 is the second byte of a pair whose first byte says what it is.
// Markers take four bytes a section and a length takes at most four below 2^28 bytes, so the pass
// compacts the output into the tail of the buffer in place; only a section of 2^28 bytes or more
// needs bytes inserted.
//
// Memory: `bytesM` lives on the C heap (it is released with the stream) and grows by doubling
// from 1 byte. Running out of memory is the stream's only failure: the byte that did not fit and
// everything after it are dropped, IsOutOfMemory() turns true, and Finish then returns no bytes,
// so a caller that checks either never sends a truncated message.
//
// A stream is written once, finished once, read through the pointer Finish returns, and
// destroyed; it is not reused after Finish. Thread safety: none; one thread at a time.
#pragma once

#include <cstddef>

#include "sarn/base/Export.h"
#include "vek/VekString.h"

namespace sarn {

class SARN_EXPORT ProtoBufByteOutputStream {
 public:
  // The growable bytes: size, capacity and whether a growth ever failed.
  struct Bytes {
    unsigned char* pDataM = nullptr;
    size_t nSizeM = 0;
    size_t nCapacityM = 0;
    bool isOutOfMemoryM = false;
  };

  ProtoBufByteOutputStream() = default;
  ~ProtoBufByteOutputStream();
  ProtoBufByteOutputStream(const ProtoBufByteOutputStream&) = delete;
  ProtoBufByteOutputStream& operator=(const ProtoBufByteOutputStream&) = delete;

  // Appends b as it is: the markers use it, and WriteByte for data.
  void AppendByte(unsigned char b) {
    if (bytesM.nSizeM == bytesM.nCapacityM && !Grow(1)) return;
    bytesM.pDataM[bytesM.nSizeM++] = b;
  }
  // A data byte: appended, and appended once more when it is 0x64.
  void WriteByte(unsigned char b) {
    AppendByte(b);
    if (b == kMarker) AppendByte(b);
  }
  void WriteBytes(const unsigned char* data, unsigned long length);
  // Room for `more` bytes after the current size, so that a caller may append a few bytes without
  // a check each (the varint writers); false when memory ran out.
  bool Reserve(size_t more) { return bytesM.nCapacityM - bytesM.nSizeM >= more || Grow(more); }
  // A length-delimited string: a section holding the text's bytes.
  void WriteString(const VekString& text);
  void StartSection() {
    AppendByte(0x01);
    AppendByte(kMarker);
  }
  void EndSection() {
    AppendByte(0x02);
    AppendByte(kMarker);
  }

  // Resolves the sections and returns the finished bytes, which lie at the end of bytesM: `data`
  // stays valid until the stream is changed or destroyed. After a failed growth: null and 0.
  // Unbalanced sections still finish: an end without a start holds everything before it, and a
  // start without an end is dropped.
  void Finish(const unsigned char*& data, unsigned long& length);

  bool IsOutOfMemory() const { return bytesM.isOutOfMemoryM; }

  Bytes bytesM;

 private:
  static constexpr unsigned char kMarker = 0x64;

  // Doubles the capacity until `more` bytes fit; false (and out of memory from then on) otherwise.
  bool Grow(size_t more);
  // One section's content, backwards from `read`, up to and past its start marker (or the start
  // of the buffer); returns how many bytes had to be inserted into bytesM. Nested sections are
  // kept on an explicit stack, so the depth of the sections never becomes depth of the C stack.
  size_t FinishOneSection(size_t& read, size_t& write);
  // The varint of `length`, written backwards so that it reads forwards; returns the bytes inserted.
  size_t InsertLength(unsigned int length, size_t& read, size_t& write);
  // Puts b just before `write`, or inserts it at `write` when no room is left there (returns 1).
  size_t InsertByte(unsigned char b, size_t& read, size_t& write);
};

}  // namespace sarn
