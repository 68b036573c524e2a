#include <cstdlib>
#include <ctime>
#include <string>

#include "sarn/Sarn.h"
#include "testutil/TestUtil.h"

namespace {

using namespace sarn;

std::string Str(const VekString& text) { return std::string(text.Utf8(), text.NByte()); }
VekString Text(const std::string& text) { return VekString::FromUtf8Bytes(nullptr, text.size(), text.data()); }

// Every conversion must ignore the process time zone: each test runs with the zone set 14 hours
// east of UTC and again 12 hours west of it.
class ScalarTypesTest : public ::testing::TestWithParam<const char*> {
 protected:
  void SetUp() override {
    const char* old = std::getenv("TZ");
    oldZoneM = old != nullptr ? old : "";
    hadZoneM = old != nullptr;
    setenv("TZ", GetParam(), 1);
    tzset();
  }
  void TearDown() override {
    if (hadZoneM) {
      setenv("TZ", oldZoneM.c_str(), 1);
    } else {
      unsetenv("TZ");
    }
    tzset();
  }
  std::string oldZoneM;
  bool hadZoneM = false;
};

INSTANTIATE_TEST_SUITE_P(FarZones, ScalarTypesTest, ::testing::Values("EAST-14", "WEST+12"));

TEST_P(ScalarTypesTest, ZoneIsReallyFarFromUtc) {
  time_t noon = 12 * 3600;
  struct tm local;
  localtime_r(&noon, &local);
  EXPECT_NE(local.tm_hour, 12) << "the process zone did not take";
}

TEST_P(ScalarTypesTest, ChannelNumbers) {
  struct Case {
    const char* text;
    ChannelNumber value;
    const char* printed;
  };
  const Case cases[] = {
      {"5", ChannelNumber(5), "5"},          {"5-1", ChannelNumber(5, 1), "5-1"},
      {"5-0", ChannelNumber(5, 0), "5-0"},   {"05", ChannelNumber(5), "5"},
      {"-5", ChannelNumber::INVALID, "invalid"}, {" 5", ChannelNumber::INVALID, "invalid"},
      {"5-", ChannelNumber::INVALID, "invalid"}, {"5-x", ChannelNumber::INVALID, "invalid"},
      {"5-1x", ChannelNumber::INVALID, "invalid"}, {"", ChannelNumber::INVALID, "invalid"},
      {"5--1", ChannelNumber::INVALID, "invalid"}, {"5-1-2", ChannelNumber::INVALID, "invalid"},
      {"4294967301", ChannelNumber(5), "5"},  // strtol's value cut to 32 bits
  };
  for (const Case& c : cases) {
    ChannelNumber parsed = ChannelNumber::Parse(Text(c.text));
    EXPECT_EQ(parsed, c.value) << c.text;
    EXPECT_EQ(Str(parsed.ToString()), c.printed) << c.text;
  }
  EXPECT_EQ(ChannelNumber::Parse(Text(std::string("5\0-x", 4))), ChannelNumber(5)) << "read up to the NUL";
  EXPECT_EQ(Str(ChannelNumber(-2, 7).ToString()), "-2-7");
  EXPECT_EQ(Str(ChannelNumber(-1).ToString()), "-1");
  EXPECT_EQ(ChannelNumber(), ChannelNumber::INVALID);
  EXPECT_NE(ChannelNumber(5, 1), ChannelNumber(5, 2));
  ChannelNumber copy;
  copy = ChannelNumber(7, 3);
  EXPECT_EQ(copy.majorM, 7);
  EXPECT_EQ(copy.minorM, 3);
}

TEST_P(ScalarTypesTest, Currencies) {
  Currency usd = Currency::Parse(Text("USD.1999"));
  EXPECT_EQ(usd.amountM, 1999);
  EXPECT_STREQ(usd.codeM, "USD");
  EXPECT_EQ(Str(usd.ToString()), "USD.1999");
  EXPECT_EQ(usd, Currency(1999, "USD"));
  EXPECT_NE(usd, Currency(1999, "EUR"));
  for (const char* bad : {"USD.-5", "USD.", "US.5", "USD.5x", "USD5", "", "USD.2147483648", "USD. 5"}) {
    EXPECT_EQ(Currency::Parse(Text(bad)), Currency::INVALID) << bad;
  }
  EXPECT_EQ(Currency::Parse(Text(std::string("U\0D.5", 5))), Currency::INVALID) << "a code with a NUL is not 3 long";
  EXPECT_EQ(Currency::Parse(Text("USD.2147483647")).amountM, 2147483647);
  Currency euro(5, "EURO");
  EXPECT_EQ(euro, Currency::INVALID);
  EXPECT_EQ(Str(euro.ToString()), "invalid");
  EXPECT_EQ(Currency(5, nullptr), Currency::INVALID);
  EXPECT_EQ(Str(Currency(-5, "USD").ToString()), "USD.-5");
  unsigned char bytes[sizeof(Currency)];
  std::memcpy(bytes, &Currency::INVALID, sizeof bytes);
  for (unsigned char b : bytes) EXPECT_EQ(b, 0);
  Currency full;
  full.amountM = 1;
  std::memcpy(full.codeM, "ABCD", 4);
  EXPECT_EQ(Str(full.ToString()), "ABCD.1") << "a code without NUL is read within its bytes";
}

TEST_P(ScalarTypesTest, Dates) {
  EXPECT_EQ(Date::Parse(Text("1970-01-02")).daysM, 1);
  EXPECT_EQ(Date::Parse(Text("1969-12-31")).daysM, -1);
  EXPECT_EQ(Date::Parse(Text("2021-03-04")).daysM, 18690);
  EXPECT_EQ(Date::Parse(Text("2021-03-04x")), Date::ZERO);
  EXPECT_EQ(Date::Parse(Text("2021-03-04 ")), Date::ZERO);
  EXPECT_EQ(Date::Parse(Text("2021-13-04")), Date::ZERO);
  EXPECT_EQ(Date::Parse(Text("")), Date::ZERO);
  EXPECT_EQ(Date::Parse(Text(std::string("2021-03-04\0x", 12))), Date::Parse(Text("2021-03-04")));
  EXPECT_EQ(Str(Date(0).ToString()), "1970-01-01");
  EXPECT_EQ(Str(Date(-1).ToString()), "1969-12-31");
  EXPECT_EQ(Str(Date(18690).ToString()), "2021-03-04");
  for (int days = -719162; days <= 2932896; days += 997) {  // years 1 to 9999
    ASSERT_EQ(Date::Parse(Date(days).ToString()).daysM, days) << days;
  }
}

TEST_P(ScalarTypesTest, Times) {
  EXPECT_EQ(Time::Parse(Text("00:00:01")).millisecondsM, 1000);
  EXPECT_EQ(Time::Parse(Text("23:59:59")).millisecondsM, 86399000);
  EXPECT_EQ(Time::Parse(Text("13:05:09")).millisecondsM, 47109000);
  EXPECT_EQ(Time::Parse(Text("24:00:00")), Time::ZERO);
  EXPECT_EQ(Time::Parse(Text("13:05")), Time::ZERO);
  EXPECT_EQ(Time::Parse(Text("13:05:09.5")), Time::ZERO);
  EXPECT_EQ(Str(Time(1999).ToString()), "00:00:01");
  EXPECT_EQ(Str(Time(0).ToString()), "00:00:00");
  EXPECT_EQ(Str(Time(86399999).ToString()), "23:59:59");
}

TEST_P(ScalarTypesTest, DateTimes) {
  EXPECT_EQ(DateTime::Parse(Text("2021-03-04 13:05:09")).millisecondsM, 1614863109000);
  EXPECT_EQ(DateTime::Parse(Text("2021-03-04T13:05:09")).millisecondsM, 1614863109000);
  EXPECT_EQ(Str(DateTime(1614863109000).ToString()), "2021-03-04 13:05:09");
  EXPECT_EQ(Str(DateTime(1614863109999).ToString()), "2021-03-04 13:05:09");
  EXPECT_EQ(DateTime::Parse(Text("2021-03-04")), DateTime::ZERO);
  EXPECT_EQ(DateTime::Parse(Text("2021-03-04t13:05:09")), DateTime::ZERO);
  EXPECT_EQ(DateTime::Parse(Text("2021-03-04 13:05:09Z")), DateTime::ZERO);
  EXPECT_EQ(DateTime::Parse(Text("1969-12-31 23:59:59")).millisecondsM, -1000);
  EXPECT_EQ(Str(DateTime(0).ToString()), "1970-01-01 00:00:00");
  int64_t before = static_cast<int64_t>(std::time(nullptr)) * 1000;
  int64_t now = DateTime::Now().millisecondsM;
  int64_t after = (static_cast<int64_t>(std::time(nullptr)) + 1) * 1000;
  EXPECT_GE(now, before);
  EXPECT_LE(now, after);
}

TEST(StringUtilTest, SplitString) {
  VekMempool pool("split");
  {
    VekStringArray pieces(&pool);
    EXPECT_TRUE(SplitString(Text("a,b,,c"), Text(","), pieces));
    ASSERT_EQ(pieces.Count(), 4);
    EXPECT_EQ(Str(pieces[0]), "a");
    EXPECT_EQ(Str(pieces[1]), "b");
    EXPECT_EQ(Str(pieces[2]), "");
    EXPECT_EQ(Str(pieces[3]), "c");

    EXPECT_FALSE(SplitString(Text("abc"), Text(","), pieces));
    EXPECT_EQ(pieces.Count(), 4) << "nothing added without a separator";
    EXPECT_FALSE(SplitString(Text("abc"), Text(""), pieces)) << "an empty separator is refused";
    EXPECT_EQ(pieces.Count(), 4);

    pieces.Clear();
    EXPECT_TRUE(SplitString(Text("a,"), Text(","), pieces));
    ASSERT_EQ(pieces.Count(), 2);
    EXPECT_EQ(Str(pieces[0]), "a");
    EXPECT_EQ(Str(pieces[1]), "");

    pieces.Clear();
    EXPECT_TRUE(SplitString(Text("x::::y::"), Text("::"), pieces));
    ASSERT_EQ(pieces.Count(), 4);
    EXPECT_EQ(Str(pieces[1]), "");
    EXPECT_EQ(Str(pieces[2]), "y");
    EXPECT_EQ(Str(pieces[3]), "");

    pieces.Clear();
    EXPECT_TRUE(SplitString(Text(std::string("a\0b", 3)), Text(std::string("\0", 1)), pieces));
    ASSERT_EQ(pieces.Count(), 2);

    // 65,535 pieces fit; one more is refused without adding anything.
    pieces.Clear();
    std::string many(65534, ',');
    EXPECT_TRUE(SplitString(Text(many), Text(","), pieces));
    EXPECT_EQ(pieces.Count(), 65535);
    pieces.Clear();
    EXPECT_FALSE(SplitString(Text(many + ","), Text(","), pieces));
    EXPECT_EQ(pieces.Count(), 0);
  }
  EXPECT_EQ(pool.GetUsedBytes(), 0u);
}

TEST(StringUtilTest, ReplaceCharsWithString) {
  VekMempool pool("replace");
  {
    EXPECT_EQ(Str(ReplaceCharsWithString(&pool, Text("a/b:c"), Text("/:"), Text("_"))), "a_b_c");
    EXPECT_EQ(Str(ReplaceCharsWithString(&pool, Text("a/b"), Text("/"), Text(""))), "ab");
    EXPECT_EQ(Str(ReplaceCharsWithString(&pool, Text("a/b"), Text("/"), Text("%2F"))), "a%2Fb");
    EXPECT_EQ(Str(ReplaceCharsWithString(&pool, Text("abc"), Text(""), Text("_"))), "abc");
    EXPECT_EQ(Str(ReplaceCharsWithString(&pool, Text(std::string("a/\0/", 4)), Text("/"), Text("-"))), "a-")
        << "the text ends at its first NUL";
    // A multi-byte character in the set acts as its separate bytes.
    EXPECT_EQ(Str(ReplaceCharsWithString(&pool, Text("\xC3\xA9\xC3\xA0"), Text("\xC3\xA9"), Text("?"))), "???\xA0");
    EXPECT_EQ(ReplaceCharsWithString(&pool, Text("x"), Text("x"), Text("y")).GetMempool(), &pool);
  }
  EXPECT_EQ(pool.GetUsedBytes(), 0u);
}

}  // namespace
