// Messages end to end, against http-parser parsing an HTTP/1.1 request of the same head size in
// the same run ("msgs/s"), and large bodies (the recordingList text of about 5 MB and one of
// about 1 MB) written and read in MB/s of frame beside memcpy, http-parser on a request carrying
// the same body, and the work a frame hands on (the object writer, the streaming parser, the
// gzip sink) alone on the body.
//
// Readers: 0 the string reader keeping the body as text, 1 the string reader parsing it at once,
// 2 to 4 the byte-source reader in settings 0 (kept compressed), 1 (checked, kept compressed)
// and 2 (parsed to a Dictionary).
// Memory counters of the byte-source reader in settings 0 and 1: what releasing a wrapper just read
// gives back to the C heap (mallinfo2, which includes the pool's blocks over 512 bytes) and to its
// pool, the pool's high point during the read, and "gzipBytes", the body compressed alone.
#include <benchmark/benchmark.h>
#include <http_parser.h>
#include <malloc.h>

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <map>
#include <memory>
#include <string>
#include <vector>

#include "RecordingBody.h"
#include "sarn/Sarn.h"

namespace {

using namespace sarn;
using Impl = KernoRpcV2BytestreamImpl;

constexpr int kSmallMessages = 1000;
const Impl::LazinessSettings kSettings[] = {Impl::LazyUnparsed, Impl::LazyValidated, Impl::ParsedToDictionary};

// The worked example: a request of type kernoCurrentTimeGet, 150 bytes of first line and headers.
ref<KernoRpcWrapper> SmallRequest(VekMempool* pool) {
  return RequestWrapper::New(pool, 7, RequestWrapper::ResponseCountSingle, 42,
                             sarnschema::KernoCurrentTimeGet::Factory(pool), nullptr);
}

std::string Text(const VekString& text) { return std::string(text.Utf8(), text.NByte()); }

// The anchors' HTTP/1.1 request: the frame's headers with Content-Length for ResponseCount, its
// head padded to 144 bytes, carrying `body`.
std::string HttpRequest(const std::string& body) {
  std::string head = "POST / HTTP/1.1\r\nContent-Type: application/json\r\nContent-Length: " +
                     std::to_string(body.size()) + "\r\nRequestType: kernoCurrentTimeGet\r\nRpcId: 7\r\nSchemaVersion: 42\r\nType: ";
  head += std::string(head.size() + 5 < 144 ? 144 - head.size() - 4 : 1, 'r') + "\r\n\r\n";
  return head + body;
}

int OnHttpComplete(http_parser* parser) {
  ++*static_cast<int*>(parser->data);
  return 0;
}

int ParseHttp(const std::string& request) {
  static http_parser_settings settings = [] {
    http_parser_settings s;
    std::memset(&s, 0, sizeof s);
    s.on_message_complete = OnHttpComplete;
    return s;
  }();
  int complete = 0;
  http_parser parser;
  http_parser_init(&parser, HTTP_REQUEST);
  parser.data = &complete;
  http_parser_execute(&parser, &settings, request.data(), request.size());
  return complete;
}

ref<KernoRpcWrapper> Read(VekMempool* pool, int reader, const VekString& frame, const std::string& bytes) {
  VekString error;
  ref<KernoRpcWrapper> message;
  if (reader < 2) {
    message = KernoRpcV2::UnmarshalFromString(pool, frame, reader == 1, error);
  } else {
    wynbaselib::InMemoryBytestream source(bytes.data(), bytes.size());
    message = Impl::UnmarshalFromBytesource(pool, source, kSettings[reader - 2], error);
  }
  if (!message) std::abort();
  return message;
}

void ReportMessages(benchmark::State& state, int64_t perIteration) {
  state.counters["msgs/s"] =
      benchmark::Counter(static_cast<double>(perIteration * state.iterations()), benchmark::Counter::kIsRate);
}

// ---- Small messages -------------------------------------------------------------------------

void BM_HttpParserRequest(benchmark::State& state) {
  const std::string request = HttpRequest("{\"type\": \"kernoCurrentTimeGet\"}");
  for (auto _ : state) {
    int complete = 0;
    for (int i = 0; i < kSmallMessages; ++i) complete += ParseHttp(request);
    if (complete != kSmallMessages) std::abort();
  }
  ReportMessages(state, kSmallMessages);
}
BENCHMARK(BM_HttpParserRequest);

// Object, RequestWrapper::New, MarshalToString, a reader, UnmarshalToSarnObject.
void BM_EndToEnd(benchmark::State& state) {
  VekMempool pool("bench-rpc");
  const int reader = static_cast<int>(state.range(0));
  for (auto _ : state) {
    for (int i = 0; i < kSmallMessages; ++i) {
      VekString frame = KernoRpcV2::MarshalToString(&pool, SmallRequest(&pool), false);
      ref<KernoRpcWrapper> back = Read(&pool, reader, frame, reader < 2 ? std::string() : Text(frame));
      if (!static_cast<RequestWrapper*>(back.Get())->UnmarshalToSarnObject()) std::abort();
    }
  }
  ReportMessages(state, kSmallMessages);
}
BENCHMARK(BM_EndToEnd)->DenseRange(0, 4);

void BM_WriteHalf(benchmark::State& state) {
  VekMempool pool("bench-rpc");
  for (auto _ : state) {
    for (int i = 0; i < kSmallMessages; ++i) {
      if (KernoRpcV2::MarshalToString(&pool, SmallRequest(&pool), false).NByte() != 181) std::abort();
    }
  }
  ReportMessages(state, kSmallMessages);
}
BENCHMARK(BM_WriteHalf);

void BM_ReadHalf(benchmark::State& state) {
  VekMempool pool("bench-rpc");
  const int reader = static_cast<int>(state.range(0));
  const VekString frame = KernoRpcV2::MarshalToString(&pool, SmallRequest(&pool), false);
  const std::string bytes = Text(frame);
  for (auto _ : state) {
    for (int i = 0; i < kSmallMessages; ++i) benchmark::DoNotOptimize(Read(&pool, reader, frame, bytes).Get());
  }
  ReportMessages(state, kSmallMessages);
}
BENCHMARK(BM_ReadHalf)->DenseRange(0, 4);

// ---- Large bodies ---------------------------------------------------------------------------

struct Large {
  benchbody::Body& bodyM;
  VekMempool poolM{"bench-rpc-large"};
  std::string frameM;
  VekString frameTextM;
  explicit Large(size_t target) : bodyM(benchbody::GetBody(target)) {
    frameTextM = KernoRpcV2::MarshalToString(&poolM, TextMessage(), false);
    frameM = Text(frameTextM);
    if (frameM.empty()) {
      std::fprintf(stderr, "a body of %zu bytes does not make a frame\n", bodyM.jsonM.size());
      std::abort();
    }
  }
  ref<KernoRpcWrapper> TextMessage() {
    return ResponseWrapper::New(&poolM, 7, true, LazyDict::FromBytestring(&poolM, vek::ByteBuffer::New(&poolM, bodyM.jsonM.data(), bodyM.jsonM.size()), 42), nullptr);
  }
};

Large& GetLarge(int64_t target) {
  static std::map<int64_t, std::unique_ptr<Large>> large;
  std::unique_ptr<Large>& slot = large[target];
  if (!slot) slot.reset(new Large(static_cast<size_t>(target)));
  return *slot;
}

void ReportFrame(benchmark::State& state, size_t bytes) {
  state.SetBytesProcessed(static_cast<int64_t>(bytes) * static_cast<int64_t>(state.iterations()));
}

void BM_LargeMemcpy(benchmark::State& state) {
  Large& large = GetLarge(state.range(0));
  state.counters["bodyBytes"] = static_cast<double>(large.bodyM.jsonM.size());
  std::vector<char> target(large.frameM.size());
  for (auto _ : state) {
    std::memcpy(target.data(), large.frameM.data(), large.frameM.size());
    benchmark::ClobberMemory();
  }
  ReportFrame(state, large.frameM.size());
}

void BM_LargeHttpParser(benchmark::State& state) {
  Large& large = GetLarge(state.range(0));
  const std::string request = HttpRequest(large.bodyM.jsonM);
  for (auto _ : state) {
    if (ParseHttp(request) != 1) std::abort();
  }
  ReportFrame(state, request.size());
}

// Writing: from text (the body kept as JSON) or from the object, into a fresh string.
void BM_LargeWrite(benchmark::State& state, bool isFromObject) {
  Large& large = GetLarge(state.range(0));
  ref<KernoRpcWrapper> message =
      isFromObject ? ref<KernoRpcWrapper>(ResponseWrapper::New(&large.poolM, 7, true, large.bodyM.listM, 42, nullptr))
                   : large.TextMessage();
  for (auto _ : state) {
    if (KernoRpcV2::MarshalToString(&large.poolM, message, false).NByte() != large.frameM.size()) std::abort();
  }
  ReportFrame(state, large.frameM.size());
}

void BM_LargeObjectWriter(benchmark::State& state) {
  Large& large = GetLarge(state.range(0));
  JsonSarnObject json(&large.poolM);
  for (auto _ : state) benchmark::DoNotOptimize(json.SarnObjectToJson(large.bodyM.listM.Get(), 42).NByte());
  ReportFrame(state, large.frameM.size());
}

void BM_LargeRead(benchmark::State& state) {
  Large& large = GetLarge(state.range(0));
  const int reader = static_cast<int>(state.range(1));
  for (auto _ : state) benchmark::DoNotOptimize(Read(&large.poolM, reader, large.frameTextM, large.frameM).Get());
  ReportFrame(state, large.frameM.size());
  if (reader != 2 && reader != 3) return;
  // What the wrapper holds after the read: what its release gives back to its pool and the heap.
  VekMempool pool("bench-rpc-held");
  ref<KernoRpcWrapper> held = Read(&pool, reader, large.frameTextM, large.frameM);
  const size_t poolHeld = pool.GetUsedBytes(), heapHeld = mallinfo2().uordblks;
  held = nullptr;
  // The pool takes blocks over 512 bytes (the compressed body's) from the heap, so the heap's
  // figure already holds them; the pool's own figure is shown beside it.
  state.counters["heapHeldBytes"] = static_cast<double>(heapHeld - mallinfo2().uordblks);
  state.counters["poolHeldBytes"] = static_cast<double>(poolHeld);
  state.counters["peakPoolBytes"] = static_cast<double>(pool.GetUsedBytesHighWater());
  wynbaselib::InMemoryBytestream compressed;
  {
    wynbaselib::GzipBytesink sink(&compressed);
    sink.Write(large.bodyM.jsonM.data(), large.bodyM.jsonM.size());
    sink.Flush();
  }
  state.counters["gzipBytes"] = static_cast<double>(compressed.GetContent().size());
}

void BM_LargeStreamingParser(benchmark::State& state) {
  Large& large = GetLarge(state.range(0));
  const std::string& body = large.bodyM.jsonM;
  for (auto _ : state) {
    ref<Dictionary> tree;
    JsonParser parser(&large.poolM);
    parser.BeginParse(tree);
    for (size_t at = 0; at < body.size(); at += 512) parser.ParseChunk(body.data() + at, std::min<size_t>(512, body.size() - at));
    if (!parser.EndParse()) std::abort();
  }
  ReportFrame(state, large.frameM.size());
}

void BM_LargeGzipSink(benchmark::State& state) {
  Large& large = GetLarge(state.range(0));
  const std::string& body = large.bodyM.jsonM;
  for (auto _ : state) {
    wynbaselib::ByteCountingBytesink counter;
    wynbaselib::GzipBytesink sink(&counter);
    for (size_t at = 0; at < body.size(); at += 512) sink.Write(body.data() + at, std::min<size_t>(512, body.size() - at));
    sink.Flush();
    benchmark::DoNotOptimize(counter.GetCount());
  }
  ReportFrame(state, large.frameM.size());
}

constexpr int64_t kOneMegabyte = 1 << 20;
// The recordings grow longer as they go, so a target a little below 5 MiB gives a text of about
// 5 MB that still fits the frame's body limit.
constexpr int64_t kLargeTarget = 5095000;

BENCHMARK(BM_LargeMemcpy)->Arg(kOneMegabyte)->Arg(kLargeTarget);
BENCHMARK(BM_LargeHttpParser)->Arg(kOneMegabyte)->Arg(kLargeTarget);
BENCHMARK_CAPTURE(BM_LargeWrite, from_text, false)->Arg(kOneMegabyte)->Arg(kLargeTarget);
BENCHMARK_CAPTURE(BM_LargeWrite, from_object, true)->Arg(kOneMegabyte)->Arg(kLargeTarget);
BENCHMARK(BM_LargeObjectWriter)->Arg(kOneMegabyte)->Arg(kLargeTarget);
BENCHMARK(BM_LargeRead)->ArgsProduct({{kOneMegabyte, kLargeTarget}, {0, 1, 2, 3, 4}});
// Where keeping the body compressed (setting 0) starts to beat parsing it (setting 2).
BENCHMARK(BM_LargeRead)->ArgsProduct({{4096, 16384, 65536, 262144}, {2, 4}});
BENCHMARK(BM_LargeStreamingParser)->Arg(kOneMegabyte)->Arg(kLargeTarget);
BENCHMARK(BM_LargeGzipSink)->Arg(kOneMegabyte)->Arg(kLargeTarget);

}  // namespace

BENCHMARK_MAIN();
