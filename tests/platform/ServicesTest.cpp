// Platform services: the logger and its sink, feature switches (also from the environment),
// the spin lock under contention, interval texts and the assertion.
#include <cstdlib>
#include <string>
#include <thread>
#include <vector>

#include "testutil/TestUtil.h"

namespace {

struct LoggedLine {
  int facilityM;
  int priorityM;
  std::string tagM;
  std::string lineM;
};
std::vector<LoggedLine> loggedG;

void RecordLine(int facility, int priority, const char* tag, const char* line) {
  loggedG.push_back({facility, priority, tag, line});
}

TEST(LoggerTest, SinkReceivesEachFormattedLine) {
  loggedG.clear();
  VekLogger::Sink previous = VekLogger::SetSink(RecordLine);
  EXPECT_EQ(previous, nullptr);
  VekLogger::Log(0, 6, "LazyDict", "ToSarnObject %s <%s> %zd", "label", "type", static_cast<ssize_t>(-3));
  std::string longText(2000, 'q');
  VekLogger::Log(3, 2, nullptr, "[%s]", longText.c_str());
  EXPECT_EQ(VekLogger::SetSink(nullptr), &RecordLine);
  ASSERT_EQ(loggedG.size(), 2u);
  EXPECT_EQ(loggedG[0].facilityM, 0);
  EXPECT_EQ(loggedG[0].priorityM, 6);
  EXPECT_EQ(loggedG[0].tagM, "LazyDict");
  EXPECT_EQ(loggedG[0].lineM, "ToSarnObject label <type> -3");
  EXPECT_EQ(loggedG[1].tagM, "") << "a null tag arrives as an empty one";
  EXPECT_EQ(loggedG[1].lineM, "[" + longText + "]") << "long lines are not cut";

  // Without a sink the line goes to standard error.
  testing::internal::CaptureStderr();
  VekLogger::Log(0, 6, "tag", "n=%d", 5);
  EXPECT_EQ(testing::internal::GetCapturedStderr(), "tag: n=5\n");
}

TEST(FeaturesTest, SwitchesAreOffUntilSetAndIgnoreUnknownIds) {
  EXPECT_FALSE(VekFeatures::FEnabled(17));
  VekFeatures::SetEnabled(17, true);
  EXPECT_TRUE(VekFeatures::FEnabled(17));
  EXPECT_FALSE(VekFeatures::FEnabled(16)) << "neighbours stay off";
  EXPECT_FALSE(VekFeatures::FEnabled(18));
  VekFeatures::SetEnabled(17, false);
  EXPECT_FALSE(VekFeatures::FEnabled(17));
  VekFeatures::SetEnabled(VekFeatures::kMaxFeature - 1, true);
  EXPECT_TRUE(VekFeatures::FEnabled(VekFeatures::kMaxFeature - 1));
  VekFeatures::SetEnabled(VekFeatures::kMaxFeature - 1, false);
  VekFeatures::SetEnabled(-1, true);
  VekFeatures::SetEnabled(VekFeatures::kMaxFeature, true);
  EXPECT_FALSE(VekFeatures::FEnabled(-1));
  EXPECT_FALSE(VekFeatures::FEnabled(VekFeatures::kMaxFeature));
}

// The environment is read at the first query of a process, so each case runs in a fresh one.
TEST(FeaturesDeathTest, Feature548FollowsTheEnvironment) {
  GTEST_FLAG_SET(death_test_style, "threadsafe");
  auto exitWithFeature = [](const char* value) {
    setenv("VEK_FEATURE_548", value, 1);
    bool isOn = VekFeatures::FEnabled(548);
    bool isOtherOn = VekFeatures::FEnabled(547);
    std::exit((isOn ? 1 : 0) + (isOtherOn ? 2 : 0));
  };
  EXPECT_EXIT(exitWithFeature("1"), testing::ExitedWithCode(1), "");
  EXPECT_EXIT(exitWithFeature("0"), testing::ExitedWithCode(0), "");
  EXPECT_EXIT(exitWithFeature("yes"), testing::ExitedWithCode(0), "");
  EXPECT_EXIT(
      {
        setenv("VEK_FEATURE_548", "1", 1);
        VekFeatures::SetEnabled(548, false);  // an explicit setting wins over the environment
        std::exit(VekFeatures::FEnabled(548) ? 1 : 0);
      },
      testing::ExitedWithCode(0), "");
}

TEST(SpinLockTest, ExcludesAcrossThreads) {
  VekSpinLock lock("test", 1);
  EXPECT_STREQ(lock.GetName(), "test");
  EXPECT_EQ(lock.GetRank(), 1);
  long counter = 0;
  auto add = [&] {
    for (int i = 0; i < 200000; ++i) {
      VekSpinLockGuard guard(lock);
      ++counter;
    }
  };
  std::thread a(add), b(add), c(add);
  a.join();
  b.join();
  c.join();
  EXPECT_EQ(counter, 600000);
  ASSERT_TRUE(lock.TryLock());
  EXPECT_FALSE(lock.TryLock()) << "not recursive";
  lock.Unlock();
  EXPECT_TRUE(lock.TryLock());
  lock.Unlock();
}

TEST(TimeTest, IntervalTextPicksTheUnitAtEachBoundary) {
  auto text = [](int64_t ns) { return std::string(VekTime(ns).DebugStringAsInterval().Utf8()); };
  EXPECT_EQ(text(0), "0ns");
  EXPECT_EQ(text(999), "999ns");
  EXPECT_EQ(text(1000), "1.000us");
  EXPECT_EQ(text(12345), "12.345us");
  EXPECT_EQ(text(999999), "999.999us");
  EXPECT_EQ(text(1000000), "1.000ms");
  EXPECT_EQ(text(3200000), "3.200ms");
  EXPECT_EQ(text(1000000000), "1.000000s");
  EXPECT_EQ(text(-1500), "-1.500us");
  VekTime earlier = VekMonotonicTime::Now();
  VekTime later = VekMonotonicTime::Now();
  EXPECT_GE((later - earlier).GetNanoseconds(), 0);
}

TEST(AssertDeathTest, NamesTheConditionAndTheFile) {
  EXPECT_DEATH(VekAssertFail("count < limit", "Thing.cpp"), "VekAssertFail: count < limit \\(Thing.cpp\\)");
  int two = 2;
  EXPECT_DEATH(VekAssert(two == 3), "VekAssertFail: two == 3 \\(.*ServicesTest.cpp\\)");
}

}  // namespace
