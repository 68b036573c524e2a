// Varints and the sectioned output stream: exact bytes of writers and of Finish, readers at their
// boundaries. Finish against a plain length-prefix encoder on random section trees is the oracle
// of the binary stream fuzz target (its random_trees seed).
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
  const std::string untouched = "no 77 @0";
  for (const auto& row : sarntest::ReadTable("binary/varint-reads.txt", 3)) {
    EXPECT_EQ(ReadText(GoogleInt::ReadGoogleU32, row[0]), row[1]) << testing::PrintToString(row[0]);
    EXPECT_EQ(ReadText(GoogleInt::ReadGoogleU64, row[0]), row[2]) << testing::PrintToString(row[0]);
  }
  // Every proper prefix of a varint is refused with cursor and value untouched.
  const std::string tenBytes = "\xFF\xFF\xFF\xFF\xFF\xFF\xFF\xFF\xFF\x01";
  for (size_t n = 0; n < tenBytes.size(); ++n) EXPECT_EQ(ReadText(GoogleInt::ReadGoogleU64, tenBytes.substr(0, n)), untouched);
  // Zig-zag undone: even u is u / 2, odd u is ~(u >> 1).
  EXPECT_EQ(ReadText(GoogleInt::ReadGoogleS32, "\x03") + " " + ReadText(GoogleInt::ReadGoogleS64, "\x04") + " " +
                ReadText(GoogleInt::ReadGoogleS32, "\xFF\xFF\xFF\xFF\x0F"),
            "ok -2 @1 ok 2 @1 ok -2147483648 @5");
}

TEST(ProtoBufByteOutputStreamTest, FinishResolvesSectionsAndEscapes) {
  struct Case {
    const char* script;
    std::string bytes;
  } cases[] = {
      {"x", "d"},
      {"[\x01]", "\x01\x01"},
      {"[]", std::string(1, '\0')},
      {"[[x]]", "\x02\x01" "d"},
      {"\x01x\x02x", "\x01" "d\x02" "d"},  // marker codes as data before an escaped 0x64
      {"a[bc][]d", "a\x02" "bc" + std::string(1, '\0') + "d"},
      {"]ab", std::string("\0ab", 3)},    // an end without a start: an empty section at the start
      {"ab[", "ab"},                      // a start without an end is dropped
  };
  for (const Case& c : cases) EXPECT_EQ(FinishedScript(c.script), c.bytes) << c.script;
  // Lengths at the varint's byte boundaries, and sections nested a thousand deep.
  for (size_t n : {size_t{127}, size_t{128}, size_t{16383}, size_t{16384}, size_t{1} << 21}) {
    EXPECT_EQ(FinishedScript("[" + std::string(n, 'x') + "]"), sarntest::Varint(n) + std::string(n, 'd')) << n;
  }
  std::string deep = FinishedScript(std::string(1000, '[') + "x" + std::string(1000, ']'));
  ASSERT_EQ(deep.size(), 1u + 127 + 873 * 2);  // the 127 innermost lengths take one byte, the rest two
  EXPECT_EQ(deep.substr(deep.size() - 3), "\x02\x01" "d");
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
