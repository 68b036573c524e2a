#include <climits>
#include <string>

#include "sarn/Sarn.h"
#include "testutil/TestUtil.h"

namespace {

using ByteBufferTest = sarntest::PoolTest;

using sarntest::Contents;

unsigned long Capacity(const sarn::ByteBuffer& buffer) { return buffer.bufferM.bytesM->GetLength(); }

TEST_F(ByteBufferTest, SingleBytesGrowByAtLeast256AndKeepASpareByte) {
  sarn::ByteBuffer buffer(&poolM);
  EXPECT_TRUE(Capacity(buffer) == 0 && buffer.GetLength() == 0);
  std::string expected;
  std::vector<unsigned long> capacities;
  for (int i = 0; i < 1100; ++i) {
    unsigned long before = Capacity(buffer);
    ASSERT_TRUE(buffer.AppendByte(static_cast<unsigned char>(i)));
    expected.push_back(static_cast<char>(i));
    if (Capacity(buffer) != before) capacities.push_back(Capacity(buffer));
    ASSERT_LT(buffer.GetLength(), Capacity(buffer)) << "no spare byte after " << i + 1 << " bytes";
  }
  EXPECT_EQ(capacities, (std::vector<unsigned long>{257, 514, 771, 1028, 1285}));
  EXPECT_EQ(Contents(buffer), expected);
}

TEST_F(ByteBufferTest, RunsGrowByTheirLengthPlusAFifth) {
  sarn::ByteBuffer buffer(&poolM);
  std::string big(10000, 'x');
  ASSERT_TRUE(buffer.AppendBytes(reinterpret_cast<const unsigned char*>(big.data()), big.size()) && Capacity(buffer) == 10256);
  std::string fill(255, 'y');
  ASSERT_TRUE(buffer.AppendBytes(reinterpret_cast<const unsigned char*>(fill.data()), fill.size()) && Capacity(buffer) == 10256)
      << "10,255 of 10,256 bytes used leaves the spare byte";
  ASSERT_TRUE(buffer.AppendByte('z') && Capacity(buffer) == 10256u + 1 + 2051);
  EXPECT_TRUE(buffer.AppendBytes(nullptr, 0));

  // Reserve grows exactly as an append of that many bytes would, and only when it must.
  EXPECT_TRUE(buffer.Reserve(2051) && Capacity(buffer) == 12308) << "2,052 spare bytes hold 2,051 and the spare byte";
  EXPECT_TRUE(buffer.Reserve(2052) && Capacity(buffer) == 12308u + 2052 + 2461);
  EXPECT_EQ(Contents(buffer), big + fill + "z");
  EXPECT_FALSE(buffer.Reserve(ULONG_MAX));
}

TEST_F(ByteBufferTest, AppendStringStopsAtTheNulAndRefusesImpossibleLengths) {
  sarn::ByteBuffer buffer(&poolM);
  EXPECT_TRUE(buffer.AppendString("ab\0cd") && buffer.AppendString(nullptr) && buffer.AppendString(""));
  EXPECT_EQ(Contents(buffer), "ab");
  unsigned char byte = 1;
  EXPECT_TRUE(!buffer.AppendBytes(&byte, ULONG_MAX) && !buffer.AppendBytes(&byte, ULONG_MAX - 300)) << "wrapping lengths";
  EXPECT_EQ(Contents(buffer), "ab");
}

TEST_F(ByteBufferTest, CoreDoublesForBytesAndFitsRunsExactly) {
  ref<sarn::Vek1ByteBufferCore> core = new (&poolM) sarn::Vek1ByteBufferCore();
  EXPECT_TRUE(core->GetLength() == 0 && core->GetCapacity() == 0);
  std::vector<size_t> capacities;
  for (int i = 0; i < 17; ++i) {
    size_t before = core->GetCapacity();
    ASSERT_TRUE(core->AppendByte(static_cast<unsigned char>('a' + i)));
    if (core->GetCapacity() != before) capacities.push_back(core->GetCapacity());
  }
  EXPECT_EQ(capacities, (std::vector<size_t>{8, 16, 32}));
  const unsigned char run[] = {'X', 'Y', 'Z'};
  ASSERT_TRUE(core->AppendBytes(run, 3));
  EXPECT_TRUE(core->GetLength() == 20 && core->GetCapacity() == 20) << "a run reallocates to exactly the new length";
  EXPECT_EQ(Contents(*core), "abcdefghijklmnopqXYZ");
  // Only the low 32 bits of a run's length count.
  EXPECT_TRUE(core->AppendBytes(run, 1ul << 32) && core->GetLength() == 20);
  EXPECT_TRUE(!core->AppendBytes(run, 0x80000000ul) && core->GetLength() == 20) << "past the platform's 2 GiB";

  ref<sarn::Vek1ByteBufferCore> small = new (&poolM) sarn::Vek1ByteBufferCore();
  EXPECT_TRUE(small->AppendBytes(run, 3) && small->GetCapacity() == 8) << "at least 8 bytes";
}

TEST_F(ByteBufferTest, CoreEqualityComparesLengthAndBytes) {
  std::vector<ref<sarn::Vek1ByteBufferCore>> cores;
  for (const char* bytes : {"", "abc", "ab", "abd", "abc"}) {
    cores.push_back(new (&poolM) sarn::Vek1ByteBufferCore());
    for (const char* b = bytes; *b != 0; ++b) cores.back()->AppendByte(static_cast<unsigned char>(*b));
  }
  EXPECT_EQ(std::vector<bool>({cores[0]->FEqual(nullptr),
                               cores[0]->FEqual(ref<sarn::Vek1ByteBufferCore>(new (&poolM) sarn::Vek1ByteBufferCore()).Get()),
                               cores[1]->FEqual(cores[2].Get()), cores[1]->FEqual(cores[3].Get()),
                               cores[1]->FEqual(cores[4].Get())}),
            std::vector<bool>({false, true, false, false, true}));
}

}  // namespace
