// Arbitrary bytes through GunzipBytesource. The first byte chooses the read size and whether
// zlib's memory comes from a pool; the rest is the stream. Oracles: reading in small pieces
// gives the same bytes and the same verdict as one large read, a duplicate made after the
// first read gives the same rest, and the pool gets every byte back.
#include <cstdio>
#include <memory>

#include "DictFuzzSupport.h"

namespace {

using sarntest::Require;

constexpr size_t kMaxOutput = 256 << 10;  // a small input may inflate enormously: stop there
constexpr size_t kLargeRead = 64 << 10;

struct Outcome {
  std::string textM;
  bool isErrorM = false;
  std::string errorM;
};

// Reads on to the end (or the cap), or `nReads` times.
void ReadRest(wynbaselib::Bytesource& source, size_t block, Outcome& out, int nReads = -1) {
  std::string buffer(block, '\0');
  for (; nReads != 0 && out.textM.size() < kMaxOutput; --nReads) {
    size_t n = source.Read(&buffer[0], block);
    if (n > block) std::abort();
    if (n == 0) break;
    out.textM.append(buffer, 0, n);
  }
  out.isErrorM = source.FError();
  out.errorM = source.GetErrorText();
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  if (size == 0) return 0;
  const size_t block = 1 + (data[0] & 0x3f) * 9;
  const bool isPooled = (data[0] & 0x40) != 0;
  const std::string stream(reinterpret_cast<const char*>(data + 1), size - 1);
  VekMempool pool("fuzz");
  {
    wynbaselib::InMemoryBytestream wholeIn(stream);
    wynbaselib::GunzipBytesource whole(&wholeIn, isPooled ? &pool : nullptr);
    Outcome big;
    ReadRest(whole, kLargeRead, big);

    wynbaselib::InMemoryBytestream chunkedIn(stream);
    wynbaselib::GunzipBytesource chunked(&chunkedIn, isPooled ? &pool : nullptr);
    Outcome small;
    ReadRest(chunked, block, small, 1);
    std::unique_ptr<wynbaselib::Bytesource> duplicate(chunked.Duplicate());
    Require(duplicate != nullptr);
    Outcome fromDuplicate = small;
    ReadRest(*duplicate, block, fromDuplicate);
    ReadRest(chunked, block, small);

    // Outputs capped at kMaxOutput may stop at different points; compare what both have.
    size_t common = std::min(big.textM.size(), small.textM.size());
    Require(big.textM.compare(0, common, small.textM, 0, common) == 0);
    Require(small.textM == fromDuplicate.textM);
    if (big.textM.size() < kMaxOutput && small.textM.size() < kMaxOutput) {
      Require(big.textM == small.textM);
      Require(big.isErrorM == small.isErrorM && big.errorM == small.errorM);
      Require(small.isErrorM == fromDuplicate.isErrorM);
      Require(big.isErrorM == !big.errorM.empty());
    }
  }
  Require(pool.GetUsedBytes() == 0 && pool.GetLiveBlocks() == 0);
  return 0;
}
