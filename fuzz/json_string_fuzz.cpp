// The two JSON string readers on arbitrary bytes. Byte 0 picks the block size the byte source
// delivers (so tokens straddle blocks at every place); the rest is the input. Oracles: where
// both readers succeed on a closed string (or a bare token) they give the same text and stop
// at the same byte; the two writers give the same bytes; a text without control bytes reads
// back as itself.
#include "DictFuzzSupport.h"

using sarntest::Require;
using sarntest::Str;

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  if (size == 0) return 0;
  size_t chunk = 1 + data[0] % 64;
  ++data;
  --size;
  VekMempool pool("fuzz");
  {
    sarn::InputPointer memory(data, size);
    VekString fromMemory;
    bool isMemoryOk = sarn::Json::JsonToString(&pool, nullptr, memory, fromMemory);
    Require(memory.pCurM >= data && memory.pCurM <= data + size);

    sarntest::TestSource source(sarntest::FixedChunks(std::string_view(reinterpret_cast<const char*>(data), size), chunk));
    sarn::InputPointerBytesource cursor(&source);
    VekString fromSource;
    bool isSourceOk = JsonBytesourceToString(&pool, nullptr, cursor, fromSource);
    Require(cursor.pCurM >= cursor.bufferM && cursor.pCurM <= cursor.pEndM);
    // The stream reader refuses an unclosed string, so where both succeed the string was closed
    // (or was a bare token).
    if (isMemoryOk && isSourceOk) {
      Require(Str(fromMemory) == Str(fromSource));
      uint64_t consumed = cursor.BytesDelivered() - static_cast<uint64_t>(cursor.pEndM - cursor.pCurM);
      Require(consumed == static_cast<uint64_t>(memory.pCurM - data));
    }
    if (isSourceOk && !isMemoryOk) std::abort();  // the stream reader is the stricter one

    VekString text = VekString::FromUtf8Bytes(&pool, size, data);
    sarn::ByteBuffer buffer(&pool);
    sarntest::StringSink sink;
    sarn::Json::StringToJson(text, (data[-1] & 0x40) != 0, buffer);
    sarn::Json::StringToJson(text, (data[-1] & 0x40) != 0, sink);
    Require(sink.textM == std::string(reinterpret_cast<const char*>(buffer.GetData()), buffer.GetLength()));

    if (!dictfuzz::HasUnicodeEscapedControl(data, size)) {
      sarn::ByteBuffer quoted(&pool);
      sarn::Json::StringToJson(text, false, quoted);
      sarn::InputPointer back(quoted.GetData(), quoted.GetLength());
      VekString read;
      Require(sarn::Json::JsonToString(&pool, nullptr, back, read));
      Require(Str(read) == Str(text));
      Require(back.pCurM == back.pEndM);
    }
  }
  Require(pool.GetUsedBytes() == 0);
  return 0;
}
