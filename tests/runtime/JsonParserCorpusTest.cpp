// The public JSON test suite: the streaming parser's verdict on every file matches the file's y_/n_
// prefix except where the tokenizer itself decides otherwise (listed below, and checked so the list
// cannot go stale); a tree parse accepts exactly the valid documents whose top level is an object;
// the hand-written reader gives a tree or a message for each. Chunked feeding, round trips and the
// two readers' agreement are oracles of the streaming parser's fuzz target.
#include <filesystem>
#include <set>
#include <string>

#include "runtime/DictTestSupport.h"

namespace {

using namespace dicttest;
using JsonParserCorpusTest = sarntest::PoolTest;

TEST_F(JsonParserCorpusTest, EveryFileGetsTheVerdictOfItsName) {
  std::string dir = std::string(getenv("SARN_CORPORA_DIR") ? getenv("SARN_CORPORA_DIR") : "") + "/json-test-suite/test_parsing";
  if (!std::filesystem::is_directory(dir)) GTEST_SKIP() << "json-test-suite corpus not present";
  const std::set<std::string> kTokenizerDisagrees = {
      "n_structure_whitespace_formfeed.json",  // form feed taken as whitespace
  };
  std::set<std::string> disagreeing;
  int nFiles = 0;
  for (const auto& entry : std::filesystem::directory_iterator(dir)) {
    std::string name = entry.path().filename().string(), text, error, handError;
    if (entry.path().extension() != ".json") continue;
    ASSERT_TRUE(sarntest::ReadFile(entry.path().string(), text)) << name;
    ++nFiles;
    JsonParser syntax(&poolM);
    syntax.BeginParse();
    bool isSyntaxOk = syntax.ParseChunk(text.data(), text.size()) && syntax.EndParse();
    if (name[0] != 'i' && isSyntaxOk != (name[0] == 'y')) disagreeing.insert(name);
    bool isOk;
    ref<Dictionary> tree = Parse(&poolM, sarntest::FixedChunks(text, 7), &isOk, &error);
    size_t first = text.find_first_not_of(" \t\r\n");
    bool isObject = first != std::string::npos && text[first] == '{';
    EXPECT_EQ(isOk, isSyntaxOk && isObject) << name << ": " << error;
    EXPECT_EQ(error, isOk ? "" : isSyntaxOk ? "The JSON must start with a '{' character" : error == "" ? "a message" : error)
        << name;
    EXPECT_TRUE(Read(&poolM, text, &handError) || !handError.empty()) << name;
  }
  EXPECT_GT(nFiles, 300);
  EXPECT_EQ(disagreeing, kTokenizerDisagrees) << "a file disagrees with its prefix and is not listed, or the reverse";
}

}  // namespace
