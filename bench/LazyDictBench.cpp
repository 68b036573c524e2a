// The lazy payload on the recordingList bodies (about 200 KB and 5 MB of JSON) held in each form,
// against the converters it calls measured alone and the anchors of the same run: memcpy of the
// bytes, RapidJSON (Document::Parse, Writer) and the generated protocol-buffer mirror (parse and
// serialize).
// Forms (second argument): 0 Dict, 1 JSON, 2 protocol-buffer bytes, 3 object, 4 Dictionary,
// 5 byte source (an in-memory stream whose duplicates share the text). Third argument of the
// object conversions: feature 548 off or on. MB/s are over the body's JSON bytes throughout, so
// that rows compare directly. Counter "highWaterKB": the pool's high water of one conversion.
#include <benchmark/benchmark.h>

#include <cstring>
#include <map>
#include <memory>
#include <string>

#include "RecordingBody.h"
#include "mirror.pb.h"
#include "rapidjson/document.h"
#include "rapidjson/stringbuffer.h"
#include "rapidjson/writer.h"
#include "sarn/Sarn.h"

namespace {

using namespace sarn;

constexpr KernoVersion kVersion = benchbody::kVersion;

// One body in every form the payload can hold.
struct Forms {
  VekMempool poolM{"bench-lazy-forms"};
  std::string binaryM;
  ref<vek::ByteBuffer> jsonBytesM, binaryBytesM;
  ref<Dictionary> treeM;
  ref<Dict> dictM;
  wynbaselib::InMemoryBytestream streamM;
};

Forms& GetForms(size_t targetBytes) {
  static std::map<size_t, std::unique_ptr<Forms>> all;
  std::unique_ptr<Forms>& forms = all[targetBytes];
  if (forms) return *forms;
  benchbody::Body& body = benchbody::GetBody(targetBytes);
  forms.reset(new Forms);
  VekMempool* pool = &forms->poolM;
  ProtoBufByteOutputStream out;
  ProtoBuf(pool, Schema::vStructDefG, Schema::nStructDefG).MarshalKnownDict(body.listM.Get(), &out);
  const unsigned char* data;
  unsigned long length;
  out.Finish(data, length);
  forms->binaryM.assign(reinterpret_cast<const char*>(data), length);
  forms->jsonBytesM = vek::ByteBuffer::New(pool, body.jsonM.data(), body.jsonM.size());
  forms->binaryBytesM = vek::ByteBuffer::New(pool, data, length);
  forms->treeM = DictionarySarnObject(pool, Schema::vStructDefG, Schema::nStructDefG)
                     .SarnObjectToDictionary(body.listM.Get(), kVersion);
  forms->dictM = MempoolNew<Dict>(pool, forms->treeM);
  forms->streamM = wynbaselib::InMemoryBytestream(body.jsonM);
  return *forms;
}

ref<LazyDict> MakePayload(VekMempool* pool, size_t targetBytes, int form) {
  Forms& forms = GetForms(targetBytes);
  switch (form) {
    case 0: return LazyDict::FromDict(pool, forms.dictM, kVersion);
    case 1: return LazyDict::FromBytestring(pool, forms.jsonBytesM, kVersion);
    case 2: return LazyDict::FromBytestring(pool, forms.binaryBytesM, kVersion);
    case 3: return LazyDict::FromSarnObject(pool, benchbody::GetBody(targetBytes).listM, kVersion);
    case 4: return LazyDict::FromDictionary(pool, forms.treeM, kVersion);
    default: return LazyDict::FromBytesource(pool, new wynbaselib::InMemoryBytestream(forms.streamM), kVersion);
  }
}

size_t JsonSize(const benchmark::State& state) { return benchbody::GetBody(static_cast<size_t>(state.range(0))).jsonM.size(); }

void PerJsonByte(benchmark::State& state) {
  state.SetBytesProcessed(static_cast<int64_t>(state.iterations() * JsonSize(state)));
}

// ---- Anchors ---------------------------------------------------------------------------------

void BM_Memcpy(benchmark::State& state) {
  const std::string& json = benchbody::GetBody(static_cast<size_t>(state.range(0))).jsonM;
  std::unique_ptr<char[]> copy(new char[json.size()]);
  for (auto _ : state) {
    std::memcpy(copy.get(), json.data(), json.size());
    benchmark::DoNotOptimize(copy.get());
    benchmark::ClobberMemory();
  }
  PerJsonByte(state);
}

void BM_RapidJsonParse(benchmark::State& state) {
  const std::string& json = benchbody::GetBody(static_cast<size_t>(state.range(0))).jsonM;
  for (auto _ : state) {
    rapidjson::Document document;
    document.Parse(json.c_str(), json.size());
    benchmark::DoNotOptimize(&document);
  }
  PerJsonByte(state);
}

void BM_RapidJsonWriter(benchmark::State& state) {
  const std::string& json = benchbody::GetBody(static_cast<size_t>(state.range(0))).jsonM;
  rapidjson::Document document;
  document.Parse(json.c_str(), json.size());
  for (auto _ : state) {
    rapidjson::StringBuffer out;
    rapidjson::Writer<rapidjson::StringBuffer> writer(out);
    document.Accept(writer);
    benchmark::DoNotOptimize(out.GetString());
  }
  PerJsonByte(state);
}

void BM_ProtobufParse(benchmark::State& state) {
  const std::string& binary = GetForms(static_cast<size_t>(state.range(0))).binaryM;
  for (auto _ : state) {
    sarnmirror::KnownDict mirror;
    mirror.ParseFromString(binary);
    benchmark::DoNotOptimize(&mirror);
  }
  PerJsonByte(state);
}

void BM_ProtobufSerialize(benchmark::State& state) {
  const std::string& binary = GetForms(static_cast<size_t>(state.range(0))).binaryM;
  sarnmirror::KnownDict mirror;
  mirror.ParseFromString(binary);
  for (auto _ : state) {
    std::string out;
    mirror.SerializeToString(&out);
    benchmark::DoNotOptimize(out.data());
  }
  PerJsonByte(state);
}

// ---- The converters alone ----------------------------------------------------------------------

void BM_ConverterUnmarshal(benchmark::State& state) {
  Forms& forms = GetForms(static_cast<size_t>(state.range(0)));
  VekMempool pool("bench-lazy");
  for (auto _ : state) {
    ref<SarnObject> object;
    ProtoBuf(&pool, Schema::vStructDefG, Schema::nStructDefG)
        .UnmarshalKnownDict(forms.binaryBytesM->GetData(), static_cast<int>(forms.binaryBytesM->GetLength()), &object);
    benchmark::DoNotOptimize(object.Get());
  }
  PerJsonByte(state);
}

void BM_ConverterObjectToJson(benchmark::State& state) {
  benchbody::Body& body = benchbody::GetBody(static_cast<size_t>(state.range(0)));
  VekMempool pool("bench-lazy");
  for (auto _ : state) {
    ByteBuffer out(&pool);
    JsonSarnObject(&pool).SarnObjectToJson(body.listM.Get(), kVersion, out);
    benchmark::DoNotOptimize(out.GetData());
  }
  PerJsonByte(state);
}

void BM_ConverterJsonThroughDictionary(benchmark::State& state) {
  Forms& forms = GetForms(static_cast<size_t>(state.range(0)));
  VekMempool pool("bench-lazy");
  for (auto _ : state) {
    VekString error;
    ref<Dictionary> tree = Dictionary::FromJsonBytestring(forms.jsonBytesM, error, &pool);
    ref<SarnObject> object;
    DictionarySarnObject(&pool, Schema::vStructDefG, Schema::nStructDefG).DictionaryToSarnObject(tree, kVersion, object, error);
    benchmark::DoNotOptimize(object.Get());
  }
  PerJsonByte(state);
}

void BM_ConverterDirectRead(benchmark::State& state) {
  Forms& forms = GetForms(static_cast<size_t>(state.range(0)));
  VekMempool pool("bench-lazy");
  for (auto _ : state) {
    VekString error;
    ref<SarnObject> object;
    JsonSarnObject(&pool).JsonToSarnObject(forms.jsonBytesM->GetData(), static_cast<int>(forms.jsonBytesM->GetLength()),
                                           kVersion, &object, error);
    benchmark::DoNotOptimize(object.Get());
  }
  PerJsonByte(state);
}

void BM_ConverterMarshal(benchmark::State& state) {
  benchbody::Body& body = benchbody::GetBody(static_cast<size_t>(state.range(0)));
  VekMempool pool("bench-lazy");
  for (auto _ : state) {
    ProtoBufByteOutputStream out;
    ProtoBuf(&pool, Schema::vStructDefG, Schema::nStructDefG).MarshalKnownDict(body.listM.Get(), &out);
    const unsigned char* data;
    unsigned long length;
    out.Finish(data, length);
    ref<vek::ByteBuffer> bytes = vek::ByteBuffer::New(&pool, data, length);
    benchmark::DoNotOptimize(bytes.Get());
  }
  PerJsonByte(state);
}

// ---- The payload ---------------------------------------------------------------------------------

void BM_LazyToSarnObject(benchmark::State& state) {
  size_t size = static_cast<size_t>(state.range(0));
  VekFeatures::SetEnabled(548, state.range(2) != 0);
  size_t highWater = 0;
  for (auto _ : state) {
    VekMempool pool("bench-lazy");
    ref<LazyDict> payload = MakePayload(&pool, size, static_cast<int>(state.range(1)));
    ref<SarnObject> object;
    if (!payload->ToSarnObject(object)) {
      state.SkipWithError("the payload did not convert");
      break;
    }
    highWater = pool.GetUsedBytesHighWater();
    object.Reset();
    payload.Reset();
  }
  VekFeatures::SetEnabled(548, false);
  PerJsonByte(state);
  state.counters["highWaterKB"] = static_cast<double>(highWater) / 1024.0;
}

void BM_LazyCompactToBuffer(benchmark::State& state) {
  VekMempool pool("bench-lazy");
  ref<LazyDict> payload = MakePayload(&pool, static_cast<size_t>(state.range(0)), static_cast<int>(state.range(1)));
  for (auto _ : state) {
    ByteBuffer out(&pool);
    payload->ToJsonByteBuffer(out, false);
    benchmark::DoNotOptimize(out.GetData());
  }
  PerJsonByte(state);
}

void BM_LazyCompactToSink(benchmark::State& state) {
  VekMempool pool("bench-lazy");
  ref<LazyDict> payload = MakePayload(&pool, static_cast<size_t>(state.range(0)), static_cast<int>(state.range(1)));
  VekFeatures::SetEnabled(548, state.range(2) != 0);
  for (auto _ : state) {
    wynbaselib::InMemoryBytestream sink;
    payload->ToJsonBytesink(sink, false);
    benchmark::DoNotOptimize(&sink);
  }
  VekFeatures::SetEnabled(548, false);
  PerJsonByte(state);
}

void BM_LazyCompactBytestring(benchmark::State& state) {
  VekMempool pool("bench-lazy");
  ref<LazyDict> payload = MakePayload(&pool, static_cast<size_t>(state.range(0)), 1);
  for (auto _ : state) benchmark::DoNotOptimize(payload->ToJsonBytestring(false).Get());
  PerJsonByte(state);
}

void BM_LazyToProtobuf(benchmark::State& state) {
  VekMempool pool("bench-lazy");
  ref<LazyDict> payload = MakePayload(&pool, static_cast<size_t>(state.range(0)), static_cast<int>(state.range(1)));
  for (auto _ : state) benchmark::DoNotOptimize(payload->ToProtobuf().Get());
  PerJsonByte(state);
}

// What the log line's figures cost each conversion: two clock readings and four pool figures.
void BM_LogFigures(benchmark::State& state) {
  VekMempool pool("bench-lazy");
  for (auto _ : state) {
    VekTime start = VekMonotonicTime::Now();
    size_t figures = pool.GetUsedBytes() + pool.GetUsedBytesHighWater();
    VekTime end = VekMonotonicTime::Now();
    figures += pool.GetUsedBytes() + pool.GetUsedBytesHighWater();
    benchmark::DoNotOptimize(figures);
    benchmark::DoNotOptimize((end - start).GetNanoseconds());
  }
}

constexpr int64_t kSmall = 200 * 1024;
constexpr int64_t kLarge = 5 * 1024 * 1024;

void Sizes(benchmark::internal::Benchmark* b) {
  b->Arg(kSmall)->Arg(kLarge)->Unit(benchmark::kMicrosecond);
}
void EveryForm(benchmark::internal::Benchmark* b) {
  for (int64_t size : {kSmall, kLarge}) {
    for (int64_t form = 0; form < 6; ++form) b->Args({size, form});
  }
  b->Unit(benchmark::kMicrosecond);
}
void EveryFormBothWays(benchmark::internal::Benchmark* b) {
  for (int64_t size : {kSmall, kLarge}) {
    for (int64_t form = 0; form < 6; ++form) b->Args({size, form, 0})->Args({size, form, 1});
  }
  b->Unit(benchmark::kMicrosecond);
}

BENCHMARK(BM_Memcpy)->Apply(Sizes);
BENCHMARK(BM_RapidJsonParse)->Apply(Sizes);
BENCHMARK(BM_RapidJsonWriter)->Apply(Sizes);
BENCHMARK(BM_ProtobufParse)->Apply(Sizes);
BENCHMARK(BM_ProtobufSerialize)->Apply(Sizes);
BENCHMARK(BM_ConverterUnmarshal)->Apply(Sizes);
BENCHMARK(BM_ConverterObjectToJson)->Apply(Sizes);
BENCHMARK(BM_ConverterJsonThroughDictionary)->Apply(Sizes);
BENCHMARK(BM_ConverterDirectRead)->Apply(Sizes);
BENCHMARK(BM_ConverterMarshal)->Apply(Sizes);
BENCHMARK(BM_LazyToSarnObject)->Apply(EveryFormBothWays);
BENCHMARK(BM_LazyCompactToBuffer)->Apply(EveryForm);
BENCHMARK(BM_LazyCompactToSink)->Apply(EveryFormBothWays);
BENCHMARK(BM_LazyCompactBytestring)->Apply(Sizes);
BENCHMARK(BM_LazyToProtobuf)->Apply(EveryForm);
BENCHMARK(BM_LogFigures);

}  // namespace

BENCHMARK_MAIN();
