// The hand-written reader: accepted shapes, every message with its inside-out joining, the
// member entry points, the depth limit and the golden forms.
#include <functional>
#include <string>
#include <vector>

#include "runtime/DictTestSupport.h"

namespace {

using namespace dicttest;
using DictionaryJsonReaderTest = sarntest::PoolTest;

// Accepted shapes and refusals with their messages joined from the inside out, kept as a table.
TEST_F(DictionaryJsonReaderTest, AcceptsTolerantShapesAndRefusesWithMessages) {
  for (const auto& row : sarntest::ReadTable("dicts/hand-reader.txt", 2)) {
    std::string error = "stale";
    ref<Dictionary> tree = Read(&poolM, row[0], &error);
    EXPECT_EQ(tree ? Compact(tree) + error : error, row[1]) << row[0];  // no message on success
  }
  ref<Dictionary> tree = Read(&poolM, "{a:true, q:\"x\", u:\"\\u0041\"}");
  ASSERT_TRUE(tree);
  EXPECT_TRUE(!static_cast<StringValue*>(tree->Get(VekString("a")).Get())->needQuotesM &&
              static_cast<StringValue*>(tree->Get(VekString("q")).Get())->needQuotesM);
  EXPECT_EQ(Str(tree->GetString(VekString("u"))), "\\u0041") << "backslash-u stays as written";
}

// The member entry points read one piece and append their words to what the inner step said.
TEST_F(DictionaryJsonReaderTest, MemberEntryPointsReadOnePiece) {
  auto cursor = [](const std::string& text) { return InputPointer(reinterpret_cast<const unsigned char*>(text.data()), text.size()); };
  std::string text = " [1, {\"k\": x}] rest";
  InputPointer input = cursor(text);
  ref<Dictionary> d = new (&poolM) Dictionary();
  VekString error;
  EXPECT_TRUE(d->ReadFieldValue(input, VekString("arr"), error));
  EXPECT_EQ(std::string(reinterpret_cast<const char*>(input.pCurM), input.pEndM - input.pCurM), " rest");
  EXPECT_TRUE(d->ReadFieldValue(input, VekString("word"), error)) << Str(error);
  EXPECT_EQ(Compact(d), R"({"arr": [1, {"k": x}], "word": rest})");

  const std::string bad = " }";
  ref<ArrayValue> array = new (&poolM) ArrayValue();
  const std::pair<std::function<bool(InputPointer&)>, const char*> failures[] = {
      {[&](InputPointer& in) { return d->ReadFieldValue(in, VekString("z"), error); }, "Empty scalar value for Object field z"},
      {[&](InputPointer& in) { return array->ReadFieldValue(in, error); }, "Empty scalar value for Array element."},
      {[&](InputPointer& in) { return array->FromJson(in, error); }, "Array must start with '['."},
      {[&](InputPointer& in) { return d->FromJson(in, error); }, "JSON object does not start with '{'."},
  };
  for (const auto& [read, message] : failures) {
    InputPointer in = cursor(bad);
    error = VekString();
    EXPECT_FALSE(read(in));
    EXPECT_EQ(Str(error), message);
  }
  std::string list = "[\"a\", [true]] tail";
  InputPointer listInput = cursor(list);
  EXPECT_TRUE(array->FromJson(listInput, error) && Compact(array) == R"(["a", [true]])");
}

TEST_F(DictionaryJsonReaderTest, BoundsTheNestingDepth) {
  int limit = JsonLimits::kDefaultMaxDepth;
  ASSERT_GE(limit, 512);
  std::string atLimit = Nested(limit);
  std::string error;
  // Reading, writing, comparing and releasing a tree at the limit fit in a 256 KiB stack.
  RunOnStack(256 * 1024, [&] {
    ref<Dictionary> tree = Read(&poolM, atLimit, &error);
    ASSERT_TRUE(tree) << error;
    std::string text = Compact(tree);
    EXPECT_EQ(text.size(), atLimit.size() + (limit / 2) * 1);  // a space after each colon
    ref<Dictionary> again = Read(&poolM, text);
    EXPECT_TRUE(again && tree->Equals(again) && Pretty(tree).size() > text.size());
  });
  // Objects only, the costlier frames of the writer.
  std::string objects;
  for (int level = 1; level < limit; ++level) objects += "{\"k\":";
  objects += "{}" + std::string(limit - 1, '}');
  RunOnStack(256 * 1024, [&] {
    ref<Dictionary> tree = Read(&poolM, objects, &error);
    ASSERT_TRUE(tree) << error;
    EXPECT_TRUE(tree->Equals(Read(&poolM, Pretty(tree))));
    EXPECT_TRUE(tree->Equals(Parse(&poolM, Compact(tree))));
  });
  EXPECT_FALSE(Read(&poolM, Nested(limit + 1), &error));
  // Each enclosing array and object adds its words to the inner failure, out to the top.
  std::string expected = "JSON nesting exceeds the depth limit of 512 levels.";
  for (int level = 0; level < limit / 2; ++level) {
    expected += " Failed to parse an array element. Failed to parse value for key k";
  }
  EXPECT_EQ(error, expected);

  // A limit of our own, with the exact joined text.
  JsonLimits three(3);
  EXPECT_TRUE(Read(&poolM, "{a:[{}], b:{c:[]}}", &error, three) && !Read(&poolM, "{a:[1, {b:[]}]}", &error, three));
  EXPECT_EQ(error, "JSON nesting exceeds the depth limit of 3 levels. Failed to parse value for key b "
                   "Failed to parse an array member. Failed to parse value for key a");
  EXPECT_EQ(ReaderVerdict(Read(&poolM, "{}", &error, JsonLimits(0)), error), "JSON nesting exceeds the depth limit of 0 levels.");

  // Deep input far past the limit is refused without descending into it.
  EXPECT_FALSE(Read(&poolM, std::string(1, '{') + "a:" + std::string(1000000, '['), &error));
}

// A small document with its exact compact and pretty forms, kept as files.
TEST_F(DictionaryJsonReaderTest, MatchesGoldenForms) {
  std::string dir = std::string(std::getenv("SARN_SOURCE_DIR") ? std::getenv("SARN_SOURCE_DIR") : ".") +
                    "/tests/data/dicts/";
  std::string input, compact, pretty;
  ASSERT_TRUE(sarntest::ReadFile(dir + "sample.json", input) && sarntest::ReadFile(dir + "sample.compact.json", compact) &&
              sarntest::ReadFile(dir + "sample.pretty.json", pretty));
  std::string error;
  ref<Dictionary> tree = Read(&poolM, input, &error);
  ASSERT_TRUE(tree) << error;
  EXPECT_EQ(Compact(tree) + "\n", compact);
  EXPECT_EQ(Pretty(tree) + "\n", pretty);
  ref<Dictionary> streamed = Parse(&poolM, input, &error);
  ASSERT_TRUE(streamed) << error;
  EXPECT_FALSE(streamed->Equals(tree)) << "only the streaming parser decodes the \\u escape of the title";
  EXPECT_EQ(Str(streamed->GetString(VekString("title"))), "Caf\xC3\xA9 \"news\"\tfeed");
  EXPECT_TRUE(streamed->Remove(VekString("title")) && tree->Remove(VekString("title")) && streamed->Equals(tree));
}

}  // namespace
