// What `sarn decode` does with a capture, made as the same library calls in one process: each
// frame delimited by the packetizer, read by the byte-source reader (validated), its headers
// and its body, typed (the object's dictionary at the message's version) or as received,
// written as pretty JSON. The tool's own cost is its time on the same capture over this one.
//
// SARN_BENCH_CAPTURES=DIR also writes the captures measured here to DIR (worked.mrpc: 10,000
// worked-example frames; large-5.mrpc and large-20.mrpc: responses carrying the anchors'
// recordingList body of about 5 MB), for timing the tool on them.
#include <benchmark/benchmark.h>

#include <cstdlib>
#include <fstream>
#include <string>

#include "RecordingBody.h"

namespace {

using namespace sarn;

const std::string kWorkedFrame = std::string(
    "MRPC/2 135 31\r\nContent-Type: application/json\r\nRequestType: kernoCurrentTimeGet\r\n"
    "ResponseCount: single\r\nRpcId: 7\r\nSchemaVersion: 42\r\nType: request\r\n\r\n"
    "{\"type\": \"kernoCurrentTimeGet\"}");

std::string Repeat(const std::string& frame, size_t n) {
  std::string capture;
  capture.reserve(frame.size() * n);
  for (size_t i = 0; i < n; ++i) capture += frame;
  return capture;
}

// A final response carrying the recordingList body just under the body limit.
const std::string& LargeFrame() {
  static std::string frame;
  if (!frame.empty()) return frame;
  const std::string& body = benchbody::GetBody(5000000).jsonM;
  std::string headers = "Content-Type: application/json\r\nIsFinal: true\r\nRpcId: 9\r\nSchemaVersion: 42\r\n"
                        "Type: response\r\n\r\n";
  frame = "MRPC/2 " + std::to_string(headers.size()) + " " + std::to_string(body.size()) + "\r\n" + headers + body;
  return frame;
}

// Decodes a whole capture; returns the bytes of JSON written.
size_t Decode(const std::string& capture, bool isTyped) {
  size_t written = 0;
  for (size_t offset = 0; offset < capture.size();) {
    VekMempool pool("frame");
    KernoRpcV2Packetizer packetizer(&pool);
    size_t look = capture.size() - offset < 64 ? capture.size() - offset : 64;
    packetizer.UpdateInput(VekString::FromUtf8Bytes(&pool, look, capture.data() + offset));
    size_t length = packetizer.packetLengthM;
    if (!packetizer.decidedM || length == 0 || offset + length > capture.size()) std::abort();
    wynbaselib::InMemoryBytestream source(capture.data() + offset, length);
    VekString error;
    ref<KernoRpcWrapper> message = KernoRpcV2BytestreamImpl::UnmarshalFromBytesource(
        &pool, source, KernoRpcV2BytestreamImpl::LazyValidated, error);
    if (!message) std::abort();
    ref<Dict> dict = message->HeadersToDict(&pool);
    ref<LazyDict> body;
    if (auto* request = dynamic_cast<RequestWrapper*>(message.Get())) body = request->bodyM;
    if (auto* response = dynamic_cast<ResponseWrapper*>(message.Get())) body = response->bodyM;
    if (isTyped) {
      ref<SarnObject> object = body->ToSarnObjectOrErrorString(error);
      ref<Dictionary> received = body->ToDictionary(error);
      DictionarySarnObject converter(&pool, Schema::vStructDefG, Schema::nStructDefG);
      ref<Dictionary> typed = converter.SarnObjectToDictionary(object.Get(), body->versionM);
      if (!object || !received || !typed) std::abort();
      dict->AddDict("body", MempoolNew<Dict>(&pool, typed));
    } else {
      dict->AddDict("body", message->BodyToDict());
    }
    written += dict->ToString(true).NByte() + 1;
    offset += length;
  }
  return written;
}

void BM_DecodeWorked(benchmark::State& state) {
  std::string capture = Repeat(kWorkedFrame, 10000);
  for (auto _ : state) benchmark::DoNotOptimize(Decode(capture, state.range(0) != 0));
  state.SetBytesProcessed(static_cast<int64_t>(state.iterations() * capture.size()));
  state.counters["frames/s"] = benchmark::Counter(10000.0 * state.iterations(), benchmark::Counter::kIsRate);
}

void BM_DecodeLarge(benchmark::State& state) {
  std::string capture = Repeat(LargeFrame(), 20);
  for (auto _ : state) benchmark::DoNotOptimize(Decode(capture, state.range(0) != 0));
  state.SetBytesProcessed(static_cast<int64_t>(state.iterations() * capture.size()));
}

BENCHMARK(BM_DecodeWorked)->ArgName("typed")->Arg(1)->Arg(0)->Unit(benchmark::kMillisecond);
BENCHMARK(BM_DecodeLarge)->ArgName("typed")->Arg(1)->Arg(0)->Unit(benchmark::kMillisecond)->Iterations(1);

}  // namespace

int main(int argc, char** argv) {
  if (const char* dir = std::getenv("SARN_BENCH_CAPTURES")) {
    std::ofstream(std::string(dir) + "/worked.mrpc", std::ios::binary) << Repeat(kWorkedFrame, 10000);
    std::ofstream(std::string(dir) + "/large-5.mrpc", std::ios::binary) << Repeat(LargeFrame(), 5);
    std::ofstream(std::string(dir) + "/large-20.mrpc", std::ios::binary) << Repeat(LargeFrame(), 20);
  }
  benchmark::Initialize(&argc, argv);
  benchmark::RunSpecifiedBenchmarks();
  benchmark::Shutdown();
  return 0;
}
