// Values and text primitives: JSON string escaping, Base64, number texts. Anchors run on the
// same bytes in the same binary: memcpy (the floor), RapidJSON's string writer, snprintf.
#include <benchmark/benchmark.h>

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <random>
#include <string>
#include <vector>

#include "rapidjson/stringbuffer.h"
#include "rapidjson/writer.h"
#include "sarn/Sarn.h"

namespace {

// About 100 KB of text as names and values hold it: words, digits, punctuation, UTF-8, and now
// and then a quote, backslash, newline, tab or other control byte.
std::string MixedText(size_t size) {
  static const char* pieces[] = {"channel ", "Identifier ", "12345 ", "caf\xC3\xA9 ", "\xE6\x97\xA5\xE6\x9C\xAC ",
                                 "\"quoted\" ", "path\\to ", "line\n", "tab\t", "ctl\x01 ", "http://x/y?z=1 "};
  std::mt19937 random(1);
  std::string text;
  while (text.size() < size) {
    unsigned r = random() % 100;
    text += pieces[r < 70 ? r % 5 : 5 + r % 6];
  }
  text.resize(size);
  return text;
}

std::string RandomBytes(size_t size) {
  std::mt19937 random(2);
  std::string bytes(size, '\0');
  for (char& c : bytes) c = static_cast<char>(random());
  return bytes;
}

void BM_StringToJson_100KB(benchmark::State& state) {
  std::string text = MixedText(100 * 1024);
  VekMempool pool("bench");
  VekString value = VekString::FromUtf8Bytes(&pool, text.size(), text.data());
  for (auto _ : state) {
    sarn::ByteBuffer out(&pool);
    sarn::Json::StringToJson(value, false, out);
    benchmark::DoNotOptimize(out.GetData());
  }
  state.SetBytesProcessed(static_cast<int64_t>(state.iterations()) * static_cast<int64_t>(text.size()));
}
BENCHMARK(BM_StringToJson_100KB);

void BM_RapidJsonString_100KB(benchmark::State& state) {
  std::string text = MixedText(100 * 1024);
  for (auto _ : state) {
    rapidjson::StringBuffer out;
    rapidjson::Writer<rapidjson::StringBuffer> writer(out);
    writer.String(text.data(), static_cast<rapidjson::SizeType>(text.size()));
    benchmark::DoNotOptimize(out.GetString());
  }
  state.SetBytesProcessed(static_cast<int64_t>(state.iterations()) * static_cast<int64_t>(text.size()));
}
BENCHMARK(BM_RapidJsonString_100KB);

void Memcpy(benchmark::State& state, size_t size) {
  // Both buffers 64-byte aligned: a heap block's odd offset can make the C library's copy far
  // slower than the bandwidth the anchor is meant to show.
  std::string bytes = RandomBytes(size);
  std::unique_ptr<char, decltype(&std::free)> from(static_cast<char*>(std::aligned_alloc(64, size)), &std::free);
  std::unique_ptr<char, decltype(&std::free)> to(static_cast<char*>(std::aligned_alloc(64, size)), &std::free);
  std::memcpy(from.get(), bytes.data(), size);
  std::memset(to.get(), 0, size);
  for (auto _ : state) {
    char* source = from.get();
    benchmark::DoNotOptimize(source);
    std::memcpy(to.get(), source, size);
    benchmark::DoNotOptimize(to.get());
    benchmark::ClobberMemory();
  }
  state.SetBytesProcessed(static_cast<int64_t>(state.iterations()) * static_cast<int64_t>(size));
}
void BM_Memcpy_100KB(benchmark::State& state) { Memcpy(state, 100 * 1024); }
BENCHMARK(BM_Memcpy_100KB);
void BM_Memcpy_1MB(benchmark::State& state) { Memcpy(state, 1 << 20); }
BENCHMARK(BM_Memcpy_1MB);

void BM_Base64Encode_1MB(benchmark::State& state) {
  VekMempool pool("bench");
  std::string bytes = RandomBytes(1 << 20);
  ref<vek::ByteBuffer> input = vek::ByteBuffer::New(&pool, bytes.data(), bytes.size());
  sarn::Base64 codec(sarn::Base64::DEFAULT_CODE_SET, sarn::Base64::DEFAULT_TERMINATOR);
  for (auto _ : state) {
    ref<vek::ByteBuffer> text;
    codec.Encode(&pool, input, text);
    benchmark::DoNotOptimize(text->GetData());
  }
  state.SetBytesProcessed(static_cast<int64_t>(state.iterations()) * static_cast<int64_t>(bytes.size()));
}
BENCHMARK(BM_Base64Encode_1MB);

void BM_Base64Decode_1MB(benchmark::State& state) {
  VekMempool pool("bench");
  std::string bytes = RandomBytes(1 << 20);
  ref<vek::ByteBuffer> text;
  sarn::Base64 codec(sarn::Base64::DEFAULT_CODE_SET, sarn::Base64::DEFAULT_TERMINATOR);
  codec.Encode(&pool, vek::ByteBuffer::New(&pool, bytes.data(), bytes.size()), text);
  for (auto _ : state) {
    ref<vek::ByteBuffer> decoded;
    bool fOk = codec.Decode(&pool, text, decoded);
    benchmark::DoNotOptimize(fOk);
  }
  // Counted in decoded bytes, like the encoder, so the two rates compare directly with memcpy.
  state.SetBytesProcessed(static_cast<int64_t>(state.iterations()) * static_cast<int64_t>(bytes.size()));
}
BENCHMARK(BM_Base64Decode_1MB);

std::vector<double> Doubles() {
  std::mt19937_64 random(3);
  std::vector<double> values;
  for (int i = 0; i < 1024; ++i) values.push_back(static_cast<double>(static_cast<int64_t>(random() >> 20)) / 997.0);
  return values;
}

void BM_FormatFloat(benchmark::State& state) {
  std::vector<double> values = Doubles();
  size_t i = 0;
  for (auto _ : state) {
    VekString text = sarn::Dict::FormatFloat(nullptr, values[i++ & 1023]);
    benchmark::DoNotOptimize(text.Utf8());
  }
}
BENCHMARK(BM_FormatFloat);

void BM_FormatFloat_Snprintf(benchmark::State& state) {
  std::vector<double> values = Doubles();
  size_t i = 0;
  for (auto _ : state) {
    char text[100];
    int n = std::snprintf(text, sizeof text, "%1.8g", values[i++ & 1023]);
    VekString result = VekString::FromUtf8Bytes(nullptr, static_cast<size_t>(n), text);
    benchmark::DoNotOptimize(result.Utf8());
  }
}
BENCHMARK(BM_FormatFloat_Snprintf);

void BM_FormatLongId(benchmark::State& state) {
  std::mt19937_64 random(4);
  std::vector<unsigned long long> ids;
  for (int i = 0; i < 1024; ++i) ids.push_back((static_cast<unsigned long long>(1 + i % 10) << 48) | (random() >> 24));
  size_t i = 0;
  for (auto _ : state) {
    VekString text = sarn::Dict::FormatLongId(nullptr, ids[i++ & 1023]);
    benchmark::DoNotOptimize(text.Utf8());
  }
}
BENCHMARK(BM_FormatLongId);

void BM_ParseU64(benchmark::State& state) {
  std::mt19937_64 random(5);
  std::vector<std::string> texts;
  for (int i = 0; i < 1024; ++i) texts.push_back(std::to_string(random() >> (random() & 63)));
  size_t i = 0;
  for (auto _ : state) {
    unsigned long long value = sarn::Dict::ParseU64(nullptr, texts[i++ & 1023].c_str());
    benchmark::DoNotOptimize(value);
  }
}
BENCHMARK(BM_ParseU64);

}  // namespace

BENCHMARK_MAIN();
