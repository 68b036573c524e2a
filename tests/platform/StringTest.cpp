// Strings: construction, byte-exact equality with embedded NUL bytes, byte-position
// operations over UTF-8 text, sharing across copies and threads; the string array's limit.
#include <climits>
#include <string>
#include <thread>

#include "testutil/TestUtil.h"

namespace {

using StringTest = sarntest::PoolTest;
using sarntest::Str;

TEST_F(StringTest, EmptyFormsHoldNoRepresentation) {
  for (const VekString& s : {VekString(), VekString(""), VekString(static_cast<const char*>(nullptr)),
                             VekString::FromUtf8Bytes(&poolM, 0, "x")}) {
    EXPECT_TRUE(s.FEmpty() && s.NByte() == 0 && std::string(s.Utf8()).empty() && s.GetRep() == nullptr && s == "" &&
                s.FEqual(nullptr));
  }
  EXPECT_EQ(poolM.GetUsedBytes(), 0u);
}

TEST_F(StringTest, EmbeddedNulBytesAreKeptAndCompared) {
  VekString a = VekString::FromUtf8Bytes(&poolM, 5, "ab\0cd");
  EXPECT_EQ(Str(a), std::string("ab\0cd", 5));
  EXPECT_EQ(a.Utf8()[5], '\0') << "always NUL-terminated";
  EXPECT_EQ(a.GetMempool(), &poolM);
  EXPECT_NE(a, VekString::FromUtf8Bytes(&poolM, 5, "ab\0ce")) << "bytes after the NUL count";
  EXPECT_FALSE(a == "ab") << "a C string stops at its NUL, the VekString does not";
  EXPECT_EQ(a, VekString::FromUtf8Bytes(&poolM, 5, "ab\0cd"));
  EXPECT_EQ(a.FindString(VekString::FromUtf8Bytes(&poolM, 2, "\0c")), 2);
  EXPECT_EQ(Str(a.Right(2)), std::string("\0cd", 3));
}

TEST_F(StringTest, FormatWritesShortAndLongTextsIntoThePool) {
  VekString s = VekString::Format(&poolM, "%s=%d;%05.1f", "k", -42, 3.14159);
  EXPECT_EQ(Str(s), "k=-42;003.1");
  EXPECT_EQ(poolM.GetUsedBytes(), sizeof(VekStringRepN) + s.NByte() + 1);
  std::string longText(1000, 'z');
  EXPECT_EQ(Str(VekString::Format(&poolM, "<%s>", longText.c_str())), "<" + longText + ">");
  EXPECT_TRUE(VekString::Format(&poolM, "%s", "").FEmpty());
}

TEST_F(StringTest, BytePositionsOverUtf8Text) {
  // "grüße, wörld": ü, ß and ö are two bytes each.
  VekString s = VekString::FromUtf8Bytes(&poolM, 15, "gr\xc3\xbc\xc3\x9f" "e, w\xc3\xb6rld");
  ASSERT_EQ(s.NByte(), 15u);
  // Search from a byte position; a match may end at the last byte; an empty needle is found at
  // the end too; a negative start searches from 0.
  const struct {
    const char* needle;
    long start;
    long at;
  } finds[] = {{"w\xc3\xb6", 0, 9}, {"\xc3", 0, 2}, {"\xc3", 3, 4}, {"\xc3", 7, 10}, {"\xc3", 10, 10}, {"\xc3", 11, -1},
               {"rld", 0, 12}, {"rldx", 0, -1}, {"", 0, 0}, {"", 15, 15}, {"", 16, -1}, {"g", -5, 0}, {nullptr, 0, 0}};
  for (const auto& f : finds) EXPECT_EQ(s.FindString(f.needle, f.start), f.at) << (f.needle ? f.needle : "null") << f.start;
  EXPECT_TRUE(VekString().FindString("a") == -1 && VekString().FindString("") == 0);

  // Positions are bytes, not characters; out-of-range positions clamp; a reversed range is empty.
  EXPECT_EQ(Str(s.Left(4)) + "|" + Str(s.Right(9)) + "|" + Str(s.Middle(2, 6)) + "|" + Str(s.Middle(3, 5)) + "|" +
                Str(s.Left(-1)) + "|" + Str(s.Right(15)) + "|" + Str(s.Middle(9, 4)),
            "gr\xc3\xbc|w\xc3\xb6rld|\xc3\xbc\xc3\x9f|\xbc\xc3|||");
  EXPECT_EQ(s.Left(99).GetRep(), s.GetRep()) << "the whole text is shared, not copied";
  EXPECT_EQ(s.Right(-3).GetRep(), s.GetRep());
  EXPECT_EQ(s.Middle(10, 4).GetMempool(), nullptr);
  EXPECT_EQ(s.Middle(1, 3).GetMempool(), &poolM) << "slices live in the original's pool";

  // A position never exceeds NByte.
  EXPECT_EQ(std::vector<long>({s.AdvancePos(2, 2), s.AdvancePos(14, 1), s.AdvancePos(14, 5), s.AdvancePos(20, 0),
                               s.AdvancePos(-4, 3), s.AdvancePos(3, LONG_MAX), s.GetCharacterPos(9),
                               s.GetCharacterPos(99), s.GetCharacterPos(-1)}),
            std::vector<long>({4, 15, 15, 15, 3, 15, 9, 15, 0}));
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
  VekString b = VekString::FromUtf8Bytes(&poolM, 1, "b"), ab = VekString::FromUtf8Bytes(&poolM, 2, "ab"),
            a = VekString::FromUtf8Bytes(&poolM, 2, "a\0");
  auto joined = [&array] {
    std::string text;
    for (int i = 0; i < array.Count(); ++i) text += Str(array[i]) + "|";
    return text;
  };
  ASSERT_TRUE(array.Add(b) && array.Add(ab) && array.Add(a) && array.Add(VekString("a")));
  array.Sort();
  EXPECT_EQ(joined(), std::string("a|a\0|ab|b|", 10)) << "a shorter prefix sorts first, NUL bytes compare as bytes";
  EXPECT_EQ(array.Get(1).GetRep(), a.GetRep());
  EXPECT_EQ(std::vector<bool>({array.Remove(ab), array.Remove(ab), array.RemoveAt(0), array.RemoveAt(2), array.RemoveAt(-1)}),
            std::vector<bool>({true, false, true, false, false}));
  EXPECT_EQ(joined(), std::string("a\0|b|", 5));
  array.SetDebugLockOwner(7);
  EXPECT_EQ(array.GetDebugLockOwner(), 7u);

  array.Clear();
  for (int i = 0; i < 65535; ++i) ASSERT_TRUE(array.Add(b)) << i;
  EXPECT_FALSE(array.Add(a)) << "the 65,536th string is refused";
  EXPECT_TRUE(array.Count() == 65535 && array[65534] == b);
  EXPECT_EQ(b.GetRep()->refCountM.load(), 65536u);
  array.Destroy();
  EXPECT_EQ(b.GetRep()->refCountM.load(), 1u);
  EXPECT_TRUE(array.Add(a)) << "usable after Destroy";
}

}  // namespace
