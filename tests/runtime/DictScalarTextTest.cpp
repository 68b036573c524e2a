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
  EXPECT_EQ(Str(Dict::FormatFloat(nullptr, 1.0)), "1.0");
  EXPECT_EQ(Str(Dict::FormatFloat(nullptr, 0.1)), "0.1");
  EXPECT_EQ(Str(Dict::FormatFloat(nullptr, 123456789.0)), "1.2345679e+08");
  EXPECT_EQ(Str(Dict::FormatFloat(nullptr, 1e20)), "1e+20.0");
  EXPECT_EQ(Str(Dict::FormatFloat(nullptr, -0.0)), "-0.0");
  EXPECT_EQ(Str(Dict::FormatFloat(nullptr, 1e-5)), "1e-05.0");
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
  EXPECT_EQ(Str(Dict::FormatBool(nullptr, true)), "true");
  EXPECT_EQ(Str(Dict::FormatBool(nullptr, false)), "false");
  EXPECT_EQ(Str(Dict::FormatS32(nullptr, -2147483647 - 1)), "-2147483648");
  EXPECT_EQ(Str(Dict::FormatS64(nullptr, std::numeric_limits<long long>::min())), "-9223372036854775808");
  EXPECT_EQ(Str(Dict::FormatS64(nullptr, 0)), "0");
  EXPECT_EQ(Str(Dict::FormatU32(nullptr, 4294967295u)), "4294967295");
  EXPECT_EQ(Str(Dict::FormatU64(nullptr, 18446744073709551615ull)), "18446744073709551615");
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
  EXPECT_EQ(Str(Dict::FormatLongId(nullptr, k48 + 7)), "rs.7");
  EXPECT_EQ(Str(Dict::FormatLongId(nullptr, 4 * k48 + 7)), "xxx.7");
  EXPECT_EQ(Str(Dict::FormatLongId(nullptr, 7)), "7");
  EXPECT_EQ(Str(Dict::FormatLongId(nullptr, 5 * k48 + 12)), "tms.ep.12");
  EXPECT_EQ(Str(Dict::FormatLongId(nullptr, 0xFFFFull * k48 + (k48 - 1))), "xxx.281474976710655");
  EXPECT_EQ(Str(Dict::FormatLongId(nullptr, 16384 * k48)), "vod.0");
  EXPECT_EQ(Dict::ParseLongId(nullptr, "vod.1"), 16384 * k48 + 1);
  EXPECT_EQ(Dict::ParseLongId(nullptr, "tms.ep.12"), 5 * k48 + 12);
  EXPECT_EQ(Dict::ParseLongId(nullptr, "12"), 12u);
  EXPECT_EQ(Dict::ParseLongId(nullptr, "abc.12"), 0u);
  EXPECT_EQ(Dict::ParseLongId(nullptr, "rs.x"), k48);
  EXPECT_EQ(Dict::ParseLongId(nullptr, "xxx.7"), 0u) << "xxx is written but never read";
  EXPECT_EQ(Dict::ParseLongId(nullptr, "tms.12"), 0u);
  EXPECT_EQ(Dict::ParseLongId(nullptr, ".12"), 0u);
  EXPECT_EQ(Dict::ParseLongId(nullptr, "r.12"), 0u);
  EXPECT_EQ(Dict::ParseLongId(nullptr, nullptr), 0u);
  for (const sarn::LongIdPrefix* row = sarn::longIdPrefixesG; row != sarn::longIdPrefixesG + sarn::nLongIdPrefixesG;
       ++row) {
    unsigned long long id = static_cast<unsigned long long>(row->codeM) * k48 + 123456789;
    EXPECT_EQ(Dict::ParseLongId(nullptr, Dict::FormatLongId(nullptr, id).Utf8()), id) << row->pPrefixM;
  }
}

TEST(DictParseTest, UnsignedIntegers) {
  EXPECT_EQ(Dict::ParseU64(nullptr, "18446744073709551615"), 18446744073709551615ull);
  EXPECT_EQ(Dict::ParseU64(nullptr, "18446744073709551616"), 0u) << "wraps modulo 2^64";
  EXPECT_EQ(Dict::ParseU64(nullptr, "18446744073709551617"), 1u);
  EXPECT_EQ(Dict::ParseU64(nullptr, "007"), 7u);
  for (const char* bad : {"", "-1", "+1", " 1", "1 ", "1a", "0x1"}) EXPECT_EQ(Dict::ParseU64(nullptr, bad), 0u) << bad;
  EXPECT_EQ(Dict::ParseU64(nullptr, nullptr), 0u);
  EXPECT_EQ(Dict::ParseU32(nullptr, "4294967295"), 4294967295u);
  EXPECT_EQ(Dict::ParseU32(nullptr, "4294967296"), 0u);
}

TEST(DictParseTest, SignedIntegers) {
  EXPECT_EQ(Dict::ParseS32(nullptr, Text("4294967297")), 1);
  EXPECT_EQ(Dict::ParseS32(nullptr, Text("-2147483648")), -2147483647 - 1);
  EXPECT_EQ(Dict::ParseS32(nullptr, Text("2147483648")), -2147483647 - 1) << "low 32 bits, no range check";
  EXPECT_EQ(Dict::ParseS64(nullptr, Text("9223372036854775807")), std::numeric_limits<long long>::max());
  EXPECT_EQ(Dict::ParseS64(nullptr, Text("9223372036854775808")), std::numeric_limits<long long>::max());
  EXPECT_EQ(Dict::ParseS64(nullptr, Text("-9223372036854775808")), std::numeric_limits<long long>::min());
  EXPECT_EQ(Dict::ParseS64(nullptr, Text("-99999999999999999999999")), std::numeric_limits<long long>::min());
  EXPECT_EQ(Dict::ParseS32(nullptr, Text("99999999999999999999999")), -1) << "the saturated value's low bits";
  EXPECT_EQ(Dict::ParseS64(nullptr, Text("-0")), 0);
  EXPECT_EQ(Dict::ParseS64(nullptr, Text("-12")), -12);
  for (const char* bad : {"", "-", "+5", " 5", "5 ", "5x", "--5", "1e3", "0x10"}) {
    EXPECT_EQ(Dict::ParseS64(nullptr, Text(bad)), 0) << bad;
    EXPECT_EQ(Dict::ParseS32(nullptr, Text(bad)), 0) << bad;
  }
  EXPECT_EQ(Dict::ParseS64(nullptr, Text(std::string("5\0" "x", 3))), 5) << "the text ends at its first NUL";
  EXPECT_TRUE(Dict::ParseBool(nullptr, Text(std::string("true\0x", 6))));
}

TEST(DictParseTest, BooleansFloatsAndBytestrings) {
  EXPECT_TRUE(Dict::ParseBool(nullptr, Text("true")));
  for (const char* other : {"TRUE", "True", "false", "1", "", "true "}) EXPECT_FALSE(Dict::ParseBool(nullptr, Text(other)));
  EXPECT_EQ(Dict::ParseFloat(nullptr, Text("1.5")), 1.5);
  EXPECT_EQ(Dict::ParseFloat(nullptr, Text(" -2e3x")), -2000.0);
  EXPECT_EQ(Dict::ParseFloat(nullptr, Text("abc")), 0.0);
  EXPECT_EQ(Dict::ParseFloat(nullptr, Text("")), 0.0);
  EXPECT_EQ(Dict::ParseFloat(nullptr, Text(Str(Dict::FormatFloat(nullptr, 0.1)))), 0.1);

  VekMempool pool("bytes");
  {
    ref<vek::ByteBuffer> bytes = Dict::ParseBytestring(&pool, Text("Zm9v"));
    EXPECT_EQ(std::string(reinterpret_cast<const char*>(bytes->GetData()), bytes->GetLength()), "foo");
    EXPECT_EQ(Str(Dict::FormatBytestring(&pool, bytes)), "Zm9v");
    ref<vek::ByteBuffer> bad = Dict::ParseBytestring(&pool, Text("Zm9"));
    ASSERT_TRUE(bad);
    EXPECT_EQ(bad->GetLength(), 0u);
  }
  EXPECT_EQ(pool.GetUsedBytes(), 0u);
}

}  // namespace
