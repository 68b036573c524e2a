// Platform services: the logger and its sink, feature switches (also from the environment),
// the spin lock under contention, interval texts and the assertion.
#include <cstdlib>
#include <string>
#include <thread>
#include <tuple>
#include <vector>

#include "testutil/TestUtil.h"

namespace {

std::vector<std::string> loggedG;  // "facility priority [tag] line"

void RecordLine(int facility, int priority, const char* tag, const char* line) {
  loggedG.push_back(std::to_string(facility) + " " + std::to_string(priority) + " [" + tag + "] " + line);
}

TEST(LoggerTest, SinkReceivesEachFormattedLine) {
  loggedG.clear();
  EXPECT_EQ(VekLogger::SetSink(RecordLine), nullptr);
  VekLogger::Log(0, 6, "LazyDict", "ToSarnObject %s <%s> %zd", "label", "type", static_cast<ssize_t>(-3));
  std::string longText(2000, 'q');
  VekLogger::Log(3, 2, nullptr, "[%s]", longText.c_str());
  EXPECT_EQ(VekLogger::SetSink(nullptr), &RecordLine);
  // A null tag arrives as an empty one; long lines are not cut.
  EXPECT_EQ(loggedG, std::vector<std::string>({"0 6 [LazyDict] ToSarnObject label <type> -3", "3 2 [] [" + longText + "]"}));
  // Without a sink the line goes to standard error.
  testing::internal::CaptureStderr();
  VekLogger::Log(0, 6, "tag", "n=%d", 5);
  EXPECT_EQ(testing::internal::GetCapturedStderr(), "tag: n=5\n");
}

TEST(FeaturesTest, SwitchesAreOffUntilSetAndIgnoreUnknownIds) {
  const int last = VekFeatures::kMaxFeature - 1;
  auto states = [last] {
    std::string text;
    for (int id : {-1, 16, 17, 18, last, last + 1}) text += VekFeatures::FEnabled(id) ? '1' : '0';
    return text;
  };
  EXPECT_EQ(states(), "000000");
  for (int id : {-1, 17, last, last + 1}) VekFeatures::SetEnabled(id, true);
  EXPECT_EQ(states(), "001010") << "neighbours stay off, unknown ids are ignored";
  for (int id : {17, last}) VekFeatures::SetEnabled(id, false);
  EXPECT_EQ(states(), "000000");
}

// The environment is read at the first query of a process, so each case runs in a fresh one.
TEST(FeaturesDeathTest, Feature548FollowsTheEnvironment) {
  GTEST_FLAG_SET(death_test_style, "threadsafe");
  auto exitWithFeature = [](const char* value, bool isSetOff) {
    setenv("VEK_FEATURE_548", value, 1);
    if (isSetOff) VekFeatures::SetEnabled(548, false);  // an explicit setting wins over the environment
    std::exit((VekFeatures::FEnabled(548) ? 1 : 0) + (VekFeatures::FEnabled(547) ? 2 : 0));
  };
  const std::tuple<const char*, bool, int> cases[] = {{"1", false, 1}, {"0", false, 0}, {"yes", false, 0}, {"1", true, 0}};
  for (const auto& [value, isSetOff, code] : cases) {
    EXPECT_EXIT(exitWithFeature(value, isSetOff), testing::ExitedWithCode(code), "") << value << isSetOff;
  }
}

TEST(SpinLockTest, ExcludesAcrossThreads) {
  VekSpinLock lock("test", 1);
  EXPECT_EQ(std::string(lock.GetName()) + " " + std::to_string(lock.GetRank()), "test 1");
  long counter = 0;
  auto add = [&] {
    for (int i = 0; i < 200000; ++i) {
      VekSpinLockGuard guard(lock);
      ++counter;
    }
  };
  std::thread threads[] = {std::thread(add), std::thread(add), std::thread(add)};
  for (std::thread& thread : threads) thread.join();
  EXPECT_EQ(counter, 600000);
  ASSERT_TRUE(lock.TryLock());
  EXPECT_FALSE(lock.TryLock()) << "not recursive";
  lock.Unlock();
  EXPECT_TRUE(lock.TryLock());
  lock.Unlock();
}

TEST(TimeTest, IntervalTextPicksTheUnitAtEachBoundary) {
  std::string texts;
  for (int64_t ns : {0LL, 999LL, 1000LL, 12345LL, 999999LL, 1000000LL, 3200000LL, 1000000000LL, -1500LL}) {
    texts += std::string(VekTime(ns).DebugStringAsInterval().Utf8()) + " ";
  }
  EXPECT_EQ(texts, "0ns 999ns 1.000us 12.345us 999.999us 1.000ms 3.200ms 1.000000s -1.500us ");
  VekTime earlier = VekMonotonicTime::Now();
  EXPECT_GE((VekMonotonicTime::Now() - earlier).GetNanoseconds(), 0);
}

TEST(AssertDeathTest, NamesTheConditionAndTheFile) {
  EXPECT_DEATH(VekAssertFail("count < limit", "Thing.cpp"), "VekAssertFail: count < limit \\(Thing.cpp\\)");
  int two = 2;
  EXPECT_DEATH(VekAssert(two == 3), "VekAssertFail: two == 3 \\(.*ServicesTest.cpp\\)");
}

}  // namespace
