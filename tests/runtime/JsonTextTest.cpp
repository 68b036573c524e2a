#include <string>
#include <vector>

#include "sarn/Sarn.h"
#include "testutil/TestUtil.h"

namespace {

using JsonTextTest = sarntest::PoolTest;

using sarntest::Str;

using sarntest::StringSink;
using ChunkSource = sarntest::TestSource;

// Both writers, checked to agree.
std::string ToJson(const std::string& text, bool fBareAllowed) {
  VekString value = VekString::FromUtf8Bytes(nullptr, text.size(), text.data());
  sarn::ByteBuffer buffer(nullptr);
  EXPECT_TRUE(sarn::Json::StringToJson(value, fBareAllowed, buffer));
  StringSink sink;
  EXPECT_TRUE(sarn::Json::StringToJson(value, fBareAllowed, sink));
  EXPECT_EQ(sarntest::Contents(buffer), sink.textM) << "the two sinks disagree";
  return sink.textM;
}

TEST(JsonWriteTest, QuotesByTheBareRuleAndEscapesExactly) {
  for (const auto& row : sarntest::ReadTable("json/string-writer.txt", 3)) {
    EXPECT_EQ(ToJson(row[0], row[1] == "bare"), row[2]) << row[0];
  }
}

TEST(JsonWriteTest, LongTextsAndSinkFailures) {
  std::string text;
  for (int i = 0; i < 3000; ++i) text += (i % 7 == 0) ? "\"q\"\n" : "plain text ";
  std::string expected = "\"";
  for (char c : text) expected += c == '"' ? "\\\"" : c == '\n' ? "\\n" : std::string(1, c);
  EXPECT_EQ(ToJson(text, true), expected + "\"");

  StringSink failing;
  failing.fFailM = true;
  EXPECT_FALSE(sarn::Json::StringToJson(VekString("x"), false, failing));
}

struct ReadResult {
  bool fOk;
  std::string text;
  size_t consumed;  // bytes the cursor moved
  std::string Text() const { return (fOk ? "ok [" : "no [") + text + "] " + std::to_string(consumed); }
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
  return {fOk, Str(result), static_cast<size_t>(cursor.BytesDelivered() - static_cast<uint64_t>(cursor.pEndM - cursor.pCurM))};
}

TEST_F(JsonTextTest, MemoryReaderStringsBareTokensAndFailures) {
  for (const auto& row : sarntest::ReadTable("json/string-reader.txt", 2)) {
    ReadResult r = ReadMemory(&poolM, row[0]);
    EXPECT_EQ(r.fOk ? r.Text() : "no [" + r.text + "]", row[1]) << row[0];
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

TEST_F(JsonTextTest, SourceReaderIsStricterAtTheEnd) {
  for (std::string_view bad : {std::string_view("\"abc"), std::string_view("\""), std::string_view("\"a\\"),
                               std::string_view("\"a\\\0\"", 5), std::string_view("\"a\\q\""),
                               std::string_view("\"a\0\"", 4)}) {
    sarntest::ForEachSplit(bad, [&](const std::vector<std::string_view>& chunks, const std::string& label) {
      ReadResult r = ReadSource(&poolM, chunks);
      EXPECT_TRUE(!r.fOk && r.text == "untouched") << label;
    });
  }
  EXPECT_EQ(ReadSource(&poolM, {std::string_view("ab\0cd", 5)}).Text() + " | " + ReadSource(&poolM, {}).Text(), "ok [ab] 2 | ok [] 0")
      << "a NUL ends a bare token";
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
  EXPECT_TRUE(Str(result) == fromMemory.text && result.NByte() == body.size() / 12 * 11);
  EXPECT_TRUE(cursor.BytesDelivered() == input.size() && cursor.Next() == 't');
  // Without escapes the straddling run is gathered without losing a byte either.
  std::string plain = std::string(16380, ' ') + "\"0123456789\"";
  wynbaselib::InMemoryBytestream plainSource(plain);
  sarn::InputPointerBytesource plainCursor(&plainSource);
  ASSERT_TRUE(JsonBytesourceToString(&poolM, nullptr, plainCursor, result));
  EXPECT_TRUE(Str(result) == "0123456789" && plainCursor.Peek() == 0);
}

// A cursor over memory has everything delivered at once and never reads a source; one over a
// source counts what each refill delivered and never reads an ended source again.
TEST_F(JsonTextTest, CursorsCountDeliveredBytesAndStopAtTheEnd) {
  const char text[] = " \t x";
  sarn::InputPointerBytesource memory(reinterpret_cast<const unsigned char*>(text), 4);
  EXPECT_EQ(memory.BytesDelivered(), 4u);
  memory.SkipWhitespace();
  EXPECT_EQ(std::string({memory.Peek(), memory.Next()}), "xx");
  EXPECT_TRUE(memory.Next() == 0 && !memory.Refill() && memory.BytesDelivered() == 4u);

  ChunkSource source({"ab", "cde", "", "f"});
  sarn::InputPointerBytesource cursor(&source);
  EXPECT_TRUE(cursor.BytesDelivered() == 0 && cursor.Peek() == 'a' && cursor.BytesDelivered() == 2);
  std::string seen;
  while (char c = cursor.Next()) seen += c;
  EXPECT_TRUE(seen == "abcdef" && cursor.BytesDelivered() == 6);
  int reads = source.nReadM;
  EXPECT_TRUE(cursor.Next() == 0 && !cursor.Refill());
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
    EXPECT_TRUE(cursor.StopEcho() && cursor.Next() == 'y' && sink.textM == "x" + std::string(40000, 'e'));
  }
  ChunkSource source({"abc", "def"});
  sarn::InputPointerBytesource cursor(&source);
  StringSink failing;
  failing.fFailM = true;
  cursor.StartEcho(&failing);
  for (int i = 0; i < 4; ++i) cursor.Next();
  EXPECT_TRUE(!cursor.StopEcho() && failing.textM == "abcd");
}

}  // namespace
