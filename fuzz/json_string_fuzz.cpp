// The two JSON string readers on arbitrary bytes. Byte 0 picks the block size the byte source
// delivers (so tokens straddle blocks at every place); the rest is the input. Oracles: where
// both readers succeed on a closed string (or a bare token) they give the same text and stop
// at the same byte; the two writers give the same bytes; a text without control bytes reads
// back as itself.
#include <algorithm>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <string>

#include "sarn/Sarn.h"

namespace {

void Check(bool condition) {
  if (!condition) std::abort();
}

class ChunkSource : public wynbaselib::Bytesource {
 public:
  ChunkSource(const uint8_t* data, size_t size, size_t chunk) : pDataM(data), nLeftM(size), chunkM(chunk) {}
  size_t Read(void* buffer, size_t size) override {
    size_t n = std::min({size, nLeftM, chunkM});
    std::memcpy(buffer, pDataM, n);
    pDataM += n;
    nLeftM -= n;
    return n;
  }
  Bytesource* Duplicate() override { return nullptr; }

 private:
  const uint8_t* pDataM;
  size_t nLeftM;
  size_t chunkM;
};

class StringSink : public wynbaselib::Bytesink {
 public:
  bool Write(const char* data, size_t size) override {
    textM.append(data, size);
    return true;
  }
  bool Flush() override { return true; }
  std::string textM;
};

std::string Bytes(const VekString& s) { return std::string(s.Utf8(), s.NByte()); }

}  // namespace

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
    Check(memory.pCurM >= data && memory.pCurM <= data + size);

    ChunkSource source(data, size, chunk);
    sarn::InputPointerBytesource cursor(&source);
    VekString fromSource;
    bool isSourceOk = JsonBytesourceToString(&pool, nullptr, cursor, fromSource);
    Check(cursor.pCurM >= cursor.bufferM && cursor.pCurM <= cursor.pEndM);
    // The stream reader refuses an unclosed string, so where both succeed the string was closed
    // (or was a bare token).
    if (isMemoryOk && isSourceOk) {
      Check(Bytes(fromMemory) == Bytes(fromSource));
      uint64_t consumed = cursor.BytesDelivered() - static_cast<uint64_t>(cursor.pEndM - cursor.pCurM);
      Check(consumed == static_cast<uint64_t>(memory.pCurM - data));
    }
    if (isSourceOk && !isMemoryOk) std::abort();  // the stream reader is the stricter one

    VekString text = VekString::FromUtf8Bytes(&pool, size, data);
    sarn::ByteBuffer buffer(&pool);
    StringSink sink;
    sarn::Json::StringToJson(text, (data[-1] & 0x40) != 0, buffer);
    sarn::Json::StringToJson(text, (data[-1] & 0x40) != 0, sink);
    Check(sink.textM == std::string(reinterpret_cast<const char*>(buffer.GetData()), buffer.GetLength()));

    bool hasControl = false;
    for (size_t i = 0; i < size; ++i) hasControl |= data[i] < 0x20 && data[i] != '\b' && data[i] != '\t' &&
                                                    data[i] != '\n' && data[i] != '\f' && data[i] != '\r';
    if (!hasControl) {
      sarn::ByteBuffer quoted(&pool);
      sarn::Json::StringToJson(text, false, quoted);
      sarn::InputPointer back(quoted.GetData(), quoted.GetLength());
      VekString read;
      Check(sarn::Json::JsonToString(&pool, nullptr, back, read));
      Check(Bytes(read) == Bytes(text));
      Check(back.pCurM == back.pEndM);
    }
  }
  Check(pool.GetUsedBytes() == 0);
  return 0;
}
