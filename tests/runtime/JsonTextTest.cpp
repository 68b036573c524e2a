#include <string>
#include <vector>

#include "sarn/Sarn.h"
#include "testutil/TestUtil.h"

namespace {

using JsonTextTest = sarntest::PoolTest;

using sarntest::Str;

// A source that delivers the given chunks, one per Read (a chunk larger than the request is
// handed out in pieces).
class ChunkSource : public wynbaselib::Bytesource {
 public:
  explicit ChunkSource(std::vector<std::string_view> chunks) : chunksM(std::move(chunks)) {}
  size_t Read(void* buffer, size_t size) override {
    ++nReadM;
    while (indexM < chunksM.size() && chunksM[indexM].empty()) ++indexM;
    if (indexM == chunksM.size()) return 0;
    std::string_view& chunk = chunksM[indexM];
    size_t n = std::min(size, chunk.size());
    std::memcpy(buffer, chunk.data(), n);
    chunk.remove_prefix(n);
    return n;
  }
  Bytesource* Duplicate() override { return nullptr; }
  int nReadM = 0;

 private:
  std::vector<std::string_view> chunksM;
  size_t indexM = 0;
};

class StringSink : public wynbaselib::Bytesink {
 public:
  bool Write(const char* data, size_t size) override {
    textM.append(data, size);
    ++nWriteM;
    return !fFailM;
  }
  bool Flush() override { return true; }
  std::string textM;
  int nWriteM = 0;
  bool fFailM = false;
};

// Both writers, checked to agree.
std::string ToJson(const std::string& text, bool fBareAllowed) {
  VekString value = VekString::FromUtf8Bytes(nullptr, text.size(), text.data());
  sarn::ByteBuffer buffer(nullptr);
  EXPECT_TRUE(sarn::Json::StringToJson(value, fBareAllowed, buffer));
  StringSink sink;
  EXPECT_TRUE(sarn::Json::StringToJson(value, fBareAllowed, sink));
  std::string fromBuffer(reinterpret_cast<const char*>(buffer.GetData()), buffer.GetLength());
  EXPECT_EQ(fromBuffer, sink.textM) << "the two sinks disagree";
  return fromBuffer;
}

TEST(JsonWriteTest, QuotingFollowsTheBareRule) {
  EXPECT_EQ(ToJson("abc-1", true), "abc-1");
  EXPECT_EQ(ToJson("abc-1", false), "\"abc-1\"");
  EXPECT_EQ(ToJson("-7", true), "-7");
  EXPECT_EQ(ToJson("1.5", true), "\"1.5\"");
  EXPECT_EQ(ToJson("", true), "\"\"");
  EXPECT_EQ(ToJson("", false), "\"\"");
  EXPECT_EQ(ToJson("a b", true), "\"a b\"");
  EXPECT_EQ(ToJson("\xC3\xA9", true), "\"\xC3\xA9\"") << "non-ASCII letters are not bare";
  // Only the bytes before the first NUL decide; every byte is still written.
  EXPECT_EQ(ToJson(std::string("ab\0c d", 6), true), "ab\\u0000c d");
}

TEST(JsonWriteTest, EscapesExactly) {
  EXPECT_EQ(ToJson("\\u00e9", false), "\"\\u00e9\"") << "a backslash-u passes through";
  EXPECT_EQ(ToJson("\\b", false), "\"\\\\b\"");
  EXPECT_EQ(ToJson("a\\", false), "\"a\\\\\"") << "a final backslash is doubled";
  EXPECT_EQ(ToJson("\\\\u", false), "\"\\\\\\u\"");
  EXPECT_EQ(ToJson("\x01", false), "\"\\u0001\"");
  EXPECT_EQ(ToJson("\x1F", false), "\"\\u001F\"");
  EXPECT_EQ(ToJson(std::string("\0", 1), false), "\"\\u0000\"");
  EXPECT_EQ(ToJson("\x03\x1A\x7F/\xC3\xA9", false), "\"\x03\x1A\x7F/\xC3\xA9\"");
  EXPECT_EQ(ToJson("\b\t\n\f\r\"x", false), "\"\\b\\t\\n\\f\\r\\\"x\"");
  EXPECT_EQ(ToJson("\x0B\x1B", false), "\"\\u000B\\u001B\"");
}

TEST(JsonWriteTest, LongTextsAndSinkFailures) {
  std::string text;
  for (int i = 0; i < 3000; ++i) text += (i % 7 == 0) ? "\"q\"\n" : "plain text ";
  std::string expected = "\"";
  for (char c : text) {
    if (c == '"') expected += "\\\"";
    else if (c == '\n') expected += "\\n";
    else expected += c;
  }
  expected += "\"";
  EXPECT_EQ(ToJson(text, true), expected);

  StringSink failing;
  failing.fFailM = true;
  EXPECT_FALSE(sarn::Json::StringToJson(VekString("x"), false, failing));
}

TEST(JsonWriteTest, EscapedCharToChar) {
  const char* letters = "\"/\\bfnrt";
  const char meanings[] = {'"', '/', '\\', '\b', '\f', '\n', '\r', '\t'};
  for (int i = 0; i < 8; ++i) {
    char result = 0;
    EXPECT_TRUE(sarn::Json::EscapedCharToChar(letters[i], result));
    EXPECT_EQ(result, meanings[i]);
  }
  for (int c = 0; c < 256; ++c) {
    char result = 'z';
    if (std::strchr(letters, c) != nullptr && c != 0) continue;
    EXPECT_FALSE(sarn::Json::EscapedCharToChar(static_cast<char>(c), result)) << c;
    EXPECT_EQ(result, 'z');
  }
}

struct ReadResult {
  bool fOk;
  std::string text;
  size_t consumed;  // bytes the cursor moved
};

ReadResult ReadMemory(VekMempool* pool, std::string_view input, VekHashStringToStringNew* intern = nullptr,
                      VekString* out = nullptr) {
  sarn::InputPointer cursor(reinterpret_cast<const unsigned char*>(input.data()), input.size());
  const unsigned char* start = cursor.pCurM;
  VekString result("untouched");
  bool fOk = sarn::Json::JsonToString(pool, intern, cursor, result);
  EXPECT_LE(cursor.pCurM, cursor.pEndM);
  if (out != nullptr) *out = result;
  return {fOk, Str(result), static_cast<size_t>(cursor.pCurM - start)};
}

ReadResult ReadSource(VekMempool* pool, const std::vector<std::string_view>& chunks) {
  ChunkSource source(chunks);
  sarn::InputPointerBytesource cursor(&source);
  VekString result("untouched");
  bool fOk = JsonBytesourceToString(pool, nullptr, cursor, result);
  size_t consumed = static_cast<size_t>(cursor.BytesDelivered() - static_cast<uint64_t>(cursor.pEndM - cursor.pCurM));
  return {fOk, Str(result), consumed};
}

TEST_F(JsonTextTest, MemoryReaderStringsAndBareTokens) {
  ReadResult r = ReadMemory(&poolM, "  \"x\\ty\"rest");
  EXPECT_TRUE(r.fOk);
  EXPECT_EQ(r.text, "x\ty");
  EXPECT_EQ(r.consumed, 8u) << "the cursor rests after the closing quote";

  r = ReadMemory(&poolM, "-12.5e+3,");
  EXPECT_EQ(r.text, "-12.5e+3");
  EXPECT_EQ(r.consumed, 8u);

  r = ReadMemory(&poolM, "{\"a\":1}");
  EXPECT_TRUE(r.fOk);
  EXPECT_EQ(r.text, "");
  EXPECT_EQ(r.consumed, 0u);

  r = ReadMemory(&poolM, " \t\r\n");
  EXPECT_TRUE(r.fOk);
  EXPECT_EQ(r.text, "");
  EXPECT_EQ(r.consumed, 4u);

  r = ReadMemory(&poolM, "\f1");
  EXPECT_EQ(r.text, "") << "form feed is not whitespace";
  EXPECT_EQ(r.consumed, 0u);

  r = ReadMemory(&poolM, "\"a\\u00e9b\"");
  EXPECT_EQ(r.text, "a\\u00e9b");

  r = ReadMemory(&poolM, "\"abc");
  EXPECT_TRUE(r.fOk) << "the end of the range closes the string";
  EXPECT_EQ(r.text, "abc");
  EXPECT_EQ(r.consumed, 4u);

  r = ReadMemory(&poolM, "\"\\/\\\\\\\"\\b\\f\\n\\r\\t|\"");
  EXPECT_EQ(r.text, "/\\\"\b\f\n\r\t|");

  r = ReadMemory(&poolM, "\"\"x");
  EXPECT_TRUE(r.fOk);
  EXPECT_EQ(r.text, "");
  EXPECT_EQ(r.consumed, 2u);
}

TEST_F(JsonTextTest, MemoryReaderFailures) {
  for (std::string_view bad : {std::string_view("\"a\\q\""), std::string_view("\"a\\"),
                               std::string_view("\"a\0b\"", 5), std::string_view("\"\0\"", 3),
                               std::string_view("\"x\\n\\x\"")}) {
    ReadResult r = ReadMemory(&poolM, bad);
    EXPECT_FALSE(r.fOk) << bad;
    EXPECT_EQ(r.text, "untouched") << "the result is left alone on failure";
  }
}

TEST_F(JsonTextTest, MemoryReaderInterns) {
  VekHashStringToStringNew table(&poolM);
  VekString stored = VekString::FromUtf8Bytes(&poolM, 4, "name");
  table.Put(stored, stored);
  table.Put(VekString::FromUtf8Bytes(&poolM, 5, "empty"), VekString());
  VekString out;
  ReadMemory(&poolM, "\"name\"", &table, &out);
  EXPECT_EQ(out.GetRep(), stored.GetRep()) << "the stored instance is returned";
  ReadMemory(&poolM, "na\\me", &table, &out);
  EXPECT_EQ(Str(out), "na");
  ReadMemory(&poolM, "\"n\\u0061me\"", &table, &out);
  EXPECT_NE(out.GetRep(), stored.GetRep());
  ReadMemory(&poolM, "\"na\\/me\"", &table, &out);
  EXPECT_EQ(Str(out), "na/me");
  ReadMemory(&poolM, "\"nam\\u0065\"", &table, &out);
  EXPECT_EQ(Str(out), "nam\\u0065");
  ReadMemory(&poolM, "empty", &table, &out);
  EXPECT_EQ(Str(out), "empty") << "an empty stored value is not used";
  ReadMemory(&poolM, "name", &table, &out);
  EXPECT_EQ(out.GetRep(), stored.GetRep()) << "bare tokens are interned too";
  EXPECT_EQ(table.Count(), 2u);
}

TEST_F(JsonTextTest, SourceReaderAgreesWithMemoryOnClosedStringsAtEverySplit) {
  const std::vector<std::string> inputs = {
      "  \"x\\ty\" ,", "-12.5e+3,", "{", "\"a\\u00e9b\"", "\"\\/\\\\\\\"\\b\\f\\n\\r\\t|\"", "tok", "\"\"",
      "\"esc at end\\n\"", "\t\"\xC3\xA9\"\n", "\"\\u\"",
  };
  for (const std::string& input : inputs) {
    ReadResult expected = ReadMemory(&poolM, input);
    sarntest::ForEachSplit(input, [&](const std::vector<std::string_view>& chunks, const std::string& label) {
      ReadResult r = ReadSource(&poolM, chunks);
      EXPECT_EQ(r.fOk, expected.fOk) << input << " " << label;
      EXPECT_EQ(r.text, expected.text) << input << " " << label;
      EXPECT_EQ(r.consumed, expected.consumed) << input << " " << label;
    });
  }
}

TEST_F(JsonTextTest, SourceReaderIsStricterAtTheEnd) {
  for (std::string_view bad : {std::string_view("\"abc"), std::string_view("\""), std::string_view("\"a\\"),
                               std::string_view("\"a\\\0\"", 5), std::string_view("\"a\\q\""),
                               std::string_view("\"a\0\"", 4)}) {
    sarntest::ForEachSplit(bad, [&](const std::vector<std::string_view>& chunks, const std::string& label) {
      ReadResult r = ReadSource(&poolM, chunks);
      EXPECT_FALSE(r.fOk) << label;
      EXPECT_EQ(r.text, "untouched");
    });
  }
  ReadResult r = ReadSource(&poolM, {std::string_view("ab\0cd", 5)});
  EXPECT_TRUE(r.fOk);
  EXPECT_EQ(r.text, "ab") << "a NUL ends a bare token";
  r = ReadSource(&poolM, {});
  EXPECT_TRUE(r.fOk);
  EXPECT_EQ(r.text, "");
}

TEST_F(JsonTextTest, QuotedStringStraddlesTheBlockBoundary) {
  // The first block ends right after a backslash, so the escape is cut in two as well.
  std::string body;
  while (body.size() < 16384 + 200) body += "abcdefghij\\n";
  std::string input = std::string(16372, ' ') + "\"" + body + "\"tail";
  ASSERT_EQ(input[16383], '\\');
  ReadResult fromMemory = ReadMemory(&poolM, input);
  ASSERT_TRUE(fromMemory.fOk);
  wynbaselib::InMemoryBytestream source(input);
  sarn::InputPointerBytesource cursor(&source);
  VekString result;
  ASSERT_TRUE(JsonBytesourceToString(&poolM, nullptr, cursor, result));
  EXPECT_EQ(Str(result), fromMemory.text);
  EXPECT_EQ(result.NByte(), body.size() / 12 * 11);
  EXPECT_EQ(cursor.BytesDelivered(), input.size());
  EXPECT_EQ(cursor.Next(), 't');
  // Without escapes the straddling run is gathered without losing a byte either.
  std::string plain = std::string(16380, ' ') + "\"0123456789\"";
  wynbaselib::InMemoryBytestream plainSource(plain);
  sarn::InputPointerBytesource plainCursor(&plainSource);
  ASSERT_TRUE(JsonBytesourceToString(&poolM, nullptr, plainCursor, result));
  EXPECT_EQ(Str(result), "0123456789");
  EXPECT_EQ(plainCursor.Peek(), 0);
}

TEST_F(JsonTextTest, CursorOverMemoryNeverReadsItsSource) {
  const char text[] = " \t x";
  sarn::InputPointerBytesource cursor(reinterpret_cast<const unsigned char*>(text), 4);
  EXPECT_EQ(cursor.BytesDelivered(), 4u);
  cursor.SkipWhitespace();
  EXPECT_EQ(cursor.Peek(), 'x');
  EXPECT_EQ(cursor.Next(), 'x');
  EXPECT_EQ(cursor.Next(), 0);
  EXPECT_FALSE(cursor.Refill());
  EXPECT_EQ(cursor.BytesDelivered(), 4u);
}

TEST_F(JsonTextTest, RefillCountsDeliveredBytesAndStopsAtTheEnd) {
  ChunkSource source({"ab", "cde", "", "f"});
  sarn::InputPointerBytesource cursor(&source);
  EXPECT_EQ(cursor.BytesDelivered(), 0u);
  EXPECT_EQ(cursor.Peek(), 'a');
  EXPECT_EQ(cursor.BytesDelivered(), 2u);
  std::string seen;
  while (char c = cursor.Next()) seen += c;
  EXPECT_EQ(seen, "abcdef");
  EXPECT_EQ(cursor.BytesDelivered(), 6u);
  int reads = source.nReadM;
  EXPECT_EQ(cursor.Next(), 0);
  EXPECT_FALSE(cursor.Refill());
  EXPECT_EQ(source.nReadM, reads) << "an ended source is not read again";
}

TEST_F(JsonTextTest, EchoCopiesExactlyTheConsumedBytesAcrossBlocks) {
  std::string input = "xx" + std::string(40000, 'e') + "yy";
  for (std::vector<std::string_view> chunks :
       {std::vector<std::string_view>{input}, sarntest::FixedChunks(input, 7), sarntest::FixedChunks(input, 16384)}) {
    ChunkSource source(chunks);
    sarn::InputPointerBytesource cursor(&source);
    StringSink sink;
    cursor.Next();
    cursor.StartEcho(&sink);
    cursor.Next();
    while (cursor.Peek() == 'e') cursor.Next();
    EXPECT_TRUE(cursor.StopEcho());
    EXPECT_EQ(cursor.Next(), 'y');
    EXPECT_EQ(sink.textM, "x" + std::string(40000, 'e'));
  }
  ChunkSource source({"abc", "def"});
  sarn::InputPointerBytesource cursor(&source);
  StringSink failing;
  failing.fFailM = true;
  cursor.StartEcho(&failing);
  for (int i = 0; i < 4; ++i) cursor.Next();
  EXPECT_FALSE(cursor.StopEcho());
  EXPECT_EQ(failing.textM, "abcd");
}

}  // namespace
