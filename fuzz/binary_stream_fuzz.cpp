// Varints and the sectioned output stream on arbitrary bytes.
// Oracles: the input read as operations (0xF0 opens a section, 0xF1 closes one, any other byte is
// data) finishes exactly as a plain recursive length-prefix encoder writes the same tree; the
// varint readers never step outside the input, leave cursor and value alone when they fail, and
// read back what the writers wrote for the value they found.
#include <cstdint>
#include <cstdlib>
#include <string>
#include <vector>

#include "sarn/Sarn.h"
#include "../tests/testutil/TestStreams.h"

namespace {

using sarntest::Require;

std::string Varint(uint64_t value) {
  std::string out;
  for (; value >= 0x80; value >>= 7) out.push_back(static_cast<char>((value & 0x7F) | 0x80));
  out.push_back(static_cast<char>(value));
  return out;
}

// Encodes ops[i..] up to the matching close (or the end) and returns the finished bytes.
std::string Reference(const uint8_t* ops, size_t n, size_t& i) {
  std::string out;
  while (i < n) {
    uint8_t b = ops[i++];
    if (b == 0xF1) return out;
    if (b == 0xF0) {
      std::string inner = Reference(ops, n, i);
      out += Varint(inner.size()) + inner;
    } else {
      out.push_back(static_cast<char>(b));
    }
  }
  return out;
}

template <class T, class Read, class Write>
void CheckReader(const uint8_t* data, size_t n, Read read, Write write) {
  const unsigned char* cursor = data;
  T value = T(7);
  if (!read(&cursor, data + n, &value)) {
    Require(cursor == data && value == T(7));
    return;
  }
  Require(cursor > data && cursor <= data + n);
  sarn::ProtoBufByteOutputStream out;
  write(value, &out);
  const std::string written = sarntest::Finished(out);
  const unsigned char* bytes = reinterpret_cast<const unsigned char*>(written.data());
  const unsigned char* again = bytes;
  T reread;
  Require(read(&again, bytes + written.size(), &reread) && reread == value && again == bytes + written.size());
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  if (size > 1 << 16) return 0;
  // Unbalanced closes are ignored and open sections closed at the end, as the reference does.
  std::vector<uint8_t> ops;
  sarn::ProtoBufByteOutputStream stream;
  int depth = 0;
  for (size_t i = 0; i < size; ++i) {
    if (data[i] == 0xF0) {
      stream.StartSection();
      ++depth;
    } else if (data[i] == 0xF1) {
      if (depth == 0) continue;
      stream.EndSection();
      --depth;
    } else {
      stream.WriteByte(data[i]);
    }
    ops.push_back(data[i]);
  }
  for (; depth > 0; --depth) {
    stream.EndSection();
    ops.push_back(0xF1);
  }
  size_t at = 0;
  std::string expected = Reference(ops.data(), ops.size(), at);
  Require(sarntest::Finished(stream) == expected);

  using G = sarn::GoogleInt;
  CheckReader<unsigned int>(data, size, G::ReadGoogleU32, G::WriteGoogleU32);
  CheckReader<unsigned long long>(data, size, G::ReadGoogleU64, G::WriteGoogleU64);
  CheckReader<int>(data, size, G::ReadGoogleS32, G::WriteGoogleS32);
  CheckReader<long long>(data, size, G::ReadGoogleS64, G::WriteGoogleS64);
  return 0;
}
