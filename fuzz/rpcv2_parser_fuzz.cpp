// The frame parser fed one input whole and in chunks must report the same callbacks (body
// pieces joined) and the same verdicts. Input: byte 0 holds the number of chunk sizes in its low
// three bits (plus one) and a x16 scale in bit 3; the sizes follow, used in turn; the rest is
// the frame.
#include <cstdint>

#include "RpcFuzzSupport.h"

namespace {

using sarn::RpcV2Parser;

// Feeds the frame as a reader does, stopping at the first refusal; `sizes` empty means whole.
std::string Run(const char* frame, size_t length, const uint8_t* sizes, size_t nSizes, size_t scale) {
  rpcfuzz::Recorder recorder;
  {
    RpcV2Parser parser(recorder);
    bool isOk = true;
    size_t at = 0;
    size_t turn = 0;
    do {
      size_t chunk = nSizes == 0 ? length - at : sizes[turn++ % nSizes] * scale;
      if (chunk > length - at) chunk = length - at;
      isOk = parser.ParseChunk(frame + at, chunk);
      at += chunk;
    } while (isOk && at < length);
    recorder.Note(isOk ? "parse true" : "parse false");
    recorder.Note(parser.EndParse() ? "end true" : "end false");
    recorder.errorsM = 0;  // the destructor may repeat an end error
  }
  return recorder.Text();
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
