// Fuzzes the hand-written JSON reader. The leading bytes choose a depth limit and the chunk
// lengths of the streaming parser that reads the same text for comparison (DictFuzzSupport.h).
//
// Oracles: a verdict with a message exactly on failure; writing an accepted tree compact and
// pretty and reading it back gives an equal tree; where the streaming parser accepts the same
// text and it holds no escapes, both trees are equal; the pool is empty afterwards.
#include "DictFuzzSupport.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  using namespace sarn;
  dictfuzz::Input input;
  if (!dictfuzz::SplitInput(data, size, input)) return 0;
  const JsonLimits& limits = input.limitsM;
  const uint8_t* json = input.pJsonM;
  size_t n = input.nJsonM;
  VekMempool pool("fuzz");
  {
    VekString error;
    ref<Dictionary> tree = Dictionary::FromJson(json, n, error, &pool, limits);
    dictfuzz::Require(tree ? error.FEmpty() : !error.FEmpty());
    // The reader never decodes backslash-u escapes, so such texts do not come back byte for byte.
    bool isComparable = tree && !dictfuzz::HasUnicodeEscapedControl(json, n, "\x03\x1A");
    for (bool pretty : {false, true}) {
      if (!isComparable) break;
      VekString text = tree->ToJson(pretty);
      VekString again;
      ref<Dictionary> back = Dictionary::FromJson(text, again, &pool, limits);
      dictfuzz::Require(back && back->Equals(tree));
    }
    bool isOk;
    ref<Dictionary> streamed = sarntest::StreamParse(&pool, dictfuzz::Chunks(json, n, input.pSeedM, input.nSeedM), &isOk, nullptr, limits);
    if (tree && isOk && std::memchr(json, '\\', n) == nullptr) dictfuzz::Require(streamed->Equals(tree));
  }
  dictfuzz::Require(pool.GetUsedBytes() == 0);
  return 0;
}
