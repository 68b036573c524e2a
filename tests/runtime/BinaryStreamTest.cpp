// Varints and the sectioned output stream: exact bytes of writers and of Finish, readers at their
// boundaries. Finish against a plain length-prefix encoder on section trees is the oracle of the
// binary stream fuzz target (its seeds).
#include <gtest/gtest.h>

#include <functional>
#include <string>

#include "sarn/Sarn.h"
#include "testutil/TestUtil.h"

using sarn::GoogleInt;
using sarn::ProtoBufByteOutputStream;
using sarntest::Finished;

namespace {

std::string Written(const std::function<void(ProtoBufByteOutputStream*)>& write) {
  ProtoBufByteOutputStream stream;
  write(&stream);
  return Finished(stream);
}

// "[" opens a section, "]" closes it, "x" writes the byte 0x64, any other character itself.
std::string FinishedScript(const std::string& script) {
  ProtoBufByteOutputStream stream;
  for (char c : script) {
    if (c == '[') stream.StartSection();
    else if (c == ']') stream.EndSection();
    else stream.WriteByte(c == 'x' ? 0x64 : static_cast<unsigned char>(c));
  }
  return Finished(stream);
}

}  // namespace

TEST(GoogleIntTest, WritersGiveExactBytes) {
  for (const auto& row : sarntest::ReadTable("binary/varints.txt", 3)) {
    const std::string& kind = row[0];
    const long long s = kind[0] == 's' ? std::stoll(row[1]) : 0;
    const unsigned long long u = kind[0] == 'u' ? std::stoull(row[1]) : 0;
    EXPECT_EQ(Written([&](ProtoBufByteOutputStream* out) {
                if (kind == "u32") return GoogleInt::WriteGoogleU32(static_cast<uint32_t>(u), out);
                if (kind == "u64") return GoogleInt::WriteGoogleU64(u, out);
                if (kind == "s32") return GoogleInt::WriteGoogleS32(static_cast<int32_t>(s), out);
                return GoogleInt::WriteGoogleS64(s, out);
              }),
              row[2])
        << kind << " " << row[1];
  }
}

// "ok value @bytes consumed", or "no" and what value and cursor were left at, for one reader.
template <typename T>
std::string ReadText(bool (*read)(const unsigned char**, const unsigned char*, T*), const std::string& bytes) {
  const unsigned char* start = reinterpret_cast<const unsigned char*>(bytes.data());
  const unsigned char* cursor = start;
  T value = 77;
  bool isOk = read(&cursor, start + bytes.size(), &value);
  return (isOk ? "ok " : "no ") + std::to_string(value) + " @" + std::to_string(cursor - start);
}

TEST(GoogleIntTest, ReadersStopAtTheirLimitsAndLeaveFailuresUntouched) {
  for (const auto& row : sarntest::ReadTable("binary/varint-reads.txt", 3)) {
    EXPECT_EQ(ReadText(GoogleInt::ReadGoogleU32, row[0]), row[1]) << testing::PrintToString(row[0]);
    EXPECT_EQ(ReadText(GoogleInt::ReadGoogleU64, row[0]), row[2]) << testing::PrintToString(row[0]);
  }
  // Zig-zag undone: even u is u / 2, odd u is ~(u >> 1).
  EXPECT_EQ(ReadText(GoogleInt::ReadGoogleS32, "\x03") + " " + ReadText(GoogleInt::ReadGoogleS64, "\x04") + " " +
                ReadText(GoogleInt::ReadGoogleS32, "\xFF\xFF\xFF\xFF\x0F"),
            "ok -2 @1 ok 2 @1 ok -2147483648 @5");
}

// Balanced section trees (escapes, empty, nested and sibling sections, lengths at the varint's byte
// boundaries, nesting a thousand deep) are the binary stream fuzz target's seeds; here what that
// target cannot say: unbalanced scripts and a four-byte length.
TEST(ProtoBufByteOutputStreamTest, FinishResolvesUnbalancedSectionsAndLongLengths) {
  EXPECT_EQ(FinishedScript("]ab"), std::string("\0ab", 3));  // an end without a start: an empty section at the start
  EXPECT_EQ(FinishedScript("ab["), "ab");                    // a start without an end is dropped
  const size_t n = size_t{1} << 21;
  EXPECT_EQ(FinishedScript("[" + std::string(n, 'x') + "]"), sarntest::Varint(n) + std::string(n, 'd'));
  EXPECT_EQ(Written([](ProtoBufByteOutputStream* s) { s->WriteString(VekString("hi")); }), "\x02hi");
}

// A section of 2^28 bytes needs a five-byte length, one byte more than its markers free, so Finish
// inserts into the buffer: inside a second section, whose length must count that insertion too.
TEST(ProtoBufByteOutputStreamTest, LengthsThatDoNotFitAreInserted) {
#if defined(__SANITIZE_ADDRESS__)
  GTEST_SKIP() << "a quarter gigabyte through the instrumented byte loop";
#endif
  const size_t n = size_t{1} << 28;
  ProtoBufByteOutputStream stream;
  stream.WriteByte('a');
  stream.StartSection();
  stream.StartSection();
  for (size_t i = 0; i < n; ++i) stream.WriteByte(static_cast<unsigned char>(i % 251 == 0 ? 0x64 : 'z'));
  stream.EndSection();
  stream.EndSection();
  stream.WriteByte('b');
  const unsigned char* data;
  unsigned long length;
  stream.Finish(data, length);
  ASSERT_FALSE(stream.IsOutOfMemory());
  ASSERT_EQ(length, 1 + 5 + 5 + n + 1);
  EXPECT_EQ(std::string(reinterpret_cast<const char*>(data), 11), "a\x85\x80\x80\x80\x01\x80\x80\x80\x80\x01");
  EXPECT_EQ(std::string({static_cast<char>(data[11]), static_cast<char>(data[12]), static_cast<char>(data[11 + 251]),
                         static_cast<char>(data[length - 1])}),
            "dzdb");
}
