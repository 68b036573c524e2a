// Objects as text: a recordingList body of about 200 KB and one of about 5 MB, built as objects,
// written to JSON and converted to a Dictionary and back (objects/s). The anchor is RapidJSON's
// Writer writing the same document from its DOM in the same run. Writers are compared per
// document ("docsPerSecond"; MB/s counts the body's own JSON, not each writer's output, whose
// lengths differ: ours keeps the format's spaces and escapes; "outputBytes" gives them).
// Counters: pool bytes per KB of JSON held by the objects ("objectPoolPerKB") and by the
// Dictionary tree ("treePoolPerKB").
#include <benchmark/benchmark.h>

#include <map>
#include <memory>
#include <string>

#include "RecordingBody.h"
#include "rapidjson/document.h"
#include "rapidjson/stringbuffer.h"
#include "rapidjson/writer.h"
#include "sarn/Sarn.h"

namespace {

using namespace sarn;

constexpr KernoVersion kVersion = benchbody::kVersion;
using benchbody::Body;
using benchbody::GetBody;

void FinishWrite(benchmark::State& state, size_t nInput, size_t nOutput) {
  state.SetBytesProcessed(static_cast<int64_t>(state.iterations() * nInput));
  state.counters["docsPerSecond"] = benchmark::Counter(static_cast<double>(state.iterations()),
                                                       benchmark::Counter::kIsRate);
  state.counters["outputBytes"] = static_cast<double>(nOutput);
}

void BM_ObjectToJson(benchmark::State& state) {
  Body& body = GetBody(static_cast<size_t>(state.range(0)));
  VekMempool pool("bench-json");
  JsonSarnObject json(&pool);
  size_t length = 0;
  for (auto _ : state) {
    ByteBuffer out(&pool);
    json.SarnObjectToJson(body.listM.Get(), kVersion, out);
    length = out.GetLength();
    benchmark::DoNotOptimize(out.GetData());
  }
  FinishWrite(state, body.jsonM.size(), length);
  state.counters["objectPoolPerKB"] = static_cast<double>(body.objectBytesM) / (body.jsonM.size() / 1024.0);
}

void BM_RapidJsonWriter(benchmark::State& state) {
  Body& body = GetBody(static_cast<size_t>(state.range(0)));
  rapidjson::Document document;
  document.Parse(body.jsonM.c_str(), body.jsonM.size());
  if (document.HasParseError()) {
    state.SkipWithError("the body does not parse");
    return;
  }
  size_t length = 0;
  for (auto _ : state) {
    rapidjson::StringBuffer out;
    rapidjson::Writer<rapidjson::StringBuffer> writer(out);
    document.Accept(writer);
    length = out.GetSize();
    benchmark::DoNotOptimize(out.GetString());
  }
  FinishWrite(state, body.jsonM.size(), length);
}

void BM_ObjectToDictionary(benchmark::State& state) {
  Body& body = GetBody(static_cast<size_t>(state.range(0)));
  VekMempool pool("bench-tree");
  DictionarySarnObject converter(&pool, Schema::vStructDefG, Schema::nStructDefG);
  size_t treeBytes = 0;
  for (auto _ : state) {
    ref<Dictionary> tree = converter.SarnObjectToDictionary(body.listM.Get(), kVersion);
    treeBytes = pool.GetUsedBytes();
    benchmark::DoNotOptimize(tree.Get());
  }
  state.SetItemsProcessed(static_cast<int64_t>(state.iterations() * body.nObjectM));
  state.counters["treePoolPerKB"] = static_cast<double>(treeBytes) / (body.jsonM.size() / 1024.0);
}

void BM_DictionaryToObject(benchmark::State& state) {
  Body& body = GetBody(static_cast<size_t>(state.range(0)));
  VekMempool pool("bench-tree");
  DictionarySarnObject converter(&pool, Schema::vStructDefG, Schema::nStructDefG);
  ref<Dictionary> tree = converter.SarnObjectToDictionary(body.listM.Get(), kVersion);
  for (auto _ : state) {
    ref<SarnObject> object;
    VekString error;
    if (!converter.DictionaryToSarnObject(tree, kVersion, object, error)) {
      state.SkipWithError(error.Utf8());
      break;
    }
    benchmark::DoNotOptimize(object.Get());
  }
  state.SetItemsProcessed(static_cast<int64_t>(state.iterations() * body.nObjectM));
}

constexpr int64_t kSmall = 200 * 1024;
constexpr int64_t kLarge = 5 * 1024 * 1024;

BENCHMARK(BM_ObjectToJson)->Arg(kSmall)->Arg(kLarge)->Unit(benchmark::kMicrosecond);
BENCHMARK(BM_RapidJsonWriter)->Arg(kSmall)->Arg(kLarge)->Unit(benchmark::kMicrosecond);
BENCHMARK(BM_ObjectToDictionary)->Arg(kSmall)->Arg(kLarge)->Unit(benchmark::kMicrosecond);
BENCHMARK(BM_DictionaryToObject)->Arg(kSmall)->Arg(kLarge)->Unit(benchmark::kMicrosecond);

}  // namespace

BENCHMARK_MAIN();
