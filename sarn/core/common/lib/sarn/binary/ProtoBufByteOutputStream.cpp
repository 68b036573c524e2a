#include "sarn/binary/ProtoBufByteOutputStream.h"

#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <initializer_list>

namespace sarn {

namespace {

// 0x80 in exactly those bytes of the word that are the marker 0x64, nothing elsewhere (no borrow
// runs between bytes), so the highest one found is the marker nearest the word's end.
inline uint64_t MarkerBytes(uint64_t word) {
  constexpr uint64_t kLow7 = 0x7F7F7F7F7F7F7F7Full;
  uint64_t x = word ^ 0x6464646464646464ull;
  return ~(((x & kLow7) + kLow7) | x | kLow7);
}

// A frame per open nested section during Finish: where its content ended (`write` when its end
// marker was met) and the insertions counted by the enclosing level so far.
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

// Most strings are short: one room check for the markers and the text doubled at worst, then the
// text eight bytes at a time while a word holds no marker; long ones take the run copying of
// WriteBytes.
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
  size_t i = 0;
  for (; i + 8 <= length; i += 8) {
    uint64_t word;
    std::memcpy(&word, data + i, 8);
    if (MarkerBytes(word) == 0) {
      std::memcpy(bytes + n, &word, 8);
      n += 8;
      continue;
    }
    for (size_t k = i; k < i + 8; ++k) {
      bytes[n++] = data[k];
      if (data[k] == kMarker) bytes[n++] = kMarker;
    }
  }
  for (; i < length; ++i) {
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
  // Local positions that never have their address taken, so that they stay in registers: through
  // references every byte moved would be a load and a store more.
  size_t read = readAt;
  size_t write = writeAt;
  OpenSection local[32];  // deeper nesting moves the stack to the heap
  OpenSection* stack = local;
  size_t depth = 0;
  size_t capacity = sizeof local / sizeof local[0];
  size_t inserted = 0;
  unsigned char* bytes = bytesM.pDataM;
  for (;;) {
    // Plain data up to the previous 0x64 moves a word at a time: a word without the marker whole
    // (it is loaded before it is stored, and `write` never falls below `read`, so the overlap is
    // harmless), and of the word holding it the bytes after the marker.
    bool isMarker = false;
    int code = -1;  // the pair's code byte when the word held it
    while (read >= 8) {
      uint64_t word;
      std::memcpy(&word, bytes + read - 8, 8);
      uint64_t markers = MarkerBytes(word);
      if (markers == 0) {
        read -= 8;
        write -= 8;
        std::memcpy(bytes + write, &word, 8);
        continue;
      }
      unsigned after = static_cast<unsigned>(__builtin_clzll(markers)) >> 3;  // 0 to 7
      if (write - read >= 8) {
        // The usual case, once a few markers are behind: the whole word stored, its bytes up to
        // the marker landing below `write` where nothing unread lies and later output goes; the
        // code byte before the marker is taken from the word rather than loaded again.
        std::memcpy(bytes + write - 8, &word, 8);
        if (after < 7) code = static_cast<unsigned char>(word >> (8 * (6 - after)));
        read -= after;
        write -= after;
      } else if (after != 0) {
        // Close to the unread bytes: only the bytes after the marker are blended into the word
        // below `write`, whose other bytes are stored back as they were. (Not the usual path: a
        // load of bytes stored one at a time just before waits for those stores.)
        uint64_t below;
        std::memcpy(&below, bytes + write - 8, 8);
        uint64_t high = ~0ull << (64 - 8 * after);
        below = (below & ~high) | (word & high);
        std::memcpy(bytes + write - 8, &below, 8);
        read -= after;
        write -= after;
      }
      isMarker = true;
      break;
    }
    if (!isMarker) {
      while (read > 0 && bytes[read - 1] != kMarker) bytes[--write] = bytes[--read];
      isMarker = read > 0;
    }
    bool isSectionStart = false;
    if (!isMarker) {
      if (depth == 0) break;
      isSectionStart = true;  // an end marker without its start: close the section here
    } else {
      --read;
      if (read == 0) {
        bytes[--write] = kMarker;  // a lone 0x64 at the very start: data
        continue;
      }
      if (code < 0) code = bytes[read - 1];
      --read;
      if (code == 0x02) {
        if (depth == capacity) {
          size_t grown = capacity * 2;
          void* more = stack == local ? std::malloc(grown * sizeof *stack)
                                      : std::realloc(stack, grown * sizeof *stack);
          if (more == nullptr) {
            bytesM.isOutOfMemoryM = true;
            break;
          }
          if (stack == local) std::memcpy(more, local, sizeof local);
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
      if (length < 0x80 && write > read) {  // the common case: a one-byte length, with room
        bytes[--write] = static_cast<unsigned char>(length);
        inserted += open.insertedM;
        continue;
      }
      size_t r = read;
      size_t w = write;
      size_t added = InsertLength(static_cast<unsigned int>(length), r, w);
      read = r;
      write = w;
      inserted = open.insertedM + inserted + added;
      bytes = bytesM.pDataM;  // an insertion may have moved the buffer
      if (bytesM.isOutOfMemoryM) break;
    }
  }
  if (stack != local) std::free(stack);
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
