// The frame parser against http-parser on requests with the same head size, and a large body
// in 512-byte chunks against memcpy of the same bytes. Frames per second are in "frames/s".
#include <benchmark/benchmark.h>
#include <http_parser.h>

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>
#include <vector>

#include "sarn/rpc/RpcV2Parser.h"

namespace {

using sarn::RpcV2Parser;

const size_t kFrames = 10000;
const size_t kChunk = 512;
const size_t kLargeBody = 1 << 20;

// The small frame: a request with a 31-byte body, 150 bytes of first line and headers.
const std::string kSmallBody = "{\"type\": \"kernoCurrentTimeGet\"}";
std::string SmallFrame() {
  const std::string block =
      "Content-Type: application/json\r\nRequestType: kernoCurrentTimeGet\r\nResponseCount: single\r\n"
      "RpcId: 7\r\nSchemaVersion: 42\r\nType: request\r\n\r\n";
  return "MRPC/2 " + std::to_string(block.size()) + " " + std::to_string(kSmallBody.size()) + "\r\n" + block +
         kSmallBody;
}

// An HTTP/1.1 request carrying the same body and headers (Content-Length in place of ResponseCount),
// its last value padded to a head of the same size.
std::string SmallHttpRequest(size_t headSize) {
  std::string head =
      "POST / HTTP/1.1\r\nContent-Type: application/json\r\nContent-Length: 31\r\n"
      "RequestType: kernoCurrentTimeGet\r\nRpcId: 7\r\nSchemaVersion: 42\r\nType: ";
  if (head.size() + 4 > headSize) std::abort();
  head += std::string(headSize - head.size() - 4, 'r') + "\r\n\r\n";
  return head + kSmallBody;
}

std::string LargeFrame() {
  const std::string block = "Content-Type: application/json\r\nRpcId: 7\r\nType: response\r\n\r\n";
  std::string body(kLargeBody, ' ');  // "[ ... ]": the parser does not look inside
  body.front() = '[';
  body.back() = ']';
  return "MRPC/2 " + std::to_string(block.size()) + " " + std::to_string(kLargeBody) + "\r\n" + block + body;
}

// A receiver doing what a real one must at least do: look at every callback. With a target it
// also copies the body out, as a reader that keeps the body does.
class Receiver : public RpcV2Parser::Callbacks {
 public:
  explicit Receiver(char* pTarget = nullptr) : pTargetM(pTarget) {}
  void OnError(const char* message) override {
    std::fprintf(stderr, "unexpected error: %s\n", message);
    std::abort();
  }
  void OnHeaderSize(size_t) override {}
  void OnBodySize(size_t) override {}
  void OnHeaderPair(const char* key, const char*) override { headersM += key[0] != 0; }
  void OnBodyChunk(const char* data, size_t length) override {
    if (pTargetM != nullptr) std::memcpy(pTargetM + bodyBytesM, data, length);
    bodyBytesM += length;
  }
  void OnParsingComplete() override { ++completeM; }

  char* pTargetM;
  size_t headersM = 0;
  size_t bodyBytesM = 0;
  size_t completeM = 0;
};

void Report(benchmark::State& state, size_t framesPerIteration, size_t bytesPerIteration) {
  state.counters["frames/s"] = benchmark::Counter(static_cast<double>(framesPerIteration * state.iterations()),
                                                  benchmark::Counter::kIsRate);
  state.SetBytesProcessed(static_cast<int64_t>(bytesPerIteration * state.iterations()));
}

// Feeds one frame in chunks of `chunk` bytes (0: whole) to a new parser.
inline void ParseFrame(Receiver& receiver, const char* frame, size_t length, size_t chunk) {
  RpcV2Parser parser(receiver);
  if (chunk == 0) chunk = length;
  for (size_t at = 0; at < length; at += chunk) {
    parser.ParseChunk(frame + at, length - at < chunk ? length - at : chunk);
  }
  parser.EndParse();
}

void BM_RpcV2SmallFrames(benchmark::State& state, size_t chunk) {
  std::string stream;
  const std::string frame = SmallFrame();
  for (size_t i = 0; i < kFrames; ++i) stream += frame;
  for (auto _ : state) {
    Receiver receiver;
    for (size_t at = 0; at < stream.size(); at += frame.size()) {
      ParseFrame(receiver, stream.data() + at, frame.size(), chunk);
    }
    if (receiver.completeM != kFrames || receiver.headersM != 6 * kFrames) std::abort();
    benchmark::DoNotOptimize(receiver.bodyBytesM);
  }
  Report(state, kFrames, stream.size());
}
BENCHMARK_CAPTURE(BM_RpcV2SmallFrames, whole, 0);
BENCHMARK_CAPTURE(BM_RpcV2SmallFrames, byte_by_byte, 1);

struct HttpCounts {
  size_t headers = 0;
  size_t bodyBytes = 0;
  size_t complete = 0;
};

int OnHttpHeaderField(http_parser* parser, const char*, size_t) {
  ++static_cast<HttpCounts*>(parser->data)->headers;
  return 0;
}
int OnHttpHeaderValue(http_parser*, const char*, size_t) { return 0; }
int OnHttpBody(http_parser* parser, const char*, size_t length) {
  static_cast<HttpCounts*>(parser->data)->bodyBytes += length;
  return 0;
}
int OnHttpComplete(http_parser* parser) {
  ++static_cast<HttpCounts*>(parser->data)->complete;
  return 0;
}

http_parser_settings HttpSettings() {
  http_parser_settings settings;
  std::memset(&settings, 0, sizeof settings);
  settings.on_header_field = OnHttpHeaderField;
  settings.on_header_value = OnHttpHeaderValue;
  settings.on_body = OnHttpBody;
  settings.on_message_complete = OnHttpComplete;
  return settings;
}

void BM_HttpParserSmallRequests(benchmark::State& state, size_t chunk) {
  const std::string frame = SmallFrame();
  const std::string request = SmallHttpRequest(frame.size() - kSmallBody.size());
  if (request.size() != frame.size()) std::abort();
  std::string stream;
  for (size_t i = 0; i < kFrames; ++i) stream += request;
  const http_parser_settings settings = HttpSettings();
  for (auto _ : state) {
    HttpCounts counts;
    for (size_t at = 0; at < stream.size(); at += request.size()) {
      http_parser parser;
      http_parser_init(&parser, HTTP_REQUEST);
      parser.data = &counts;
      const size_t step = chunk == 0 ? request.size() : chunk;
      for (size_t done = 0; done < request.size(); done += step) {
        http_parser_execute(&parser, &settings, stream.data() + at + done,
                            request.size() - done < step ? request.size() - done : step);
      }
    }
    // Byte by byte, http-parser reports a header name once per byte: only completion is exact.
    if (counts.complete != kFrames || counts.bodyBytes != kFrames * kSmallBody.size()) std::abort();
    benchmark::DoNotOptimize(counts.headers);
  }
  Report(state, kFrames, stream.size());
}
BENCHMARK_CAPTURE(BM_HttpParserSmallRequests, whole, 0);
BENCHMARK_CAPTURE(BM_HttpParserSmallRequests, byte_by_byte, 1);

// The 1 MB body: a receiver that only looks (`isCopying` false) shows the parser's own cost; one
// that copies the body out is compared with memcpy of the same bytes in the same chunks.
void BM_RpcV2LargeBody(benchmark::State& state, size_t chunk, bool isCopying) {
  const std::string frame = LargeFrame();
  std::vector<char> target(kLargeBody);
  for (auto _ : state) {
    Receiver receiver(isCopying ? target.data() : nullptr);
    ParseFrame(receiver, frame.data(), frame.size(), chunk);
    if (receiver.completeM != 1 || receiver.bodyBytesM != kLargeBody) std::abort();
    benchmark::ClobberMemory();
  }
  Report(state, 1, frame.size());
}
BENCHMARK_CAPTURE(BM_RpcV2LargeBody, whole, 0, false);
BENCHMARK_CAPTURE(BM_RpcV2LargeBody, chunks512, kChunk, false);
BENCHMARK_CAPTURE(BM_RpcV2LargeBody, chunks512_copying, kChunk, true);

void BM_MemcpyLargeFrame(benchmark::State& state, size_t chunk) {
  const std::string frame = LargeFrame();
  std::vector<char> target(frame.size());
  for (auto _ : state) {
    for (size_t at = 0; at < frame.size(); at += chunk) {
      std::memcpy(target.data() + at, frame.data() + at, frame.size() - at < chunk ? frame.size() - at : chunk);
    }
    benchmark::ClobberMemory();
  }
  Report(state, 1, frame.size());
}
BENCHMARK_CAPTURE(BM_MemcpyLargeFrame, chunks512, kChunk);

}  // namespace

BENCHMARK_MAIN();
