// Objects from JSON: the recordingList bodies of the object benchmarks (one recording, about
// 200 KB and about 5 MB) read straight into objects by JsonSarnObject, from memory and from a
// byte source (an in-memory stream), against the Dictionary path on the same text
// (Dictionary::FromJson or the streaming parser, then DictionaryToSarnObject) and, for scale,
// RapidJSON's Document::Parse building its DOM. The protocol-buffer library's JsonStringToMessage
// reads into a fresh mirror message the text its own MessageToJsonString writes for the
// equivalent message (parsed from our byte-identical binary form); its text differs, so compare
// it per object (items/s), not per byte. Every reader's result is released inside the timing.
// Counters: pool bytes per byte of JSON at the end of a read ("poolPerByte").
#include <benchmark/benchmark.h>
#include <google/protobuf/util/json_util.h>

#include <cstdio>
#include <cstdlib>
#include <map>
#include <memory>
#include <string>

#include "RecordingBody.h"
#include "mirror.pb.h"
#include "rapidjson/document.h"
#include "sarn/Sarn.h"

namespace {

using namespace sarn;

constexpr KernoVersion kVersion = benchbody::kVersion;
using benchbody::Body;
using benchbody::GetBody;

void Finish(benchmark::State& state, const Body& body, size_t poolBytes) {
  state.SetItemsProcessed(static_cast<int64_t>(state.iterations() * body.nObjectM));
  state.SetBytesProcessed(static_cast<int64_t>(state.iterations() * body.jsonM.size()));
  if (poolBytes != 0) state.counters["poolPerByte"] = static_cast<double>(poolBytes) / body.jsonM.size();
}

void BM_JsonToObjectMemory(benchmark::State& state) {
  Body& body = GetBody(static_cast<size_t>(state.range(0)));
  VekMempool pool("bench-read");
  JsonSarnObject reader(&pool);
  const auto* data = reinterpret_cast<const unsigned char*>(body.jsonM.data());
  size_t poolBytes = 0;
  for (auto _ : state) {
    ref<SarnObject> object;
    VekString error;
    if (!reader.JsonToSarnObject(data, static_cast<int>(body.jsonM.size()), kVersion, &object, error)) {
      state.SkipWithError(error.Utf8());
      break;
    }
    poolBytes = pool.GetUsedBytes();
    benchmark::DoNotOptimize(object.Get());
  }
  Finish(state, body, poolBytes);
}

void BM_JsonToObjectBytesource(benchmark::State& state) {
  Body& body = GetBody(static_cast<size_t>(state.range(0)));
  VekMempool pool("bench-read");
  JsonSarnObject reader(&pool);
  wynbaselib::InMemoryBytestream source(body.jsonM);
  for (auto _ : state) {
    ref<SarnObject> object;
    VekString error;
    size_t bytesRead = 0;
    if (!reader.JsonToSarnObject(&source, bytesRead, kVersion, &object, error)) {
      state.SkipWithError(error.Utf8());
      break;
    }
    benchmark::DoNotOptimize(object.Get());
  }
  Finish(state, body, 0);
}

// The Dictionary path: the hand-written reader or the streaming parser, then the converter.
void DictionaryPath(benchmark::State& state, bool isStreaming) {
  Body& body = GetBody(static_cast<size_t>(state.range(0)));
  VekMempool pool("bench-read");
  DictionarySarnObject converter(&pool, Schema::vStructDefG, Schema::nStructDefG);
  size_t poolBytes = 0;
  for (auto _ : state) {
    ref<Dictionary> tree;
    VekString error;
    if (isStreaming) {
      PDictionary result;
      JsonParser parser(&pool);
      parser.BeginParse(result);
      if (parser.ParseChunk(body.jsonM.data(), body.jsonM.size()) && parser.EndParse()) tree = result;
    } else {
      tree = Dictionary::FromJson(reinterpret_cast<const unsigned char*>(body.jsonM.data()), body.jsonM.size(),
                                  error, &pool);
    }
    ref<SarnObject> object;
    if (!tree || !converter.DictionaryToSarnObject(tree, kVersion, object, error)) {
      state.SkipWithError("the Dictionary path failed");
      break;
    }
    poolBytes = pool.GetUsedBytes();
    benchmark::DoNotOptimize(object.Get());
  }
  Finish(state, body, poolBytes);
}
void BM_DictionaryFromJsonToObject(benchmark::State& state) { DictionaryPath(state, false); }
void BM_StreamingParserToObject(benchmark::State& state) { DictionaryPath(state, true); }

void BM_RapidJsonParse(benchmark::State& state) {
  Body& body = GetBody(static_cast<size_t>(state.range(0)));
  for (auto _ : state) {
    rapidjson::Document document;
    document.Parse(body.jsonM.data(), body.jsonM.size());
    if (document.HasParseError()) {
      state.SkipWithError("the body does not parse");
      break;
    }
    benchmark::DoNotOptimize(&document);
  }
  Finish(state, body, 0);
}

// The library's own JSON of the mirror message equivalent to the body.
const std::string& MirrorJson(size_t targetBytes) {
  static std::map<size_t, std::string> texts;
  std::string& text = texts[targetBytes];
  if (!text.empty()) return text;
  Body& body = GetBody(targetBytes);
  VekMempool scratch("bench-scratch");
  ProtoBuf codec(&scratch, Schema::vStructDefG, Schema::nStructDefG);
  ProtoBufByteOutputStream out;
  codec.MarshalKnownDict(body.listM.Get(), &out);
  const unsigned char* data;
  unsigned long length;
  out.Finish(data, length);
  std::string bytes(reinterpret_cast<const char*>(data), length);
  sarnmirror::KnownDict mirror;
  if (!mirror.ParseFromString(bytes) || mirror.SerializeAsString() != bytes ||
      !google::protobuf::util::MessageToJsonString(mirror, &text).ok()) {
    std::fprintf(stderr, "the mirror does not hold our message: the comparison would not be fair\n");
    std::abort();
  }
  return text;
}

void BM_ProtobufJsonToMessage(benchmark::State& state) {
  Body& body = GetBody(static_cast<size_t>(state.range(0)));
  const std::string& text = MirrorJson(static_cast<size_t>(state.range(0)));
  for (auto _ : state) {
    sarnmirror::KnownDict message;
    if (!google::protobuf::util::JsonStringToMessage(text, &message).ok()) {
      state.SkipWithError("the library refused its own text");
      break;
    }
    benchmark::DoNotOptimize(&message);
  }
  state.SetItemsProcessed(static_cast<int64_t>(state.iterations() * body.nObjectM));
  state.SetBytesProcessed(static_cast<int64_t>(state.iterations() * text.size()));
}

constexpr int64_t kRecord = 1;
constexpr int64_t kSmall = 200 * 1024;
constexpr int64_t kLarge = 5 * 1024 * 1024;

BENCHMARK(BM_JsonToObjectMemory)->Arg(kRecord)->Arg(kSmall)->Arg(kLarge)->Unit(benchmark::kMicrosecond);
BENCHMARK(BM_JsonToObjectBytesource)->Arg(kRecord)->Arg(kSmall)->Arg(kLarge)->Unit(benchmark::kMicrosecond);
BENCHMARK(BM_DictionaryFromJsonToObject)->Arg(kRecord)->Arg(kSmall)->Arg(kLarge)->Unit(benchmark::kMicrosecond);
BENCHMARK(BM_StreamingParserToObject)->Arg(kRecord)->Arg(kSmall)->Arg(kLarge)->Unit(benchmark::kMicrosecond);
BENCHMARK(BM_RapidJsonParse)->Arg(kRecord)->Arg(kSmall)->Arg(kLarge)->Unit(benchmark::kMicrosecond);
BENCHMARK(BM_ProtobufJsonToMessage)->Arg(kRecord)->Arg(kSmall)->Arg(kLarge)->Unit(benchmark::kMicrosecond);

}  // namespace

BENCHMARK_MAIN();
