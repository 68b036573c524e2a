// Byte helpers without GoogleTest, shared by the tests and the fuzz targets: the bytes of strings,
// buffers and finished binary streams, inputs cut into chunks, a byte source and a byte sink.
#pragma once

#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <string>
#include <string_view>
#include <vector>

#include "sarn/Sarn.h"

namespace sarntest {

// A fuzz target reports a broken oracle by crashing, which libFuzzer and the replay both catch.
inline void Require(bool condition) {
  if (!condition) std::abort();
}

// The bytes of anything that holds bytes (GetData and GetLength: buffers, byte strings).
template <typename Bytes>
std::string Contents(const Bytes& bytes) {
  return std::string(reinterpret_cast<const char*>(bytes.GetData()), bytes.GetLength());
}

// The bytes of a string or a byte string, NUL bytes included.
inline std::string Str(const VekString& text) { return std::string(text.Utf8(), text.NByte()); }
inline std::string Str(const ref<vek::ByteBuffer>& bytes) { return Contents(*bytes); }

// The protocol-buffer varint of `value`.
inline std::string Varint(uint64_t value) {
  std::string bytes;
  for (; value >= 0x80; value >>= 7) bytes.push_back(static_cast<char>((value & 0x7F) | 0x80));
  return bytes + static_cast<char>(value);
}

// What a binary stream holds once finished.
inline std::string Finished(sarn::ProtoBufByteOutputStream& stream) {
  const unsigned char* data;
  unsigned long length;
  stream.Finish(data, length);
  return std::string(reinterpret_cast<const char*>(data), length);
}

// The binary form of `object` as a known dict (the registry's tables).
inline std::string KnownDictBytes(VekMempool* pool, const sarn::SarnObject* object) {
  sarn::ProtoBufByteOutputStream stream;
  sarn::ProtoBuf(pool, sarn::Schema::vStructDefG, sarn::Schema::nStructDefG).MarshalKnownDict(object, &stream);
  return Finished(stream);
}

// A known dict read back from `bytes`; null when refused.
inline ref<sarn::SarnObject> ReadKnownDict(VekMempool* pool, const std::string& bytes) {
  ref<sarn::SarnObject> object;
  sarn::ProtoBuf(pool, sarn::Schema::vStructDefG, sarn::Schema::nStructDefG)
      .UnmarshalKnownDict(reinterpret_cast<const unsigned char*>(bytes.data()), static_cast<int>(bytes.size()), &object);
  return object;
}

// Everything a byte source delivers, read `block` bytes at a time.
inline std::string ReadAll(wynbaselib::Bytesource& source, size_t block) {
  std::string out, buffer(block, '\0');
  for (size_t n; (n = source.Read(&buffer[0], block)) > 0;) out.append(buffer, 0, n);
  return out;
}

// Splits `input` into chunks of `size` bytes (the last one shorter).
inline std::vector<std::string_view> FixedChunks(std::string_view input, size_t size) {
  std::vector<std::string_view> chunks;
  for (size_t at = 0; at < input.size(); at += size) chunks.push_back(input.substr(at, size));
  return chunks;
}

// The streaming JSON parser fed `chunks`, stopping at the first refusal; the tree is returned even
// on failure (it may be partial), with the parser's message in `error` ("" on success).
inline ref<sarn::Dictionary> StreamParse(VekMempool* pool, const std::vector<std::string_view>& chunks, bool* isOk,
                                         std::string* error = nullptr,
                                         const sarn::JsonLimits& limits = sarn::JsonLimits()) {
  sarn::PDictionary result;
  sarn::JsonParser parser(pool, limits);
  parser.BeginParse(result);
  bool ok = true;
  for (size_t i = 0; ok && i < chunks.size(); ++i) ok = parser.ParseChunk(chunks[i].data(), chunks[i].size());
  *isOk = ok && parser.EndParse();
  if (error != nullptr) *error = *isOk || parser.pErrorTextM == nullptr ? "" : parser.pErrorTextM;
  return result;
}

// A byte source over the given chunks for readers under test: a Read delivers at most the rest of
// the current chunk (empty chunks are skipped) and, when `pieceM` is set, at most that many bytes.
// It counts its reads, reports an error when `isFailing`, adds one to `*pDeleted` when deleted,
// and makes duplicates (reading on from where it is) only when `canDuplicateM`; `pCountersM`, when
// set, counts the duplicates made, the sources deleted and the reads of the original.
class TestSource : public wynbaselib::InMemoryBytestream {
 public:
  struct Counters {
    int nDuplicatedM = 0;
    int nDeletedM = 0;
    int nOwnReadsM = 0;  // reads of the source first made, not of its duplicates
  };
  TestSource(const std::vector<std::string_view>& chunks, int* pDeleted = nullptr, bool isFailing = false)
      : InMemoryBytestream(Join(chunks)), pDeletedM(pDeleted), isFailingM(isFailing) {
    for (std::string_view chunk : chunks) cutsM.push_back((cutsM.empty() ? 0 : cutsM.back()) + chunk.size());
  }
  ~TestSource() override {
    if (pDeletedM != nullptr) ++*pDeletedM;
    if (pCountersM != nullptr) ++pCountersM->nDeletedM;
  }
  size_t Read(void* buffer, size_t size) override {
    ++nReadM;
    if (pCountersM != nullptr && isOriginalM) ++pCountersM->nOwnReadsM;
    auto cut = std::upper_bound(cutsM.begin(), cutsM.end(), GetPosition());
    if (cut != cutsM.end()) size = std::min(size, *cut - GetPosition());
    return InMemoryBytestream::Read(buffer, pieceM != 0 ? std::min(size, pieceM) : size);
  }
  Bytesource* Duplicate() override {
    if (!canDuplicateM) return nullptr;
    if (pCountersM != nullptr) ++pCountersM->nDuplicatedM;
    auto* copy = new TestSource(*this);
    copy->isOriginalM = false;
    return copy;
  }
  bool FError() const override { return isFailingM; }
  const char* GetErrorText() const override { return isFailingM ? "truncated stream" : ""; }
  int nReadM = 0;
  size_t pieceM = 0;
  Counters* pCountersM = nullptr;
  bool canDuplicateM = false;

 private:
  static std::string Join(const std::vector<std::string_view>& chunks) {
    std::string text;
    for (std::string_view chunk : chunks) text += chunk;
    return text;
  }
  std::vector<size_t> cutsM;  // where each chunk ends
  int* pDeletedM;
  bool isFailingM;
  bool isOriginalM = true;
};

// One text delivered at most `piece` bytes a read (0: no bound), duplicable unless told otherwise.
struct PieceSource : TestSource {
  PieceSource(const std::string& text, size_t piece, Counters* counters = nullptr, bool canDuplicate = true)
      : TestSource({text}) {
    pieceM = piece, pCountersM = counters, canDuplicateM = canDuplicate;
  }
};

// A sink that keeps what it is given; with `fFailM` set every write and flush fails.
struct StringSink : wynbaselib::Bytesink {
  bool Write(const char* data, size_t size) override {
    textM.append(data, size);
    return !fFailM;
  }
  bool Flush() override { return !fFailM; }
  std::string textM;
  bool fFailM = false;
};

}  // namespace sarntest
