// Strings: construction, byte-exact equality with embedded NUL bytes, byte-position
// operations over UTF-8 text, sharing across copies and threads; the string array's limit.
#include <climits>
#include <string>
#include <thread>

#include "testutil/TestUtil.h"

namespace {

using StringTest = sarntest::PoolTest;

std::string Bytes(const VekString& s) { return std::string(s.Utf8(), s.NByte()); }

TEST_F(StringTest, EmptyFormsHoldNoRepresentation) {
  for (const VekString& s : {VekString(), VekString(""), VekString(static_cast<const char*>(nullptr)),
                             VekString::FromUtf8Bytes(&poolM, 0, "x")}) {
    EXPECT_TRUE(s.FEmpty());
    EXPECT_EQ(s.NByte(), 0u);
    EXPECT_STREQ(s.Utf8(), "");
    EXPECT_EQ(s.GetRep(), nullptr);
    EXPECT_TRUE(s == "");
    EXPECT_TRUE(s.FEqual(nullptr));
  }
  EXPECT_EQ(poolM.GetUsedBytes(), 0u);
}

TEST_F(StringTest, EmbeddedNulBytesAreKeptAndCompared) {
  VekString a = VekString::FromUtf8Bytes(&poolM, 5, "ab\0cd");
  VekString b = VekString::FromUtf8Bytes(&poolM, 5, "ab\0ce");
  EXPECT_EQ(a.NByte(), 5u);
  EXPECT_EQ(Bytes(a), std::string("ab\0cd", 5));
  EXPECT_EQ(a.Utf8()[5], '\0') << "always NUL-terminated";
  EXPECT_EQ(a.GetMempool(), &poolM);
  EXPECT_NE(a, b) << "bytes after the NUL count";
  EXPECT_FALSE(a == "ab") << "a C string stops at its NUL, the VekString does not";
  EXPECT_EQ(a, VekString::FromUtf8Bytes(&poolM, 5, "ab\0cd"));
  EXPECT_EQ(a.FindString(VekString::FromUtf8Bytes(&poolM, 2, "\0c")), 2);
  EXPECT_EQ(Bytes(a.Right(2)), std::string("\0cd", 3));
}

TEST_F(StringTest, FormatWritesShortAndLongTextsIntoThePool) {
  VekString s = VekString::Format(&poolM, "%s=%d;%05.1f", "k", -42, 3.14159);
  EXPECT_EQ(Bytes(s), "k=-42;003.1");
  EXPECT_EQ(poolM.GetUsedBytes(), sizeof(VekStringRepN) + s.NByte() + 1);
  std::string longText(1000, 'z');
  VekString l = VekString::Format(&poolM, "<%s>", longText.c_str());
  EXPECT_EQ(Bytes(l), "<" + longText + ">");
  EXPECT_TRUE(VekString::Format(&poolM, "%s", "").FEmpty());
}

TEST_F(StringTest, BytePositionsOverUtf8Text) {
  // "grüße, wörld": ü, ß and ö are two bytes each.
  VekString s = VekString::FromUtf8Bytes(&poolM, 15, "gr\xc3\xbc\xc3\x9f" "e, w\xc3\xb6rld");
  ASSERT_EQ(s.NByte(), 15u);
  EXPECT_EQ(s.FindString("w\xc3\xb6"), 9);
  EXPECT_EQ(s.FindString("\xc3"), 2);
  EXPECT_EQ(s.FindString("\xc3", 3), 4) << "search from a byte position";
  EXPECT_EQ(s.FindString("\xc3", 7), 10);
  EXPECT_EQ(s.FindString("\xc3", 10), 10);
  EXPECT_EQ(s.FindString("\xc3", 11), -1);
  EXPECT_EQ(s.FindString("rld"), 12) << "match that ends at the last byte";
  EXPECT_EQ(s.FindString("rldx"), -1);
  EXPECT_EQ(s.FindString(""), 0);
  EXPECT_EQ(s.FindString("", 15), 15) << "an empty needle is found at the end too";
  EXPECT_EQ(s.FindString("", 16), -1);
  EXPECT_EQ(s.FindString("g", -5), 0) << "a negative start searches from 0";
  EXPECT_EQ(s.FindString(static_cast<const char*>(nullptr)), 0);
  EXPECT_EQ(VekString().FindString("a"), -1);
  EXPECT_EQ(VekString().FindString(""), 0);

  EXPECT_EQ(Bytes(s.Left(4)), "gr\xc3\xbc");
  EXPECT_EQ(Bytes(s.Right(9)), "w\xc3\xb6rld");
  EXPECT_EQ(Bytes(s.Middle(2, 6)), "\xc3\xbc\xc3\x9f");
  EXPECT_EQ(Bytes(s.Middle(3, 5)), "\xbc\xc3") << "positions are bytes, not characters";
  // Out-of-range positions clamp; a reversed range is empty.
  EXPECT_EQ(Bytes(s.Left(-1)), "");
  EXPECT_EQ(s.Left(99).GetRep(), s.GetRep()) << "the whole text is shared, not copied";
  EXPECT_EQ(s.Right(-3).GetRep(), s.GetRep());
  EXPECT_TRUE(s.Right(15).FEmpty());
  EXPECT_TRUE(s.Middle(9, 4).FEmpty());
  EXPECT_EQ(s.Middle(10, 4).GetMempool(), nullptr);
  EXPECT_EQ(s.Middle(1, 3).GetMempool(), &poolM) << "slices live in the original's pool";

  EXPECT_EQ(s.AdvancePos(2, 2), 4);
  EXPECT_EQ(s.AdvancePos(14, 1), 15);
  EXPECT_EQ(s.AdvancePos(14, 5), 15);
  EXPECT_EQ(s.AdvancePos(20, 0), 15) << "a position never exceeds NByte";
  EXPECT_EQ(s.AdvancePos(-4, 3), 3);
  EXPECT_EQ(s.AdvancePos(3, LONG_MAX), 15);
  EXPECT_EQ(s.GetCharacterPos(9), 9);
  EXPECT_EQ(s.GetCharacterPos(99), 15);
  EXPECT_EQ(s.GetCharacterPos(-1), 0);
}

TEST_F(StringTest, CopiesShareOneRepresentationAcrossThreads) {
  VekString original = VekString::FromUtf8Bytes(&poolM, 6, "shared");
  size_t oneCopy = poolM.GetUsedBytes();
  auto copier = [&] {
    for (int i = 0; i < 100000; ++i) {
      VekString copy = original;
      VekString moved = std::move(copy);
      copy = moved;
    }
  };
  std::thread a(copier), b(copier);
  a.join();
  b.join();
  EXPECT_EQ(poolM.GetUsedBytes(), oneCopy) << "copies allocate nothing";
  EXPECT_EQ(original.GetRep()->refCountM.load(), 1u);
  VekString assigned;
  assigned = original;
  EXPECT_EQ(assigned.GetRep(), original.GetRep());
  VekString& alias = assigned;
  assigned = alias;
  EXPECT_EQ(original.GetRep()->refCountM.load(), 2u);
}

TEST_F(StringTest, ArrayHoldsAtMost65535StringsAndSorts) {
  VekStringArray array(&poolM);
  VekString b = VekString::FromUtf8Bytes(&poolM, 1, "b");
  VekString ab = VekString::FromUtf8Bytes(&poolM, 2, "ab");
  VekString a = VekString::FromUtf8Bytes(&poolM, 2, "a\0");
  ASSERT_TRUE(array.Add(b) && array.Add(ab) && array.Add(a) && array.Add(VekString("a")));
  array.Sort();
  ASSERT_EQ(array.Count(), 4);
  EXPECT_EQ(array[0], "a");
  EXPECT_EQ(array.Get(1), a) << "a shorter prefix sorts first, NUL bytes compare as bytes";
  EXPECT_EQ(array[2], ab);
  EXPECT_EQ(array[3], b);
  EXPECT_TRUE(array.Remove(ab));
  EXPECT_FALSE(array.Remove(ab));
  EXPECT_TRUE(array.RemoveAt(0));
  EXPECT_FALSE(array.RemoveAt(2));
  EXPECT_FALSE(array.RemoveAt(-1));
  ASSERT_EQ(array.Count(), 2);
  EXPECT_EQ(array[0], a);
  EXPECT_EQ(array[1], b);
  array.SetDebugLockOwner(7);
  EXPECT_EQ(array.GetDebugLockOwner(), 7u);

  array.Clear();
  for (int i = 0; i < 65535; ++i) ASSERT_TRUE(array.Add(b)) << i;
  EXPECT_EQ(array.Count(), 65535);
  EXPECT_FALSE(array.Add(a)) << "the 65,536th string is refused";
  EXPECT_EQ(array.Count(), 65535);
  EXPECT_EQ(array[65534], b);
  EXPECT_EQ(b.GetRep()->refCountM.load(), 65536u);
  array.Destroy();
  EXPECT_EQ(b.GetRep()->refCountM.load(), 1u);
  EXPECT_TRUE(array.Add(a)) << "usable after Destroy";
}

}  // namespace
