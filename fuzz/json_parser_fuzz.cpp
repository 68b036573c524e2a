// Fuzzes the streaming JSON parser. The leading bytes choose a depth limit and the chunk lengths
// (DictFuzzSupport.h).
//
// Oracles: whole and chunked feeding give the same verdict and equal trees; a tree parse never
// accepts what the syntax-only mode refuses; an accepted tree written compact and pretty reads
// back equal (except texts that hold a backslash before 'u' or the raw bytes 0x03 or 0x1A, which
// the writer passes through and the tokenizer then reads differently); where the hand-written
// reader also accepts the text and it holds no escapes, both trees are equal; no bytes stay in
// the pool.

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
    bool isWholeOk;
    bool isChunkedOk;
    ref<Dictionary> tree = sarntest::StreamParse(&pool, dictfuzz::Chunks(json, n), &isWholeOk, nullptr, limits);
    ref<Dictionary> chunked =
        sarntest::StreamParse(&pool, dictfuzz::Chunks(json, n, input.pSeedM, input.nSeedM), &isChunkedOk, nullptr, limits);
    dictfuzz::Require(isWholeOk == isChunkedOk);
    if (isWholeOk) dictfuzz::Require(tree && chunked && tree->Equals(chunked));

    JsonParser syntax(&pool, limits);
    syntax.BeginParse();
    bool isSyntaxOk = syntax.ParseChunk(reinterpret_cast<const char*>(json), n) && syntax.EndParse();
    dictfuzz::Require(isSyntaxOk || !isWholeOk);

    if (isWholeOk && !dictfuzz::TreeHasPassThrough(*tree)) {
      for (bool pretty : {false, true}) {
        bool isBackOk;
        VekString text = tree->ToJson(pretty);
        ref<Dictionary> back = sarntest::StreamParse(
            &pool, dictfuzz::Chunks(reinterpret_cast<const uint8_t*>(text.Utf8()), text.NByte()), &isBackOk);
        dictfuzz::Require(isBackOk && back->Equals(tree));
      }
    }
    VekString error;
    ref<Dictionary> handTree = Dictionary::FromJson(json, n, error, &pool, limits);
    if (handTree && isWholeOk && std::memchr(json, '\\', n) == nullptr) dictfuzz::Require(handTree->Equals(tree));
  }
  dictfuzz::Require(pool.GetUsedBytes() == 0);
  return 0;
}
