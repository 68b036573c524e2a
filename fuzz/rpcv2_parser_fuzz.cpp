// The frame parser fed one input whole and in chunks must report the same callbacks (body
// pieces joined) and the same verdicts. Input: byte 0 holds the number of chunk sizes in its low
// three bits (plus one) and a x16 scale in bit 3; the sizes follow, used in turn; the rest is
// the frame.
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <string>

#include "sarn/rpc/RpcV2Parser.h"

namespace {

using sarn::RpcV2Parser;

inline bool IsSpace(char c) { return c == ' ' || (c >= '\t' && c <= '\r'); }

class Recorder : public RpcV2Parser::Callbacks {
 public:
  void OnError(const char* message) override {
    ++errorsM;
    if (errorsM > 1) std::abort();  // one error, then silence (the destructor's repeat aside)
    Event("error ", message);
  }
  void OnHeaderSize(size_t length) override { Event("headerSize ", std::to_string(length)); }
  void OnBodySize(size_t length) override {
    bodySizeM = length;
    Event("bodySize ", std::to_string(length));
  }
  void OnHeaderPair(const char* key, const char* value) override {
    // Trimmed, and a key never holds the colon that ended it.
    for (const char* text : {key, value}) {
      size_t length = std::strlen(text);
      if (length > 0 && (IsSpace(text[0]) || IsSpace(text[length - 1]))) std::abort();
    }
    if (std::strchr(key, ':') != nullptr) std::abort();
    Event("header ", std::string(key) + "=" + value);
  }
  void OnBodyChunk(const char* data, size_t length) override {
    if (length == 0 || errorsM != 0) std::abort();
    bodyBytesM += length;
    if (bodyBytesM > bodySizeM) std::abort();
    if (!isInBodyM) logM += "\nbody ";
    logM.append(data, length);
    isInBodyM = true;
  }
  void OnParsingComplete() override {
    if (bodyBytesM != bodySizeM || bodySizeM == 0) std::abort();
    Event("complete", "");
  }

  void Event(const char* kind, const std::string& text) {
    if (errorsM != 0 && std::strcmp(kind, "error ") != 0) std::abort();
    logM += "\n";
    logM += kind;
    logM += text;
    isInBodyM = false;
  }

  std::string logM;
  size_t errorsM = 0;
  size_t bodySizeM = 0;
  size_t bodyBytesM = 0;
  bool isInBodyM = false;
};

// Feeds the frame as a reader does, stopping at the first refusal; `sizes` empty means whole.
std::string Run(const char* frame, size_t length, const uint8_t* sizes, size_t nSizes, size_t scale) {
  Recorder recorder;
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
    recorder.logM += isOk ? "\nparse true" : "\nparse false";
    recorder.logM += parser.EndParse() ? "\nend true" : "\nend false";
    recorder.errorsM = 0;  // the destructor may repeat an end error
  }
  return recorder.logM;
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
  if (Run(frame, length, nullptr, 0, 1) != Run(frame, length, data + 1, nSizes, scale)) std::abort();
  return 0;
}
