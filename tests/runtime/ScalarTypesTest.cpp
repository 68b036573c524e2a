#include <cstdlib>
#include <ctime>
#include <string>

#include "sarn/Sarn.h"
#include "testutil/TestUtil.h"

namespace {

using namespace sarn;
using sarntest::Str;

VekString Text(const std::string& text) { return VekString::FromUtf8Bytes(nullptr, text.size(), text.data()); }

// Every conversion must ignore the process time zone: each test runs with the zone set 14 hours
// east of UTC and again 12 hours west of it (and then without a zone: nothing else here reads it).
class ScalarTypesTest : public ::testing::TestWithParam<const char*> {
 protected:
  void SetUp() override {
    setenv("TZ", GetParam(), 1);
    tzset();
    time_t noon = 12 * 3600;
    struct tm local;
    localtime_r(&noon, &local);
    ASSERT_NE(local.tm_hour, 12) << "the process zone did not take";
  }
  void TearDown() override {
    unsetenv("TZ");
    tzset();
  }
};

INSTANTIATE_TEST_SUITE_P(FarZones, ScalarTypesTest, ::testing::Values("EAST-14", "WEST+12"));

// Each text parsed as its kind; channel numbers and currencies also read back from what they print.
TEST_P(ScalarTypesTest, ParsedTexts) {
  for (const auto& row : sarntest::ReadTable("values/scalar-texts.txt", 3)) {
    const std::string& kind = row[0];
    const VekString text = Text(row[1]);
    std::string value;
    if (kind == "channel") {
      ChannelNumber parsed = ChannelNumber::Parse(text);
      value = Str(parsed.ToString());
      EXPECT_EQ(ChannelNumber::Parse(parsed.ToString()), parsed) << row[1];
    } else if (kind == "currency") {
      Currency parsed = Currency::Parse(text);
      value = Str(parsed.ToString());
      EXPECT_EQ(Currency::Parse(parsed.ToString()), parsed) << row[1];
    } else if (kind == "date") {
      value = std::to_string(Date::Parse(text).daysM);
    } else if (kind == "time") {
      value = std::to_string(Time::Parse(text).millisecondsM);
    } else {
      value = std::to_string(DateTime::Parse(text).millisecondsM);
    }
    EXPECT_EQ(value, row[2]) << kind << " " << row[1];
  }
}

TEST_P(ScalarTypesTest, ChannelNumbers) {
  EXPECT_EQ(Str(ChannelNumber(-2, 7).ToString()) + " " + Str(ChannelNumber(-1).ToString()), "-2-7 -1");
  EXPECT_TRUE(ChannelNumber() == ChannelNumber::INVALID && ChannelNumber(5, 1) != ChannelNumber(5, 2));
  ChannelNumber copy;
  copy = ChannelNumber(7, 3);
  EXPECT_TRUE(copy.majorM == 7 && copy.minorM == 3);
}

TEST_P(ScalarTypesTest, Currencies) {
  Currency usd = Currency::Parse(Text("USD.1999"));
  EXPECT_TRUE(usd.amountM == 1999 && std::string(usd.codeM) == "USD");
  EXPECT_TRUE(usd == Currency(1999, "USD") && usd != Currency(1999, "EUR"));
  EXPECT_TRUE(Currency(5, "EURO") == Currency::INVALID && Currency(5, nullptr) == Currency::INVALID);
  EXPECT_EQ(Str(Currency(5, "EURO").ToString()) + " " + Str(Currency(-5, "USD").ToString()), "invalid USD.-5");
  EXPECT_EQ(std::string(reinterpret_cast<const char*>(&Currency::INVALID), sizeof(Currency)),
            std::string(sizeof(Currency), '\0'));
  Currency full;
  full.amountM = 1;
  std::memcpy(full.codeM, "ABCD", 4);
  EXPECT_EQ(Str(full.ToString()), "ABCD.1") << "a code without NUL is read within its bytes";
}

// Oracle: canonical texts are read by hand, so every text near that shape (random digits, some
// byte swapped for a separator, space or NUL, or cut off) gives what strptime and timegm give, in
// the string form and in the byte form (which reads only its n bytes: a digit follows them).
TEST_P(ScalarTypesTest, HandReadTextsAgreeWithStrptime) {
  auto reference = [](const std::string& text, const char* format, bool isTime) -> long long {
    struct tm tm = {};
    time_t epoch = 0;
    if (isTime) gmtime_r(&epoch, &tm);
    const char* end = strptime(text.c_str(), format, &tm);
    return end != nullptr && *end == '\0' ? static_cast<long long>(timegm(&tm)) : 0;
  };
  std::srand(7);
  const char odd[] = "-: T0\0";
  for (int i = 0; i < 50000; ++i) {
    std::string text = "2000-01-01 00:00:00";
    for (int k : {0, 1, 2, 3, 5, 6, 8, 9, 11, 12, 14, 15, 17, 18}) text[k] = static_cast<char>('0' + std::rand() % (k % 3 == 2 ? 7 : 10));
    if (std::rand() % 2) text[10] = 'T';
    if (std::rand() % 4 == 0) text[std::rand() % text.size()] = odd[std::rand() % (sizeof odd - 1)];
    if (std::rand() % 4 == 0) text.resize(std::rand() % text.size());
    std::string date = text.substr(0, 10), time = text.size() > 11 ? text.substr(11) : "";
    std::string all = text + "7", clock = time + "7";
    long long seconds = reference(text, "%F %T", false);
    if (seconds == 0) seconds = reference(text, "%FT%T", false);
    ASSERT_EQ(DateTime::Parse(Text(text)).millisecondsM, seconds * 1000) << text;
    ASSERT_EQ(Date::Parse(Text(date)).daysM, reference(date, "%F", false) / 86400) << date;
    ASSERT_EQ(Time::Parse(Text(time)).millisecondsM, reference(time, "%T", true) * 1000) << time;
    ASSERT_TRUE(DateTime::Parse(all.data(), text.size()) == DateTime::Parse(Text(text)) &&
                Date::Parse(all.data(), date.size()) == Date::Parse(Text(date)) &&
                Time::Parse(clock.data(), time.size()) == Time::Parse(Text(time)))
        << text;
  }
}

// Zero values, value to text, and text to value over the whole range of years.
TEST_P(ScalarTypesTest, DatesTimesAndDateTimes) {
  EXPECT_TRUE(Date::Parse(Text("")) == Date::ZERO && Time::Parse(Text("24:00:00")) == Time::ZERO &&
              DateTime::Parse(Text("2021-03-04")) == DateTime::ZERO && Date(1) != Date::ZERO && Time(1) != Time::ZERO &&
              DateTime(1) != DateTime::ZERO);

  EXPECT_EQ(Str(Date(0).ToString()) + " " + Str(Date(-1).ToString()) + " " + Str(Date(18690).ToString()),
            "1970-01-01 1969-12-31 2021-03-04");
  EXPECT_EQ(Str(Time(1999).ToString()) + " " + Str(Time(0).ToString()) + " " + Str(Time(86399999).ToString()),
            "00:00:01 00:00:00 23:59:59");
  EXPECT_EQ(Str(DateTime(1614863109000).ToString()) + "|" + Str(DateTime(1614863109999).ToString()) + "|" +
                Str(DateTime(0).ToString()),
            "2021-03-04 13:05:09|2021-03-04 13:05:09|1970-01-01 00:00:00");
  for (int days = -719162; days <= 2932896; days += 997) {  // years 1 to 9999
    ASSERT_EQ(Date::Parse(Date(days).ToString()).daysM, days) << days;
  }
  int64_t before = static_cast<int64_t>(std::time(nullptr)) * 1000;
  int64_t now = DateTime::Now().millisecondsM;
  EXPECT_TRUE(now >= before && now <= before + 2000) << now;
}

// The pieces joined with '|', or "refused" and the count of what the array then holds.
std::string Split(VekStringArray& pieces, const std::string& text, const std::string& separator) {
  pieces.Clear();
  if (!SplitString(Text(text), Text(separator), pieces)) return "refused " + std::to_string(pieces.Count());
  std::string joined;
  for (int i = 0; i < pieces.Count(); ++i) joined += (i ? "|" : "") + Str(pieces[i]);
  return joined;
}

TEST(StringUtilTest, SplitAndReplace) {
  VekMempool pool("split");
  {
    VekStringArray pieces(&pool);
    for (const auto& row : sarntest::ReadTable("values/split-replace.txt", 5)) {
      EXPECT_EQ(row[0] == "split" ? Split(pieces, row[1], row[2])
                                  : Str(ReplaceCharsWithString(&pool, Text(row[1]), Text(row[2]), Text(row[3]))),
                row[4])
          << row[0] << " " << row[1];
    }
    pieces.Add(VekString("kept"));
    EXPECT_TRUE(!SplitString(Text("abc"), Text(","), pieces) && pieces.Count() == 1);
    // 65,535 pieces fit; one more is refused without adding anything.
    EXPECT_EQ(Split(pieces, std::string(65534, ','), ",").size(), 65534u);
    EXPECT_EQ(Split(pieces, std::string(65535, ','), ","), "refused 0");

    EXPECT_EQ(ReplaceCharsWithString(&pool, Text("x"), Text("x"), Text("y")).GetMempool(), &pool);
  }
  EXPECT_EQ(pool.GetUsedBytes(), 0u);
}

}  // namespace
