#include <cmath>
#include <cstdio>
#include <limits>
#include <random>
#include <string>

#include "sarn/Sarn.h"
#include "testutil/TestUtil.h"

namespace {

using sarn::Dict;

using sarntest::Str;
VekString Text(const std::string& text) { return VekString::FromUtf8Bytes(nullptr, text.size(), text.data()); }

std::string PrintfFloat(double value) {
  char text[100];
  std::snprintf(text, sizeof text, "%1.8g", value);
  std::string result = text;
  if (result.find('.') == std::string::npos) result += ".0";
  return result;
}

TEST(DictFormatTest, Floats) {
  std::string texts;
  for (double value : {1.0, 0.1, 123456789.0, 1e20, -0.0, 1e-5}) texts += Str(Dict::FormatFloat(nullptr, value)) + " ";
  EXPECT_EQ(texts, "1.0 0.1 1.2345679e+08 1e+20.0 -0.0 1e-05.0 ");
  // The fast conversion must give printf's bytes everywhere, including the edges of the
  // fixed/exponent switch, rounding ties, subnormals and non-finite values.
  std::vector<double> values = {0.0, 1e-4, 9.9999999e-5, 99999999.0, 99999999.5, 1e8, 0.5, 2.5, 1.25e-300,
                                5e-324, std::numeric_limits<double>::max(), -std::numeric_limits<double>::min(),
                                std::numeric_limits<double>::infinity(), -std::numeric_limits<double>::infinity(),
                                std::numeric_limits<double>::quiet_NaN(), 0.000123456785, 12345678.5};
  std::mt19937_64 random(42);
  for (int i = 0; i < 20000; ++i) {
    uint64_t bits = random();
    double value;
    std::memcpy(&value, &bits, sizeof value);
    values.push_back(value);
    values.push_back(static_cast<double>(static_cast<int64_t>(bits) >> (bits & 63)) / 1000.0);
  }
  for (double value : values) ASSERT_EQ(Str(Dict::FormatFloat(nullptr, value)), PrintfFloat(value)) << value;
}

TEST(DictFormatTest, IntegersAndBooleans) {
  EXPECT_EQ(Str(Dict::FormatBool(nullptr, true)) + " " + Str(Dict::FormatBool(nullptr, false)) + " " +
                Str(Dict::FormatS32(nullptr, -2147483647 - 1)) + " " +
                Str(Dict::FormatS64(nullptr, std::numeric_limits<long long>::min())) + " " +
                Str(Dict::FormatS64(nullptr, 0)) + " " + Str(Dict::FormatU32(nullptr, 4294967295u)) + " " +
                Str(Dict::FormatU64(nullptr, 18446744073709551615ull)),
            "true false -2147483648 -9223372036854775808 0 4294967295 18446744073709551615");
  std::mt19937_64 random(7);
  for (int i = 0; i < 5000; ++i) {
    long long value = static_cast<long long>(random()) >> (random() & 63);
    char text[32];
    std::snprintf(text, sizeof text, "%lld", value);
    ASSERT_EQ(Str(Dict::FormatS64(nullptr, value)), text);
    std::snprintf(text, sizeof text, "%llu", static_cast<unsigned long long>(value));
    ASSERT_EQ(Str(Dict::FormatU64(nullptr, static_cast<unsigned long long>(value))), text);
  }
}

TEST(DictFormatTest, LongIdsRoundTrip) {
  const unsigned long long k48 = 1ull << 48;
  const std::pair<unsigned long long, const char*> written[] = {
      {k48 + 7, "rs.7"}, {4 * k48 + 7, "xxx.7"}, {7, "7"}, {5 * k48 + 12, "tms.ep.12"},
      {0xFFFFull * k48 + (k48 - 1), "xxx.281474976710655"}, {16384 * k48, "vod.0"}};
  for (const auto& [id, text] : written) EXPECT_EQ(Str(Dict::FormatLongId(nullptr, id)), text);
  // xxx is written but never read; an unknown or partial prefix reads as 0.
  const std::pair<const char*, unsigned long long> read[] = {
      {"vod.1", 16384 * k48 + 1}, {"tms.ep.12", 5 * k48 + 12}, {"12", 12}, {"abc.12", 0}, {"rs.x", k48},
      {"xxx.7", 0}, {"tms.12", 0}, {".12", 0}, {"r.12", 0}, {nullptr, 0}};
  for (const auto& [text, id] : read) EXPECT_EQ(Dict::ParseLongId(nullptr, text), id) << (text ? text : "null");
  for (const sarn::LongIdPrefix* row = sarn::longIdPrefixesG; row != sarn::longIdPrefixesG + sarn::nLongIdPrefixesG;
       ++row) {
    unsigned long long id = static_cast<unsigned long long>(row->codeM) * k48 + 123456789;
    EXPECT_EQ(Dict::ParseLongId(nullptr, Dict::FormatLongId(nullptr, id).Utf8()), id) << row->pPrefixM;
  }
}

TEST(DictParseTest, Integers) {
  // Unsigned texts wrap modulo 2^64 (and 2^32); signed ones saturate at 64 bits and keep the
  // low 32 bits for S32, without a range check. Anything but digits (and a leading minus) is 0.
  const std::pair<const char*, unsigned long long> u64[] = {
      {"18446744073709551615", 18446744073709551615ull}, {"18446744073709551616", 0}, {"18446744073709551617", 1},
      {"007", 7}, {"", 0}, {"-1", 0}, {"+1", 0}, {" 1", 0}, {"1 ", 0}, {"1a", 0}, {"0x1", 0}, {nullptr, 0}};
  for (const auto& [text, value] : u64) EXPECT_EQ(Dict::ParseU64(nullptr, text), value) << (text ? text : "null");
  EXPECT_EQ(Dict::ParseU32(nullptr, "4294967295"), 4294967295u);
  EXPECT_EQ(Dict::ParseU32(nullptr, "4294967296"), 0u);
  const long long kMax = std::numeric_limits<long long>::max(), kMin = std::numeric_limits<long long>::min();
  const struct {
    std::string text;
    long long s64;
    int s32;
  } signedCases[] = {
      {"4294967297", 4294967297LL, 1}, {"-2147483648", -2147483648LL, -2147483647 - 1},
      {"2147483648", 2147483648LL, -2147483647 - 1}, {"9223372036854775807", kMax, -1}, {"9223372036854775808", kMax, -1},
      {"-9223372036854775808", kMin, 0}, {"-99999999999999999999999", kMin, 0}, {"99999999999999999999999", kMax, -1},
      {"-0", 0, 0}, {"-12", -12, -12}, {std::string("5\0x", 3), 5, 5},  // the text ends at its first NUL
      {"", 0, 0}, {"-", 0, 0}, {"+5", 0, 0}, {" 5", 0, 0}, {"5 ", 0, 0}, {"5x", 0, 0}, {"--5", 0, 0}, {"1e3", 0, 0},
      {"0x10", 0, 0}};
  for (const auto& c : signedCases) {
    EXPECT_EQ(Dict::ParseS64(nullptr, Text(c.text)), c.s64) << c.text;
    EXPECT_EQ(Dict::ParseS32(nullptr, Text(c.text)), c.s32) << c.text;
  }
}

TEST(DictParseTest, BooleansFloatsAndBytestrings) {
  EXPECT_TRUE(Dict::ParseBool(nullptr, Text("true")));
  EXPECT_TRUE(Dict::ParseBool(nullptr, Text(std::string("true\0x", 6))));
  for (const char* other : {"TRUE", "True", "false", "1", "", "true "}) EXPECT_FALSE(Dict::ParseBool(nullptr, Text(other)));
  for (const auto& [text, value] : std::vector<std::pair<std::string, double>>{
           {"1.5", 1.5}, {" -2e3x", -2000.0}, {"abc", 0.0}, {"", 0.0}, {Str(Dict::FormatFloat(nullptr, 0.1)), 0.1}}) {
    EXPECT_EQ(Dict::ParseFloat(nullptr, Text(text)), value) << text;
  }
  VekMempool pool("bytes");
  {
    ref<vek::ByteBuffer> bytes = Dict::ParseBytestring(&pool, Text("Zm9v"));
    EXPECT_EQ(Str(bytes), "foo");
    EXPECT_EQ(Str(Dict::FormatBytestring(&pool, bytes)), "Zm9v");
    ref<vek::ByteBuffer> bad = Dict::ParseBytestring(&pool, Text("Zm9"));
    ASSERT_TRUE(bad);
    EXPECT_EQ(bad->GetLength(), 0u);
  }
  EXPECT_EQ(pool.GetUsedBytes(), 0u);
}

}  // namespace
