// The frame parser fed one input whole and in chunks must report the same callbacks (body
// pieces joined) and the same verdicts. Input: byte 0 holds the number of chunk sizes in its low
// three bits (plus one) and a x16 scale in bit 3; the sizes follow, used in turn; the rest is
// the frame.
#include <cstdint>

#include "RpcFuzzSupport.h"

namespace {

// The frame in chunks of the given sizes used in turn (some may be empty); `sizes` empty: whole.
std::string Run(const char* frame, size_t length, const uint8_t* sizes, size_t nSizes, size_t scale) {
  std::vector<std::string_view> chunks;
  size_t at = 0, turn = 0;
  do {
    const size_t chunk = std::min(nSizes == 0 ? length - at : sizes[turn++ % nSizes] * scale, length - at);
    chunks.emplace_back(frame + at, chunk);
    at += chunk;
  } while (at < length);
  return rpcfuzz::Feed(chunks).Text();
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  if (size == 0) return 0;
  size_t nSizes = (data[0] & 7u) + 1;
  const size_t scale = (data[0] & 8u) != 0 ? 16 : 1;
  if (size < 1 + nSizes) return 0;
  bool isAnyNonZero = false;
  for (size_t i = 0; i < nSizes; ++i) isAnyNonZero |= data[1 + i] != 0;
  if (!isAnyNonZero) return 0;  // only empty chunks would never end
  const char* frame = reinterpret_cast<const char*>(data + 1 + nSizes);
  const size_t length = size - 1 - nSizes;
  rpcfuzz::Require(Run(frame, length, nullptr, 0, 1) == Run(frame, length, data + 1, nSizes, scale));
  return 0;
}
