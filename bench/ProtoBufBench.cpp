// The binary form against a protocol-buffer library on byte-identical messages: the recordingList
// bodies of the object benchmarks (about 200 KB and 5 MB of JSON) marshalled by us, and the
// generated mirror message the library parses from those bytes (the run stops unless the library
// writes our bytes back exactly). MB/s over the binary bytes: our MarshalKnownDict + Finish into a
// fresh stream against generated SerializeToString into a fresh string (and the stream without
// Finish, to tell the two halves apart); UnmarshalKnownDict into a
// fresh object (release timed) against generated ParseFromString into a fresh message and a
// DynamicMessage over a descriptor in its own pool (destruction timed).
// Counters: pool bytes per byte read ("poolPerByte"), binary size over compact JSON ("sizeOfJson").
#include <benchmark/benchmark.h>
#include <google/protobuf/descriptor.h>
#include <google/protobuf/descriptor.pb.h>
#include <google/protobuf/dynamic_message.h>

#include <cstdio>
#include <cstdlib>
#include <map>
#include <memory>
#include <string>

#include "RecordingBody.h"
#include "mirror.pb.h"

namespace {

using namespace sarn;

struct Binary {
  std::string bytesM;
  double sizeOfJsonM = 0;
};

std::string Marshal(VekMempool* pool, const SarnObject* object) {
  ProtoBuf codec(pool, Schema::vStructDefG, Schema::nStructDefG);
  ProtoBufByteOutputStream out;
  codec.MarshalKnownDict(object, &out);
  const unsigned char* data;
  unsigned long length;
  out.Finish(data, length);
  return std::string(reinterpret_cast<const char*>(data), length);
}

Binary& GetBinary(size_t targetBytes) {
  static std::map<size_t, std::unique_ptr<Binary>> binaries;
  std::unique_ptr<Binary>& binary = binaries[targetBytes];
  if (binary) return *binary;
  benchbody::Body& body = benchbody::GetBody(targetBytes);
  VekMempool scratch("bench-scratch");
  binary.reset(new Binary);
  binary->bytesM = Marshal(&scratch, body.listM.Get());
  JsonSarnObject json(&scratch);
  VekString compact = json.SarnObjectToJson(body.listM.Get(), 0);
  binary->sizeOfJsonM = static_cast<double>(binary->bytesM.size()) / static_cast<double>(compact.NByte());
  sarnmirror::KnownDict mirror;
  if (!mirror.ParseFromString(binary->bytesM) || mirror.SerializeAsString() != binary->bytesM) {
    std::fprintf(stderr, "the mirror does not write our bytes back: the comparison would not be fair\n");
    std::abort();
  }
  return *binary;
}

// With `isFinished` false the stream is left unresolved: the difference between the two runs is
// what resolving the sections (Finish) costs.
void SarnMarshal(benchmark::State& state, bool isFinished) {
  benchbody::Body& body = benchbody::GetBody(static_cast<size_t>(state.range(0)));
  Binary& binary = GetBinary(static_cast<size_t>(state.range(0)));
  VekMempool pool("bench-marshal");
  ProtoBuf codec(&pool, Schema::vStructDefG, Schema::nStructDefG);
  for (auto _ : state) {
    ProtoBufByteOutputStream out;
    codec.MarshalKnownDict(body.listM.Get(), &out);
    const unsigned char* data = out.bytesM.pDataM;
    unsigned long length;
    if (isFinished) out.Finish(data, length);
    benchmark::DoNotOptimize(data);
  }
  state.SetBytesProcessed(static_cast<int64_t>(state.iterations() * binary.bytesM.size()));
  if (isFinished) state.counters["sizeOfJson"] = binary.sizeOfJsonM;
}

void BM_SarnMarshal(benchmark::State& state) { SarnMarshal(state, true); }
void BM_SarnMarshalWithoutFinish(benchmark::State& state) { SarnMarshal(state, false); }

void BM_ProtobufSerialize(benchmark::State& state) {
  Binary& binary = GetBinary(static_cast<size_t>(state.range(0)));
  sarnmirror::KnownDict mirror;
  mirror.ParseFromString(binary.bytesM);
  for (auto _ : state) {
    std::string out;
    mirror.SerializeToString(&out);
    benchmark::DoNotOptimize(out.data());
  }
  state.SetBytesProcessed(static_cast<int64_t>(state.iterations() * binary.bytesM.size()));
}

void BM_SarnUnmarshal(benchmark::State& state) {
  Binary& binary = GetBinary(static_cast<size_t>(state.range(0)));
  VekMempool pool("bench-unmarshal");
  ProtoBuf codec(&pool, Schema::vStructDefG, Schema::nStructDefG);
  size_t poolBytes = 0;
  for (auto _ : state) {
    ref<SarnObject> object;
    if (!codec.UnmarshalKnownDict(reinterpret_cast<const unsigned char*>(binary.bytesM.data()),
                                  static_cast<int>(binary.bytesM.size()), &object)) {
      state.SkipWithError("our bytes do not read back");
      break;
    }
    poolBytes = pool.GetUsedBytes();
  }
  state.SetBytesProcessed(static_cast<int64_t>(state.iterations() * binary.bytesM.size()));
  state.counters["poolPerByte"] = static_cast<double>(poolBytes) / static_cast<double>(binary.bytesM.size());
}

void BM_ProtobufParse(benchmark::State& state) {
  Binary& binary = GetBinary(static_cast<size_t>(state.range(0)));
  for (auto _ : state) {
    sarnmirror::KnownDict mirror;
    mirror.ParseFromString(binary.bytesM);
    benchmark::DoNotOptimize(&mirror);
  }
  state.SetBytesProcessed(static_cast<int64_t>(state.iterations() * binary.bytesM.size()));
}

void BM_DynamicMessageParse(benchmark::State& state) {
  Binary& binary = GetBinary(static_cast<size_t>(state.range(0)));
  google::protobuf::FileDescriptorProto file;
  sarnmirror::KnownDict::descriptor()->file()->CopyTo(&file);
  google::protobuf::DescriptorPool descriptors;
  const google::protobuf::FileDescriptor* built = descriptors.BuildFile(file);
  google::protobuf::DynamicMessageFactory factory(&descriptors);
  const google::protobuf::Message* prototype =
      built != nullptr ? factory.GetPrototype(built->FindMessageTypeByName("KnownDict")) : nullptr;
  if (prototype == nullptr) {
    state.SkipWithError("no descriptor");
    return;
  }
  for (auto _ : state) {
    std::unique_ptr<google::protobuf::Message> message(prototype->New());
    message->ParseFromString(binary.bytesM);
    benchmark::DoNotOptimize(message.get());
  }
  state.SetBytesProcessed(static_cast<int64_t>(state.iterations() * binary.bytesM.size()));
}

constexpr int64_t kSmall = 200 * 1024;
constexpr int64_t kLarge = 5 * 1024 * 1024;

BENCHMARK(BM_SarnMarshal)->Arg(kSmall)->Arg(kLarge)->Unit(benchmark::kMicrosecond);
BENCHMARK(BM_SarnMarshalWithoutFinish)->Arg(kSmall)->Arg(kLarge)->Unit(benchmark::kMicrosecond);
BENCHMARK(BM_ProtobufSerialize)->Arg(kSmall)->Arg(kLarge)->Unit(benchmark::kMicrosecond);
BENCHMARK(BM_SarnUnmarshal)->Arg(kSmall)->Arg(kLarge)->Unit(benchmark::kMicrosecond);
BENCHMARK(BM_ProtobufParse)->Arg(kSmall)->Arg(kLarge)->Unit(benchmark::kMicrosecond);
BENCHMARK(BM_DynamicMessageParse)->Arg(kSmall)->Arg(kLarge)->Unit(benchmark::kMicrosecond);

}  // namespace

BENCHMARK_MAIN();
