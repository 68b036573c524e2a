// The public JSON test suite through both readers: every file gets a verdict without a crash or
// a leak, and the streaming parser's verdict matches the file's y_/n_ prefix except where the
// tokenizer itself decides otherwise (listed below, and checked so the list cannot go stale).
#include <dirent.h>

#include <algorithm>
#include <set>
#include <string>
#include <vector>

#include "runtime/DictTestSupport.h"

namespace {

using namespace dicttest;
using JsonParserCorpusTest = sarntest::PoolTest;

// Files whose verdict from the tokenizer differs from their prefix.
const std::set<std::string> kTokenizerDisagrees = {
    "n_structure_whitespace_formfeed.json",  // form feed taken as whitespace
};

std::vector<std::string> ListFiles(const std::string& dir) {
  std::vector<std::string> names;
  if (DIR* handle = opendir(dir.c_str())) {
    while (dirent* entry = readdir(handle)) {
      std::string name = entry->d_name;
      if (name.size() > 5 && name.compare(name.size() - 5, 5, ".json") == 0) names.push_back(name);
    }
    closedir(handle);
  }
  std::sort(names.begin(), names.end());
  return names;
}

bool SyntaxOk(VekMempool* pool, const std::string& text) {
  JsonParser parser(pool);
  parser.BeginParse();
  for (std::string_view chunk : sarntest::FixedChunks(text, 7)) {
    if (!parser.ParseChunk(chunk.data(), chunk.size())) return false;
  }
  return parser.EndParse();
}

TEST_F(JsonParserCorpusTest, EveryFileGetsAVerdictFromBothReaders) {
  std::string root = sarntest::CorpusDir("json-test-suite");
  if (root.empty()) GTEST_SKIP() << "json-test-suite corpus not present";
  std::string dir = root + "/test_parsing";
  std::vector<std::string> names = ListFiles(dir);
  ASSERT_GT(names.size(), 300u);
  std::set<std::string> disagreeing;
  int nHandAccepted = 0;
  for (const std::string& name : names) {
    std::string text;
    ASSERT_TRUE(sarntest::ReadFile(dir + "/" + name, text)) << name;
    bool isSyntaxOk = SyntaxOk(&poolM, text);
    bool isOk;
    std::string error;
    ref<Dictionary> tree = Parse(&poolM, sarntest::FixedChunks(text, 512), &isOk, &error);
    // A tree parse accepts exactly the valid documents whose top level is an object.
    size_t first = text.find_first_not_of(" \t\r\n");
    bool isObject = first != std::string::npos && text[first] == '{';
    if (isSyntaxOk) {
      EXPECT_EQ(isOk, isObject) << name << ": " << error;
      if (!isObject) {
        EXPECT_EQ(error, "The JSON must start with a '{' character") << name;
      }
    } else {
      EXPECT_FALSE(isOk) << name;
      EXPECT_NE(error, "") << name;
    }
    if (name[0] != 'i' && isSyntaxOk != (name[0] == 'y')) disagreeing.insert(name);

    std::string handError;
    ref<Dictionary> handTree = Read(&poolM, text, &handError);
    EXPECT_TRUE(handTree || !handError.empty()) << name;
    if (handTree) {
      ++nHandAccepted;
      EXPECT_TRUE(handTree->Equals(Read(&poolM, Compact(handTree)))) << name;
    }
    if (isOk) {
      EXPECT_TRUE(tree->Equals(Parse(&poolM, Compact(tree)))) << name;
    }
    if (isOk && handTree && text.find('\\') == std::string::npos) {
      EXPECT_TRUE(tree->Equals(handTree)) << name << ": both readers accept it, so they must agree";
    }
  }
  EXPECT_GT(nHandAccepted, 10);
  for (const std::string& name : disagreeing) {
    EXPECT_TRUE(kTokenizerDisagrees.count(name)) << name << " disagrees with its prefix and is not listed";
  }
  for (const std::string& name : kTokenizerDisagrees) {
    EXPECT_TRUE(disagreeing.count(name)) << name << " is listed but now agrees with its prefix";
  }
}

}  // namespace
