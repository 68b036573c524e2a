#include "sarn/binary/ProtoBufByteOutputStream.h"

#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <initializer_list>

namespace sarn {

namespace {

// A frame per open nested section during Finish: where its content ended (`write` when its end
// marker was met) and the insertions counted by the enclosing level so far.
// Whether any byte of the word is the marker 0x64 (the classic zero-byte test on word ^ marker).
inline bool HasMarkerByte(uint64_t word) {
  uint64_t x = word ^ 0x6464646464646464ull;
  return ((x - 0x0101010101010101ull) & ~x & 0x8080808080808080ull) != 0;
}

struct OpenSection {
  size_t endM;
  size_t insertedM;
};

}  // namespace

ProtoBufByteOutputStream::~ProtoBufByteOutputStream() { std::free(bytesM.pDataM); }

bool ProtoBufByteOutputStream::Grow(size_t more) {
  if (bytesM.isOutOfMemoryM) return false;
  size_t capacity = bytesM.nCapacityM == 0 ? 1 : bytesM.nCapacityM;
  while (capacity - bytesM.nSizeM < more && capacity <= SIZE_MAX / 2) capacity *= 2;
  void* data = capacity - bytesM.nSizeM >= more ? std::realloc(bytesM.pDataM, capacity) : nullptr;
  if (data == nullptr) {
    bytesM.isOutOfMemoryM = true;
    return false;
  }
  bytesM.pDataM = static_cast<unsigned char*>(data);
  bytesM.nCapacityM = capacity;
  return true;
}

// Runs without the marker byte are copied whole; only the 0x64 bytes memchr finds are doubled.
void ProtoBufByteOutputStream::WriteBytes(const unsigned char* data, unsigned long length) {
  const unsigned char* end = data + length;
  while (data < end) {
    const void* marker = std::memchr(data, kMarker, static_cast<size_t>(end - data));
    size_t run = marker != nullptr ? static_cast<size_t>(static_cast<const unsigned char*>(marker) - data)
                                   : static_cast<size_t>(end - data);
    if (bytesM.nCapacityM - bytesM.nSizeM < run && !Grow(run)) return;
    std::memcpy(bytesM.pDataM + bytesM.nSizeM, data, run);
    bytesM.nSizeM += run;
    data += run;
    if (data < end) {
      WriteByte(kMarker);
      ++data;
    }
  }
}

// Most strings are short: one room check for the markers and the text doubled at worst, then a
// byte loop; long ones take the run copying of WriteBytes.
void ProtoBufByteOutputStream::WriteString(const VekString& text) {
  const unsigned char* data = reinterpret_cast<const unsigned char*>(text.Utf8());
  size_t length = text.NByte();
  if (length > 64 || !Reserve(2 * length + 4)) {
    StartSection();
    WriteBytes(data, length);
    EndSection();
    return;
  }
  unsigned char* bytes = bytesM.pDataM;
  size_t n = bytesM.nSizeM;
  bytes[n++] = 0x01;
  bytes[n++] = kMarker;
  for (size_t i = 0; i < length; ++i) {
    bytes[n++] = data[i];
    if (data[i] == kMarker) bytes[n++] = kMarker;
  }
  bytes[n++] = 0x02;
  bytes[n++] = kMarker;
  bytesM.nSizeM = n;
}

void ProtoBufByteOutputStream::Finish(const unsigned char*& data, unsigned long& length) {
  size_t read = bytesM.nSizeM;
  size_t write = bytesM.nSizeM;
  if (!bytesM.isOutOfMemoryM) FinishOneSection(read, write);
  if (bytesM.isOutOfMemoryM) {
    data = nullptr;
    length = 0;
    return;
  }
  data = bytesM.pDataM + write;
  length = bytesM.nSizeM - write;
}

size_t ProtoBufByteOutputStream::FinishOneSection(size_t& readAt, size_t& writeAt) {
  // Local positions: through the references every byte moved would be a load and a store more.
  size_t read = readAt;
  size_t write = writeAt;
  OpenSection* stack = nullptr;
  size_t depth = 0;
  size_t capacity = 0;
  size_t inserted = 0;
  unsigned char* bytes = bytesM.pDataM;
  for (;;) {
    bool isSectionStart = false;
    if (read == 0) {
      if (depth == 0) break;
      isSectionStart = true;  // an end marker without its start: close the section here
    } else {
      // Plain data up to the previous 0x64 moves eight bytes at a time while a word holds no
      // marker (each word is loaded before it is stored, so the overlap is harmless), then byte
      // by byte.
      while (read >= 8) {
        uint64_t word;
        std::memcpy(&word, bytes + read - 8, 8);
        if (HasMarkerByte(word)) break;
        read -= 8;
        write -= 8;
        std::memcpy(bytes + write, &word, 8);
      }
      while (read > 0 && bytes[read - 1] != kMarker) bytes[--write] = bytes[--read];
      if (read == 0) continue;
      unsigned char b = bytes[--read];
      if (read == 0) {
        bytes[--write] = b;  // a lone 0x64 at the very start: data
        continue;
      }
      unsigned char code = bytes[--read];
      if (code == 0x02) {
        if (depth == capacity) {
          size_t grown = capacity == 0 ? 16 : capacity * 2;
          void* more = std::realloc(stack, grown * sizeof *stack);
          if (more == nullptr) {
            bytesM.isOutOfMemoryM = true;
            break;
          }
          stack = static_cast<OpenSection*>(more);
          capacity = grown;
        }
        stack[depth++] = OpenSection{write, inserted};
        inserted = 0;
        continue;
      }
      if (code != 0x01) {
        bytes[--write] = kMarker;  // an escaped data byte
        continue;
      }
      if (depth == 0) continue;  // a start without an end: dropped, the pass goes on
      isSectionStart = true;
    }
    if (isSectionStart) {
      // The content lies between `write` and where it ended; every byte inserted inside it moved
      // that end up by one.
      OpenSection open = stack[--depth];
      size_t length = inserted + (open.endM - write);
      size_t added = InsertLength(static_cast<unsigned int>(length), read, write);
      inserted = open.insertedM + inserted + added;
      bytes = bytesM.pDataM;  // an insertion may have moved the buffer
      if (bytesM.isOutOfMemoryM) break;
    }
  }
  std::free(stack);
  readAt = read;
  writeAt = write;
  return inserted;
}

size_t ProtoBufByteOutputStream::InsertLength(unsigned int length, size_t& read, size_t& write) {
  if (length < 0x80 && write > read) {  // the common case: one byte, with room
    bytesM.pDataM[--write] = static_cast<unsigned char>(length);
    return 0;
  }
  size_t inserted = 0;
  bool isFirst = true;
  for (unsigned shift : {28u, 21u, 14u, 7u}) {
    unsigned int group = length >> shift;
    if (group == 0) continue;
    inserted += InsertByte(static_cast<unsigned char>((group & 0x7F) | (isFirst ? 0 : 0x80)), read, write);
    isFirst = false;
  }
  return inserted + InsertByte(static_cast<unsigned char>((length & 0x7F) | (isFirst ? 0 : 0x80)), read, write);
}

size_t ProtoBufByteOutputStream::InsertByte(unsigned char b, size_t& read, size_t& write) {
  if (write > read) {
    bytesM.pDataM[--write] = b;
    return 0;
  }
  if (bytesM.nSizeM == bytesM.nCapacityM && !Grow(1)) return 0;
  std::memmove(bytesM.pDataM + write + 1, bytesM.pDataM + write, bytesM.nSizeM - write);
  bytesM.pDataM[write] = b;
  ++bytesM.nSizeM;
  return 1;
}

}  // namespace sarn
