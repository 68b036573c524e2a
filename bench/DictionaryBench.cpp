// Reading JSON into a Dictionary with both readers and writing it back, against the comparison
// libraries on the same bodies in the same run: RapidJSON's Document::Parse and Writer, yajl's
// tokenizer with empty callbacks, and yajl's tree parser.
//
// Bodies of about 1 KB, 200 KB and 5 MB: records with nested objects, arrays, escaped and UTF-8
// strings and quoted 64-bit numbers. The readers also report the pool bytes their tree holds per
// byte of JSON ("poolPerByte").
#include <benchmark/benchmark.h>
#include <rapidjson/document.h>
#include <rapidjson/stringbuffer.h>
#include <rapidjson/writer.h>
#include <yajl/yajl_parse.h>
#include <yajl/yajl_tree.h>

#include <chrono>
#include <cstdio>
#include <string>

#include "sarn/Sarn.h"

namespace {

using namespace sarn;

std::string Record(int i) {
  std::string n = std::to_string(i);
  return "{\"id\": \"" + std::to_string(9007199254740993LL + i * 7919LL) + "\", \"type\": \"channel\", " +
         "\"name\": \"Channel " + n + " \\\"prime\\\" caf\xC3\xA9 \\u00e9\", \"number\": " + std::to_string(100 + i) +
         ", \"hd\": " + (i % 2 ? "true" : "false") + ", \"rating\": 4.5, \"logo\": null, " +
         "\"tags\": [\"news\", \"sport\", \"k\xC3\xBC" "che\"], " +
         "\"schedule\": {\"start\": \"2026-11-23T01:00:00Z\", \"slots\": [{\"at\": \"" +
         std::to_string(1700000000000LL + i) + "\", \"title\": \"Show\\t" + n +
         "\\n\"}, {\"at\": \"1700000000999\", \"title\": \"Late \\/ news\"}]}, " +
         "\"owner\": {\"org\": \"Example\", \"contact\": {\"mail\": \"ops@example.com\", \"phone\": \"+1 555 0100\"}}}";
}

std::string Body(size_t target) {
  std::string body = "{\"type\": \"channelList\", \"version\": 42, \"channels\": [";
  for (int i = 0; body.size() < target; ++i) body += (i ? ", " : "") + Record(i);
  return body + "]}";
}

// One wide object of 100,000 short members ("k123": 1): the name table's growth and lookups
// dominate instead of nesting.
std::string FlatBody(int nMember) {
  std::string body = "{";
  for (int i = 0; i < nMember; ++i) body += (i ? ", \"k" : "\"k") + std::to_string(i) + "\": 1";
  return body + "}";
}

// 0, 1, 2: records of about 1 KB, 200 KB, 5 MB; 3: the flat object (about 1.2 MB).
const std::string& BodyOfSize(int64_t kind) {
  static const std::string small = Body(900);
  static const std::string medium = Body(200 * 1000);
  static const std::string large = Body(5 * 1000 * 1000);
  static const std::string flat = FlatBody(100 * 1000);
  return kind == 0 ? small : kind == 1 ? medium : kind == 2 ? large : flat;
}

void Sizes(benchmark::internal::Benchmark* b) { b->Arg(0)->Arg(1)->Arg(2)->Arg(3); }

// Reports throughput and how many pool bytes the last tree held per byte of JSON.
void FinishRead(benchmark::State& state, size_t nJson, double poolPerByte) {
  state.counters["poolPerByte"] = poolPerByte;
  state.SetBytesProcessed(state.iterations() * nJson);
}

void BM_HandRead(benchmark::State& state) {
  const std::string& json = BodyOfSize(state.range(0));
  VekMempool pool("bench");
  double poolPerByte = 0;
  for (auto _ : state) {
    VekString error;
    ref<Dictionary> tree =
        Dictionary::FromJson(reinterpret_cast<const unsigned char*>(json.data()), json.size(), error, &pool);
    if (!tree) state.SkipWithError(error.Utf8());
    poolPerByte = static_cast<double>(pool.GetUsedBytes()) / json.size();
    benchmark::DoNotOptimize(tree.Get());
  }
  FinishRead(state, json.size(), poolPerByte);
}
BENCHMARK(BM_HandRead)->Apply(Sizes);

void BM_StreamRead(benchmark::State& state) {
  const std::string& json = BodyOfSize(state.range(0));
  VekMempool pool("bench");
  double poolPerByte = 0;
  for (auto _ : state) {
    PDictionary tree;
    {
      JsonParser parser(&pool);
      parser.BeginParse(tree);
      if (!parser.ParseChunk(json.data(), json.size()) || !parser.EndParse()) state.SkipWithError("parse failed");
    }
    poolPerByte = static_cast<double>(pool.GetUsedBytes()) / json.size();
    benchmark::DoNotOptimize(tree.Get());
  }
  FinishRead(state, json.size(), poolPerByte);
}
BENCHMARK(BM_StreamRead)->Apply(Sizes);

// Releasing a tree of the hand-written reader, timed apart from building it: the time shown is
// the release's, "releasePerBuild" its share of the build's, and "highWaterPerByte" the most
// pool bytes held at once (tree and reader) per byte of JSON.
void BM_HandReadRelease(benchmark::State& state) {
  using Clock = std::chrono::steady_clock;
  const std::string& json = BodyOfSize(state.range(0));
  VekMempool pool("bench");
  double buildSeconds = 0, releaseSeconds = 0;
  for (auto _ : state) {
    VekString error;
    Clock::time_point start = Clock::now();
    ref<Dictionary> tree =
        Dictionary::FromJson(reinterpret_cast<const unsigned char*>(json.data()), json.size(), error, &pool);
    Clock::time_point built = Clock::now();
    if (!tree) state.SkipWithError(error.Utf8());
    tree.Reset();
    Clock::time_point released = Clock::now();
    buildSeconds += std::chrono::duration<double>(built - start).count();
    releaseSeconds += std::chrono::duration<double>(released - built).count();
    state.SetIterationTime(std::chrono::duration<double>(released - built).count());
  }
  state.counters["releasePerBuild"] = buildSeconds > 0 ? releaseSeconds / buildSeconds : 0;
  state.counters["highWaterPerByte"] = static_cast<double>(pool.GetUsedBytesHighWater()) / json.size();
}
BENCHMARK(BM_HandReadRelease)->Apply(Sizes)->UseManualTime();

// Writers are compared per document: each writes the same tree, but the texts differ in length
// (ours carries the format's spaces and keeps escapes), so MB/s of a writer's own output would
// flatter the longer one. Throughput is in bytes of the input document, "docsPerSecond" counts
// documents, and "outputBytes" says how long this writer's text is.
void FinishWrite(benchmark::State& state, size_t nInput, size_t nOutput) {
  state.SetBytesProcessed(static_cast<int64_t>(state.iterations() * nInput));
  state.counters["docsPerSecond"] = benchmark::Counter(static_cast<double>(state.iterations()),
                                                       benchmark::Counter::kIsRate);
  state.counters["outputBytes"] = static_cast<double>(nOutput);
}

void Write(benchmark::State& state, bool pretty) {
  const std::string& json = BodyOfSize(state.range(0));
  VekMempool pool("bench");
  VekString error;
  ref<Dictionary> tree =
      Dictionary::FromJson(reinterpret_cast<const unsigned char*>(json.data()), json.size(), error, &pool);
  size_t written = 0;
  for (auto _ : state) {
    ByteBuffer out(&pool);
    tree->ToJson(out, JsonFormat(pretty));
    written = out.GetLength();
    benchmark::DoNotOptimize(out.GetData());
  }
  FinishWrite(state, json.size(), written);
}

void BM_WriteCompact(benchmark::State& state) { Write(state, false); }
BENCHMARK(BM_WriteCompact)->Apply(Sizes);
void BM_WritePretty(benchmark::State& state) { Write(state, true); }
BENCHMARK(BM_WritePretty)->Apply(Sizes);

void BM_RapidJsonParse(benchmark::State& state) {
  const std::string& json = BodyOfSize(state.range(0));
  for (auto _ : state) {
    rapidjson::Document document;
    document.Parse(json.data(), json.size());
    if (document.HasParseError()) state.SkipWithError("parse failed");
    benchmark::DoNotOptimize(&document);
  }
  state.SetBytesProcessed(state.iterations() * json.size());
}
BENCHMARK(BM_RapidJsonParse)->Apply(Sizes);

void BM_RapidJsonWrite(benchmark::State& state) {
  const std::string& json = BodyOfSize(state.range(0));
  rapidjson::Document document;
  document.Parse(json.data(), json.size());
  size_t written = 0;
  for (auto _ : state) {
    rapidjson::StringBuffer buffer;
    rapidjson::Writer<rapidjson::StringBuffer> writer(buffer);
    document.Accept(writer);
    written = buffer.GetSize();
    benchmark::DoNotOptimize(buffer.GetString());
  }
  FinishWrite(state, json.size(), written);
}
BENCHMARK(BM_RapidJsonWrite)->Apply(Sizes);

int Ignore0(void*) { return 1; }
int IgnoreBool(void*, int) { return 1; }
int IgnoreText(void*, const char*, size_t) { return 1; }
int IgnoreBytes(void*, const unsigned char*, size_t) { return 1; }

void BM_YajlTokenize(benchmark::State& state) {
  const std::string& json = BodyOfSize(state.range(0));
  static const yajl_callbacks callbacks = {Ignore0,    IgnoreBool,  nullptr, nullptr, IgnoreText, IgnoreBytes,
                                           Ignore0,    IgnoreBytes, Ignore0, Ignore0, Ignore0};
  for (auto _ : state) {
    yajl_handle handle = yajl_alloc(&callbacks, nullptr, nullptr);
    yajl_status status = yajl_parse(handle, reinterpret_cast<const unsigned char*>(json.data()), json.size());
    if (status != yajl_status_ok || yajl_complete_parse(handle) != yajl_status_ok) state.SkipWithError("failed");
    yajl_free(handle);
  }
  state.SetBytesProcessed(state.iterations() * json.size());
}
BENCHMARK(BM_YajlTokenize)->Apply(Sizes);

void BM_YajlTree(benchmark::State& state) {
  const std::string& json = BodyOfSize(state.range(0));
  char error[256];
  for (auto _ : state) {
    yajl_val tree = yajl_tree_parse(json.c_str(), error, sizeof error);
    if (tree == nullptr) state.SkipWithError(error);
    yajl_tree_free(tree);
  }
  state.SetBytesProcessed(state.iterations() * json.size());
}
BENCHMARK(BM_YajlTree)->Apply(Sizes);

}  // namespace

BENCHMARK_MAIN();
