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
  return result.find('.') == std::string::npos ? result + ".0" : result;
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
    ASSERT_EQ(Str(Dict::FormatS64(nullptr, value)), std::to_string(value));
    ASSERT_EQ(Str(Dict::FormatU64(nullptr, static_cast<unsigned long long>(value))), std::to_string(static_cast<unsigned long long>(value)));
  }
}

TEST(DictFormatTest, LongIdsRoundTrip) {
  const unsigned long long k48 = 1ull << 48;
  const std::pair<unsigned long long, const char*> written[] = {
      {k48 + 7, "rs.7"}, {4 * k48 + 7, "xxx.7"}, {7, "7"}, {5 * k48 + 12, "tms.ep.12"},
      {0xFFFFull * k48 + (k48 - 1), "xxx.281474976710655"}, {16384 * k48, "vod.0"}};
  for (const auto& [id, text] : written) EXPECT_EQ(Str(Dict::FormatLongId(nullptr, id)), text);
  EXPECT_EQ(Dict::ParseLongId(nullptr, nullptr), 0u);
  for (const sarn::LongIdPrefix* row = sarn::longIdPrefixesG; row != sarn::longIdPrefixesG + sarn::nLongIdPrefixesG;
       ++row) {
    unsigned long long id = static_cast<unsigned long long>(row->codeM) * k48 + 123456789;
    EXPECT_EQ(Dict::ParseLongId(nullptr, Dict::FormatLongId(nullptr, id).Utf8()), id) << row->pPrefixM;
  }
}

TEST(DictParseTest, Integers) {
  for (const auto& row : sarntest::ReadTable("values/integer-texts.txt", 3)) {
    const VekString text = Text(row[1]);
    std::string value;
    if (row[0] == "u64") {
      value = std::to_string(Dict::ParseU64(nullptr, text.Utf8()));
    } else if (row[0] == "signed") {
      value = std::to_string(Dict::ParseS64(nullptr, text)) + " " + std::to_string(Dict::ParseS32(nullptr, text));
    } else {
      value = std::to_string(Dict::ParseLongId(nullptr, text.Utf8()));
    }
    EXPECT_EQ(value, row[2]) << row[0] << " " << row[1];
  }
  EXPECT_EQ(std::vector<unsigned long long>({Dict::ParseU64(nullptr, nullptr), Dict::ParseU32(nullptr, "4294967295"),
                                              Dict::ParseU32(nullptr, "4294967296")}),
            std::vector<unsigned long long>({0, 4294967295u, 0}));
}

TEST(DictParseTest, BooleansFloatsAndBytestrings) {
  EXPECT_TRUE(Dict::ParseBool(nullptr, Text("true")) && Dict::ParseBool(nullptr, Text(std::string("true\0x", 6))));
  for (const char* other : {"TRUE", "True", "false", "1", "", "true "}) EXPECT_FALSE(Dict::ParseBool(nullptr, Text(other)));
  for (const auto& [text, value] : std::vector<std::pair<std::string, double>>{
           {"1.5", 1.5}, {" -2e3x", -2000.0}, {"abc", 0.0}, {"", 0.0}, {Str(Dict::FormatFloat(nullptr, 0.1)), 0.1}}) {
    EXPECT_EQ(Dict::ParseFloat(nullptr, Text(text)), value) << text;
  }
  VekMempool pool("bytes");
  {
    ref<vek::ByteBuffer> bytes = Dict::ParseBytestring(&pool, Text("Zm9v"));
    EXPECT_EQ(Str(bytes) + " " + Str(Dict::FormatBytestring(&pool, bytes)), "foo Zm9v");
    ref<vek::ByteBuffer> bad = Dict::ParseBytestring(&pool, Text("Zm9"));
    EXPECT_TRUE(bad && bad->GetLength() == 0);
  }
  EXPECT_EQ(pool.GetUsedBytes(), 0u);
}

}  // namespace
