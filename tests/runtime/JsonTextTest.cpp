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

TEST(JsonWriteTest, QuotesByTheBareRuleAndEscapesExactly) {
  const struct {
    std::string text;
    bool fBareAllowed;
    std::string json;
  } cases[] = {
      {"abc-1", true, "abc-1"}, {"abc-1", false, "\"abc-1\""}, {"-7", true, "-7"}, {"1.5", true, "\"1.5\""},
      {"", true, "\"\""}, {"", false, "\"\""}, {"a b", true, "\"a b\""},
      {"\xC3\xA9", true, "\"\xC3\xA9\""},  // non-ASCII letters are not bare
      {std::string("ab\0c d", 6), true, "ab\\u0000c d"},  // only the bytes before the first NUL decide
      {"\\u00e9", false, "\"\\u00e9\""},  // a backslash-u passes through
      {"\\b", false, "\"\\\\b\""}, {"a\\", false, "\"a\\\\\""}, {"\\\\u", false, "\"\\\\\\u\""},
      {"\x01", false, "\"\\u0001\""}, {"\x1F", false, "\"\\u001F\""}, {std::string("\0", 1), false, "\"\\u0000\""},
      {"\x03\x1A\x7F/\xC3\xA9", false, "\"\x03\x1A\x7F/\xC3\xA9\""},
      {"\b\t\n\f\r\"x", false, "\"\\b\\t\\n\\f\\r\\\"x\""}, {"\x0B\x1B", false, "\"\\u000B\\u001B\""},
  };
  for (const auto& c : cases) EXPECT_EQ(ToJson(c.text, c.fBareAllowed), c.json) << c.text;
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
  // Each byte after a backslash: its meaning, or 'z' (left alone) when it is no escape.
  std::string meanings;
  for (int c = 0; c < 256; ++c) {
    char result = 'z';
    bool fOk = sarn::Json::EscapedCharToChar(static_cast<char>(c), result);
    EXPECT_EQ(fOk, result != 'z') << c;
    if (fOk) meanings += std::string(1, static_cast<char>(c)) + result;
  }
  EXPECT_EQ(meanings, "\"\"//\\\\b\bf\fn\nr\rt\t");
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

TEST_F(JsonTextTest, MemoryReaderStringsBareTokensAndFailures) {
  const struct {
    std::string input;
    bool fOk;
    std::string text;  // "untouched": the result is left alone on failure
    size_t consumed;   // bytes the cursor moved
  } cases[] = {
      {"  \"x\\ty\"rest", true, "x\ty", 8},  // the cursor rests after the closing quote
      {"-12.5e+3,", true, "-12.5e+3", 8},
      {"{\"a\":1}", true, "", 0},
      {" \t\r\n", true, "", 4},
      {"\f1", true, "", 0},  // form feed is not whitespace
      {"\"a\\u00e9b\"", true, "a\\u00e9b", 10},
      {"\"abc", true, "abc", 4},  // the end of the range closes the string
      {"\"\\/\\\\\\\"\\b\\f\\n\\r\\t|\"", true, "/\\\"\b\f\n\r\t|", 19},
      {"\"\"x", true, "", 2},
      {"\"a\\q\"", false, "untouched", 0},
      {"\"a\\", false, "untouched", 0},
      {std::string("\"a\0b\"", 5), false, "untouched", 0},
      {std::string("\"\0\"", 3), false, "untouched", 0},
      {"\"x\\n\\x\"", false, "untouched", 0},
  };
  for (const auto& c : cases) {
    ReadResult r = ReadMemory(&poolM, c.input);
    EXPECT_EQ(r.fOk, c.fOk) << c.input;
    EXPECT_EQ(r.text, c.text) << c.input;
    EXPECT_TRUE(!c.fOk || r.consumed == c.consumed) << c.input << " consumed " << r.consumed;
  }
}

TEST_F(JsonTextTest, MemoryReaderInterns) {
  VekHashStringToStringNew table(&poolM);
  VekString stored = VekString::FromUtf8Bytes(&poolM, 4, "name");
  table.Put(stored, stored);
  table.Put(VekString::FromUtf8Bytes(&poolM, 5, "empty"), VekString());
  // Quoted and bare tokens whose text is stored come back as the stored instance; an empty
  // stored value is not used.
  const std::pair<std::string, std::string> cases[] = {
      {"\"name\"", "stored"}, {"name", "stored"}, {"na\\me", "na"}, {"\"n\\u0061me\"", "n\\u0061me"},
      {"\"na\\/me\"", "na/me"}, {"\"nam\\u0065\"", "nam\\u0065"}, {"empty", "empty"}};
  for (const auto& [input, expected] : cases) {
    VekString out;
    ReadMemory(&poolM, input, &table, &out);
    EXPECT_EQ(out.GetRep() == stored.GetRep() ? "stored" : Str(out), expected) << input;
  }
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
