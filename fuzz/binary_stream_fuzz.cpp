// Varints and the sectioned output stream on arbitrary bytes.
// Oracles: the input read as operations (0xF0 opens a section, 0xF1 closes one, any other byte is
// data) finishes exactly as a plain length-prefix encoder writes the same tree; the
// varint readers never step outside the input, leave cursor and value alone when they fail, and
// read back what the writers wrote for the value they found.
#include <utility>
#include "DictFuzzSupport.h"

namespace {

using sarntest::Require;
using sarntest::Varint;

// Encodes a balanced operation list in two linear passes (lengths of the sections from the inside
// out, then the bytes), without recursion, so the oracle itself copes with the deepest nesting
// and the longest input a fuzzer can ask for.
std::string Reference(const std::vector<uint8_t>& ops) {
  std::vector<size_t> length(ops.size());
  std::vector<std::pair<size_t, size_t>> open = {{0, 0}};  // (index of the open, bytes so far)
  for (size_t i = 0; i < ops.size(); ++i) {
    if (ops[i] == 0xF0) {
      open.push_back({i, 0});
    } else if (ops[i] == 0xF1) {
      size_t inner = open.back().second;
      length[open.back().first] = inner;
      open.pop_back();
      open.back().second += Varint(inner).size() + inner;
    } else {
      ++open.back().second;
    }
  }
  std::string out;
  out.reserve(open.front().second);
  for (size_t i = 0; i < ops.size(); ++i) {
    if (ops[i] == 0xF0) {
      out += Varint(length[i]);
    } else if (ops[i] != 0xF1) {
      out.push_back(static_cast<char>(ops[i]));
    }
  }
  return out;
}

template <class T, class Read, class Write>
void CheckReader(const uint8_t* data, size_t n, Read read, Write write) {
  const unsigned char* cursor = data;
  T value = T(7);
  if (!read(&cursor, data + n, &value)) return Require(cursor == data && value == T(7));
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
  Require(sarntest::Finished(stream) == Reference(ops));

  using G = sarn::GoogleInt;
  CheckReader<unsigned int>(data, size, G::ReadGoogleU32, G::WriteGoogleU32);
  CheckReader<unsigned long long>(data, size, G::ReadGoogleU64, G::WriteGoogleU64);
  CheckReader<int>(data, size, G::ReadGoogleS32, G::WriteGoogleS32);
  CheckReader<long long>(data, size, G::ReadGoogleS64, G::WriteGoogleS64);
  return 0;
}
