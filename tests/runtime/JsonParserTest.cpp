// The streaming parser: chunk splits, its differences from the hand-written reader, its messages,
// the syntax-only mode, the depth limit and whole byte sources.
#include <string>
#include <vector>

#include "runtime/DictTestSupport.h"

namespace {

using namespace dicttest;
using JsonParserTest = sarntest::PoolTest;

std::string Kinds(const ref<ArrayValue>& array) {
  std::string kinds;
  for (unsigned i = 0; i < array->CountValues(); ++i) {
    ref<DictValue> value = array->GetValueAt(i);
    bool isString = value->kindM == DictValue::KIND_STRING;
    kinds += isString ? (static_cast<StringValue*>(value.Get())->needQuotesM ? "q" : "b") : value->kindM == DictValue::KIND_NULL ? "n" : "?";
  }
  return kinds;
}

TEST_F(JsonParserTest, KeepsRepeatedKeysAndNumberTextAndReportsRefusals) {
  std::string error;
  ref<Dictionary> tree = Parse(&poolM, R"({"k": 1, "k": -0.5E-7, "k": {"k": []}})", &error);
  EXPECT_EQ(Compact(tree), R"({"k": 1, "k": "-0.5E-7", "k": {"k": []}})") << error;
  tree = Parse(&poolM, R"({"a": [1, "x", null, true], "b": {"c": "\u00e9\n", "d": 1.50e+3}})", &error);
  ASSERT_EQ(Compact(tree), "{\"a\": [1, \"x\", null, true], \"b\": {\"c\": \"\xC3\xA9\\n\", \"d\": \"1.50e+3\"}}") << error;
  EXPECT_EQ(Kinds(tree->GetArray(VekString("a"))), "bqnb");
  bool isOk;
  for (const char* input : {"[1,2]", "42", "\"s\"", "null"}) {
    EXPECT_TRUE(!Parse(&poolM, {std::string_view(input)}, &isOk, &error) && !isOk) << input;
    EXPECT_EQ(error, "The JSON must start with a '{' character") << input;
  }
  // yajl's own words for syntax errors; the tree built so far is kept for the caller.
  ref<Dictionary> partial = Parse(&poolM, {std::string_view(R"({"a":1,})")}, &isOk, &error);
  EXPECT_EQ(error + Compact(partial) + (isOk ? " ok" : ""), "parse error: invalid object key (must be a string)\n{\"a\": 1}");
  for (const char* input : {"", "{\"a\"", "{a:1}", "{\"a\":tru}", "{\"a\":\"\xFF\"}", "{} {}", "{\"a\":1,}"}) {
    EXPECT_FALSE(Parse(&poolM, input, &error)) << input;
    EXPECT_TRUE(error != "" && error != "The JSON must start with a '{' character") << input;
  }
  EXPECT_EQ(ReaderVerdict(Parse(&poolM, "", &error), error), "parse error: premature EOF\n") << "an empty text fails at its end";
}

TEST_F(JsonParserTest, SyntaxOnlyParseBuildsNothingAndBothModesBoundTheDepth) {
  auto check = [this](const std::string& json, const JsonLimits& limits = JsonLimits()) {
    JsonParser parser(&poolM, limits);
    parser.BeginParse();
    bool isOk = parser.ParseChunk(json.data(), json.size()) && parser.EndParse();
    EXPECT_EQ(parser.pResultM, nullptr);
    return isOk ? std::string("ok") : std::string(parser.pErrorTextM);
  };
  size_t before = poolM.GetUsedBytes();
  EXPECT_EQ(check(R"({"a": [1, {"b": null}]})"), "ok");
  EXPECT_EQ(check("[1, 2]"), "ok") << "any top-level value passes a syntax check";
  EXPECT_EQ(check("{\"a\" 1}"), "parse error: object key and value must be separated by a colon (':')\n");
  EXPECT_EQ(check(Nested(JsonLimits::kDefaultMaxDepth)), "ok");
  EXPECT_EQ(check(Nested(JsonLimits::kDefaultMaxDepth + 1)), "JSON nesting exceeds the depth limit of 512 levels.");
  EXPECT_EQ(check("[[[]]]", JsonLimits(2)), "JSON nesting exceeds the depth limit of 2 levels.");
  EXPECT_EQ(poolM.GetUsedBytes(), before);
  // A tree parse stops at the same limits; the part read before one stays with the caller. (A
  // parse at the limit in a small stack runs with the hand-written reader's depth cases.)
  std::string error;
  bool isOk;
  ref<Dictionary> partial = Parse(&poolM, {Nested(JsonLimits::kDefaultMaxDepth + 1)}, &isOk, &error);
  EXPECT_TRUE(!isOk && partial && error == "JSON nesting exceeds the depth limit of 512 levels.") << error;
  EXPECT_EQ(ReaderVerdict(Parse(&poolM, R"({"a": {"b": {}}})", &error, JsonLimits(2)), error),
            "JSON nesting exceeds the depth limit of 2 levels.");
  EXPECT_TRUE(Parse(&poolM, R"({"a": {"b": 1}, "c": []})", &error, JsonLimits(2)));
  // Ending a parse that a limit stopped keeps the limit as the reason.
  PDictionary result;
  JsonParser parser(&poolM, JsonLimits(1));
  parser.BeginParse(result);
  EXPECT_FALSE(parser.ParseChunk("{\"a\": [", 7) || parser.EndParse());
  EXPECT_STREQ(parser.pErrorTextM, "JSON nesting exceeds the depth limit of 1 levels.");
}

// Both readers: the hand-written one joins its words to the message.
TEST_F(JsonParserTest, RefusesContainersPastThePlatformCount) {
  std::string array = "{\"a\": [0";
  for (int i = 1; i < 65535; ++i) array += ",0";
  std::string error;
  ref<Dictionary> full = Parse(&poolM, array + "]}", &error);
  ASSERT_TRUE(full) << "65,535 elements fit";
  EXPECT_TRUE(full->GetArray(VekString("a"))->CountValues() == 65535 && full->Equals(Read(&poolM, array + "]}")));
  EXPECT_EQ(ReaderVerdict(Parse(&poolM, array + ",0]}", &error), error), "JSON array holds more than 65535 elements.");
  EXPECT_EQ(ReaderVerdict(Read(&poolM, array + ",0]}", &error), error),
            "JSON array holds more than 65535 elements. Failed to parse an array member. Failed to parse value for key a");
  std::string keys = "{\"k\": 0";
  for (int i = 1; i < 65536; ++i) keys += ",\"k\":0";
  EXPECT_EQ(ReaderVerdict(Parse(&poolM, keys + "}", &error), error), "JSON object repeats a key more than 65535 times.");
}

TEST_F(JsonParserTest, ReadsWholeByteSourcesAndDeletesThem) {
  std::string json = "{\"list\": [";
  for (int i = 0; i < 3000; ++i) json += (i ? ", " : "") + std::string("{\"i\": ") + std::to_string(i) + "}";
  json += "]}";
  // Success leaves the message as it was; a failed parse returns the partial tree.
  const struct {
    std::string text;
    bool isFailing;
    std::string result;  // the message, then the compact tree
  } cases[] = {
      {json, false, "untouched " + Compact(Read(&poolM, json))},
      {"{\"a\": [1, 2", false, "parse error: premature EOF\n {\"a\": [1, 2]}"},
      {"{\"a\": 1}", true, "Byte source error: truncated stream {\"a\": 1}"},
      {"[]", false, "The JSON must start with a '{' character (null)"},
  };
  for (const auto& c : cases) {
    int deleted = 0;
    VekString error("untouched");
    ref<Dictionary> tree =
        Dictionary::FromJsonBytesource(new sarntest::TestSource({c.text}, &deleted, c.isFailing), error, &poolM);
    EXPECT_EQ(Str(error) + " " + Compact(tree) + " deleted " + std::to_string(deleted), c.result + " deleted 1");
  }
}

TEST_F(JsonParserTest, EndingAndTheStackFollowTheirContracts) {
  // The stack's peek at the value being built (the parser itself only peeks at states).
  JsonParser::DictStack stack;
  nonRef<DictValue> value;
  ref<Dictionary> d = new (&poolM) Dictionary();
  EXPECT_TRUE(!stack.PeekDictValue(value) && stack.Push(d.Get(), JsonParser::StateMap) && stack.PeekDictValue(value) &&
              value.Get() == d.Get());
  // A second EndParse repeats the answer; a parser destroyed mid-document ends and frees itself.
  PDictionary result;
  {
    JsonParser parser(&poolM);
    parser.BeginParse(result);
    EXPECT_TRUE(parser.GetState() == JsonParser::StateNone && parser.ParseChunk("{\"a\": [", 7) &&
                parser.GetState() == JsonParser::StateArray);
  }
  EXPECT_EQ(Compact(result), R"({"a": []})");
  JsonParser parser(&poolM);
  parser.BeginParse(result);
  EXPECT_TRUE(parser.ParseChunk("{}", 2) && parser.EndParse() && parser.EndParse() && parser.pErrorTextM == nullptr);
}

}  // namespace
