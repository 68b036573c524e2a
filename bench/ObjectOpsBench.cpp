// Object operations against a protocol-buffer library on the same recordingList bodies (one
// recording, about 200 KB and about 5 MB of JSON), the library's messages parsed from our binary
// form of each body:
//   - equality of two equal objects (read back from the binary form, so nothing is shared) against
//     MessageDifferencer::Equals of two equal messages; a difference in the first field (isTop
//     present on one side) and one in the last recording's title;
//   - Clone against CopyFrom into a fresh message, and against Clone's two halves timed alone
//     (ToDictionary, DictionaryToSarnObject);
//   - each version conversion against making its result alone (the envelope's factory, the
//     wrapper's New); a version-1 request parses its body, so it is measured over the one-recording
//     body.
// MB/s are over the binary bytes of the body.
#include <benchmark/benchmark.h>
#include <google/protobuf/util/message_differencer.h>

#include <map>
#include <memory>
#include <string>

#include "RecordingBody.h"
#include "mirror.pb.h"

namespace {

using namespace sarn;
using google::protobuf::util::MessageDifferencer;

constexpr int64_t kOne = 1;
constexpr int64_t kSmall = 200 * 1024;
constexpr int64_t kLarge = 5 * 1024 * 1024;

// One body with its equal and differing copies, on both sides.
struct Pair {
  std::string bytesM;
  ref<SarnObject> equalM, firstDiffersM, lastDiffersM;
  sarnmirror::KnownDict mirrorM, mirrorEqualM, mirrorLastDiffersM;
};

// Byte strings are never equal, so the bodies' optional ones are left out on both sides; false
// when a required or multi one remains.
bool DropByteStrings(SarnObject* object) {
  const StructInfo* info = object->GetStructInfo();
  bool isOk = true;
  for (unsigned n = 0; n < info->nFieldInfo; ++n) {
    const FieldInfo& field = info->vFieldInfo[n];
    if (field.arity == SARN_ARITY_NONE || !IsFieldPresent(object, field)) continue;
    if (field.dataType == SARN_DATA_TYPE_BYTESTRING) {
      if (field.arity != SARN_ARITY_OPTIONAL) return false;
      if (field.flagOffset != 0) reinterpret_cast<unsigned char*>(object)[field.flagOffset] = 0;
      FieldAccess::PutReference(object, field, nullptr);
    } else if (field.dataType == SARN_DATA_TYPE_KNOWN_DICT || field.dataType == SARN_DATA_TYPE_SUBDICT) {
      for (unsigned i = 0; i < FieldAccess::Count(object, field); ++i) {
        VekCore* inner = FieldAccess::ReferenceAt(object, field, i);
        if (inner != nullptr) isOk = DropByteStrings(static_cast<SarnObject*>(inner)) && isOk;
      }
    }
  }
  return isOk;
}

ref<SarnObject> Read(VekMempool* pool, const std::string& bytes) {
  ProtoBuf codec(pool, Schema::vStructDefG, Schema::nStructDefG);
  ref<SarnObject> object;
  codec.UnmarshalKnownDict(reinterpret_cast<const unsigned char*>(bytes.data()), static_cast<int>(bytes.size()), &object);
  return object;
}

Pair& GetPair(size_t targetBytes) {
  static std::map<size_t, std::unique_ptr<Pair>> pairs;
  std::unique_ptr<Pair>& pair = pairs[targetBytes];
  if (pair) return *pair;
  benchbody::Body& body = benchbody::GetBody(targetBytes);
  VekMempool* pool = &body.poolM;
  pair.reset(new Pair);
  if (!DropByteStrings(body.listM.Get())) std::abort();
  ProtoBuf codec(pool, Schema::vStructDefG, Schema::nStructDefG);
  ProtoBufByteOutputStream out;
  codec.MarshalKnownDict(body.listM.Get(), &out);
  const unsigned char* data;
  unsigned long length;
  out.Finish(data, length);
  pair->bytesM.assign(reinterpret_cast<const char*>(data), length);
  pair->equalM = Read(pool, pair->bytesM);
  pair->firstDiffersM = Read(pool, pair->bytesM);
  static_cast<sarnschema::RecordingList*>(pair->firstDiffersM.Get())->fHasIsTopM = true;
  pair->lastDiffersM = Read(pool, pair->bytesM);
  auto* list = static_cast<sarnschema::RecordingList*>(pair->lastDiffersM.Get());
  static_cast<sarnschema::Recording*>(list->recordingM.Get(list->recordingM.Count() - 1))->titleM = VekString("other");
  pair->mirrorM.ParseFromString(pair->bytesM);
  pair->mirrorEqualM.ParseFromString(pair->bytesM);
  pair->mirrorLastDiffersM.ParseFromString(pair->bytesM);
  auto* recordings = pair->mirrorLastDiffersM.mutable_recordinglist();
  recordings->mutable_recording(recordings->recording_size() - 1)->set_title("other");
  if (!(*body.listM == *pair->equalM) || *body.listM == *pair->lastDiffersM ||
      !MessageDifferencer::Equals(pair->mirrorM, pair->mirrorEqualM)) {
    std::fprintf(stderr, "the copies do not compare as built: the comparison would not be fair\n");
    std::abort();
  }
  return *pair;
}

void SetBytes(benchmark::State& state, const Pair& pair) {
  state.SetBytesProcessed(static_cast<int64_t>(state.iterations() * pair.bytesM.size()));
}

template <ref<SarnObject> Pair::*kOther>
void BM_SarnEquals(benchmark::State& state) {
  Pair& pair = GetPair(static_cast<size_t>(state.range(0)));
  const SarnObject& left = *benchbody::GetBody(static_cast<size_t>(state.range(0))).listM;
  for (auto _ : state) benchmark::DoNotOptimize(left == *(pair.*kOther));
  SetBytes(state, pair);
}

template <sarnmirror::KnownDict Pair::*kOther>
void BM_ProtobufEquals(benchmark::State& state) {
  Pair& pair = GetPair(static_cast<size_t>(state.range(0)));
  for (auto _ : state) benchmark::DoNotOptimize(MessageDifferencer::Equals(pair.mirrorM, pair.*kOther));
  SetBytes(state, pair);
}

void BM_SarnClone(benchmark::State& state) {
  Pair& pair = GetPair(static_cast<size_t>(state.range(0)));
  for (auto _ : state) benchmark::DoNotOptimize(pair.equalM->Clone(sarnschema::RecordingList::TYPE_ID).Get());
  SetBytes(state, pair);
}

void BM_SarnToDictionary(benchmark::State& state) {
  Pair& pair = GetPair(static_cast<size_t>(state.range(0)));
  for (auto _ : state) benchmark::DoNotOptimize(pair.equalM->ToDictionary(0).Get());
  SetBytes(state, pair);
}

void BM_SarnDictionaryToObject(benchmark::State& state) {
  Pair& pair = GetPair(static_cast<size_t>(state.range(0)));
  VekMempool* pool = pair.equalM->GetMempool();
  ref<Dictionary> dictionary = pair.equalM->ToDictionary(0);
  DictionarySarnObject converter(pool, Schema::vStructDefG, Schema::nStructDefG);
  for (auto _ : state) {
    ref<SarnObject> object;
    VekString error;
    benchmark::DoNotOptimize(converter.DictionaryToSarnObject(dictionary, 0, object, error));
  }
  SetBytes(state, pair);
}

void BM_ProtobufCopyFrom(benchmark::State& state) {
  Pair& pair = GetPair(static_cast<size_t>(state.range(0)));
  for (auto _ : state) {
    sarnmirror::KnownDict copy;
    copy.CopyFrom(pair.mirrorM);
    benchmark::DoNotOptimize(&copy);
  }
  SetBytes(state, pair);
}

// The version conversions, each beside the making of its result alone. Bodies are shared, so
// their size does not matter except for a version-1 request, whose body is parsed.
struct Messages {
  VekMempool poolM{"bench-messages"};
  ref<LazyDict> bodyM;
  ref<Dict> headersM;
  ref<KernoRpcWrapper> requestM, responseM, cancelM;
  ref<SarnObject> v1RequestM, v1ResponseM, v1CancelM;
};

Messages& GetMessages() {
  static Messages* messages = nullptr;
  if (messages != nullptr) return *messages;
  messages = new Messages;
  VekMempool* pool = &messages->poolM;
  messages->bodyM = LazyDict::FromJsonString(pool, VekString(benchbody::GetBody(kOne).jsonM.c_str()), 42);
  messages->headersM = Dict::New(pool, VekString());
  messages->requestM = RequestWrapper::New(pool, 1, VekString("recordingList"), RequestWrapper::ResponseCountSingle,
                                           42, messages->bodyM, messages->headersM);
  messages->responseM = ResponseWrapper::New(pool, 1, true, messages->bodyM, messages->headersM);
  messages->cancelM = CancelWrapper::New(pool, 1, messages->headersM);
  messages->v1RequestM = KernoRpcV2::KernoRpcV2ToV1(pool, messages->requestM);
  messages->v1ResponseM = KernoRpcV2::KernoRpcV2ToV1(pool, messages->responseM);
  messages->v1CancelM = KernoRpcV2::KernoRpcV2ToV1(pool, messages->cancelM);
  return *messages;
}

template <ref<KernoRpcWrapper> Messages::*kMessage>
void BM_ToV1(benchmark::State& state) {
  Messages& m = GetMessages();
  for (auto _ : state) benchmark::DoNotOptimize(KernoRpcV2::KernoRpcV2ToV1(&m.poolM, m.*kMessage).Get());
}

template <class Envelope>
void BM_EnvelopeFactory(benchmark::State& state) {
  Messages& m = GetMessages();
  for (auto _ : state) benchmark::DoNotOptimize(Envelope::Factory(&m.poolM).Get());
}

template <ref<SarnObject> Messages::*kObject>
void BM_ToV2(benchmark::State& state) {
  Messages& m = GetMessages();
  for (auto _ : state) benchmark::DoNotOptimize(KernoRpcV2::KernoRpcV1ToV2Wrapper(&m.poolM, m.*kObject).Get());
}

void BM_RequestWrapperNew(benchmark::State& state) {
  Messages& m = GetMessages();
  VekString type("recordingList");
  for (auto _ : state) {
    benchmark::DoNotOptimize(
        RequestWrapper::New(&m.poolM, 1, type, RequestWrapper::ResponseCountSingle, 42, m.bodyM, m.headersM).Get());
  }
}

void BM_ResponseWrapperNew(benchmark::State& state) {
  Messages& m = GetMessages();
  for (auto _ : state) benchmark::DoNotOptimize(ResponseWrapper::New(&m.poolM, 1, true, m.bodyM, m.headersM).Get());
}

void BM_CancelWrapperNew(benchmark::State& state) {
  Messages& m = GetMessages();
  for (auto _ : state) benchmark::DoNotOptimize(CancelWrapper::New(&m.poolM, 1, m.headersM).Get());
}

#define SIZES ->Arg(kOne)->Arg(kSmall)->Arg(kLarge)->Unit(benchmark::kMicrosecond)
BENCHMARK_TEMPLATE(BM_SarnEquals, &Pair::equalM) SIZES;
BENCHMARK_TEMPLATE(BM_ProtobufEquals, &Pair::mirrorEqualM) SIZES;
BENCHMARK_TEMPLATE(BM_SarnEquals, &Pair::firstDiffersM) SIZES;
BENCHMARK_TEMPLATE(BM_SarnEquals, &Pair::lastDiffersM) SIZES;
BENCHMARK_TEMPLATE(BM_ProtobufEquals, &Pair::mirrorLastDiffersM) SIZES;
BENCHMARK(BM_SarnClone) SIZES;
BENCHMARK(BM_SarnToDictionary) SIZES;
BENCHMARK(BM_SarnDictionaryToObject) SIZES;
BENCHMARK(BM_ProtobufCopyFrom) SIZES;
BENCHMARK_TEMPLATE(BM_ToV1, &Messages::requestM);
BENCHMARK_TEMPLATE(BM_EnvelopeFactory, sarnschema::KernoRpcRequest);
BENCHMARK_TEMPLATE(BM_ToV1, &Messages::responseM);
BENCHMARK_TEMPLATE(BM_EnvelopeFactory, sarnschema::KernoRpcResponse);
BENCHMARK_TEMPLATE(BM_ToV1, &Messages::cancelM);
BENCHMARK_TEMPLATE(BM_EnvelopeFactory, sarnschema::KernoRpcCancel);
BENCHMARK_TEMPLATE(BM_ToV2, &Messages::v1RequestM);
BENCHMARK(BM_RequestWrapperNew);
BENCHMARK_TEMPLATE(BM_ToV2, &Messages::v1ResponseM);
BENCHMARK(BM_ResponseWrapperNew);
BENCHMARK_TEMPLATE(BM_ToV2, &Messages::v1CancelM);
BENCHMARK(BM_CancelWrapperNew);

}  // namespace

BENCHMARK_MAIN();
