// The value tree: exact JSON bytes, repeated names, name order, equality, typed readers and
// release of deep trees.
#include <algorithm>
#include <random>
#include <sstream>
#include <string>
#include <vector>

#include "runtime/DictTestSupport.h"

namespace {

using namespace dicttest;
using DictValueTest = sarntest::PoolTest;

ref<StringValue> Bare(VekMempool* pool, const char* text) {
  ref<StringValue> value = StringValue::Make(text, pool);
  value->SetNeedQuotes(false);
  return value;
}

// The compact and the pretty text, "compact ~ pretty"; each written through a byte sink too,
// which must give the same bytes as the buffer form.
std::string Forms(const ref<DictValue>& value) {
  std::string forms;
  for (bool pretty : {false, true}) {
    wynbaselib::InMemoryBytestream sink;
    value->ToJson(sink, JsonFormat(pretty));
    const std::string text = pretty ? Pretty(value) : Compact(value);
    EXPECT_EQ(sink.GetContent(), text);
    forms += pretty ? " ~ " + text : text;
  }
  return forms;
}

// Nested forms are kept as golden files with the hand-written reader's cases; here the empty
// containers at the top and inside, and the byte sink and byte string forms of the same text.
TEST_F(DictValueTest, WritesCompactAndPrettyBytes) {
  ref<Dictionary> empty = new (&poolM) Dictionary();
  ref<ArrayValue> emptyArray = new (&poolM) ArrayValue();
  EXPECT_EQ(Forms(empty) + " | " + Forms(emptyArray), "{} ~ {\n} | [] ~ [\n\n]");
  ref<Dictionary> holder = new (&poolM) Dictionary();
  holder->Add(VekString("f"), empty);
  holder->Add(VekString("e"), emptyArray);
  holder->Add(VekString("n"), ref<NullValue>(new (&poolM) NullValue()));
  EXPECT_EQ(Forms(holder),
            "{\"e\": [], \"f\": {}, \"n\": null} ~ {\n    \"e\": [\n\n    ], \n    \"f\": {\n    }, \n    \"n\": null\n}");
  EXPECT_EQ(Str(holder->ToBytestring(true)), Pretty(holder));
}

TEST_F(DictValueTest, ScalarsPickQuotesByMakerAndText) {
  ref<Dictionary> d = new (&poolM) Dictionary();
  const std::pair<const char*, ref<DictValue>> values[] = {
      {"bool", StringValue::Make(true, &poolM)}, {"double", StringValue::Make(1.5, &poolM)}, {"int", StringValue::Make(-7, &poolM)},
      {"ll", StringValue::Make(-7LL, &poolM)}, {"u", StringValue::Make(7u, &poolM)},
      {"ull", StringValue::Make(18446744073709551615ULL, &poolM)}, {"k\"ey", Bare(&poolM, "1.5")}};
  for (const auto& [name, value] : values) d->Add(VekString(name), value);
  d->Add(VekString("text"), VekString("a\"b\\c\n"));
  d->AddBytestring(VekString("bytes"), vek::ByteBuffer::New(&poolM, "foo", 3));
  EXPECT_EQ(Compact(d),
            R"({"bool": true, "bytes": "Zm9v", "double": "1.5", "int": -7, "k\"ey": "1.5", "ll": "-7", )"
            R"("text": "a\"b\\c\n", "u": 7, "ull": "18446744073709551615"})");
}

TEST_F(DictValueTest, RepeatedNamesKeepEveryValueInOrder) {
  ref<Dictionary> d = new (&poolM) Dictionary();
  ref<StringValue> one = Bare(&poolM, "1");
  d->Add(VekString("x"), one);
  d->Add(VekString("x"), Bare(&poolM, "2"));
  d->Add(VekString("y"), ref<NullValue>(new (&poolM) NullValue()));
  d->Add(VekString("x"), VekString("three"));
  EXPECT_TRUE(d->CountValues(VekString("x")) == 3 && d->CountNames() == 4 && d->Get(VekString("x")).Get() == one.Get());
  EXPECT_EQ(Forms(d), "{\"x\": 1, \"x\": 2, \"x\": \"three\", \"y\": null} ~ "
                      "{\n    \"x\": 1, \n    \"x\": 2, \n    \"x\": \"three\", \n    \"y\": null\n}");

  VekArray<DictValue> range(&poolM);
  range.Add(one);  // GetRange appends, it does not clear
  d->GetRange(VekString("x"), range);
  ASSERT_TRUE(range.Count() == 4 && Compact(range[3]) == "\"three\"");
  VekStringArray texts(&poolM);
  d->GetStringRange(VekString("y"), texts);
  d->GetStringRange(VekString("x"), texts);
  ASSERT_TRUE(texts.Count() == 3 && Str(texts[2]) == "three") << "no texts from a name without them";

  EXPECT_TRUE(d->Remove(VekString("x")) && !d->Remove(VekString("x")));
  EXPECT_TRUE(d->CountNames() == 1 && d->CountValues(VekString("x")) == 0 && Compact(d) == R"({"y": null})");
}

TEST_F(DictValueTest, TypedLookupsAnswerEmptyForOtherKinds) {
  ref<Dictionary> d = Dictionary::New(&poolM, VekString("thing"));
  d->Add(VekString("list"), ref<ArrayValue>(new (&poolM) ArrayValue()));
  d->Add(VekString("sub"), ref<Dictionary>(new (&poolM) Dictionary()));
  EXPECT_EQ(Compact(d), R"({"list": [], "sub": {}, "type": "thing"})");
  EXPECT_EQ(Str(d->GetString(VekString("type"))) + "|" + Str(d->GetString(VekString("list"))) + "|" +
                Str(d->GetString(VekString("absent"))),
            "thing||");
  EXPECT_EQ(std::vector<bool>({bool(d->GetArray(VekString("list"))), bool(d->GetArray(VekString("sub"))),
                               bool(d->GetDictionary(VekString("sub"))), bool(d->GetDictionary(VekString("type"))),
                               bool(d->Get(VekString("absent")))}),
            std::vector<bool>({true, false, true, false, false}));
  EXPECT_EQ(Compact(Dictionary::New(&poolM, VekString())), "{}");
}

TEST_F(DictValueTest, NamesAreWrittenInByteOrder) {
  ref<Dictionary> d = new (&poolM) Dictionary();
  for (const char* name : {"b", "ab", "a", "B", "Type", "", "a\xC3\xA9"}) d->Add(VekString(name), Bare(&poolM, "1"));
  VekStringArray names(&poolM);
  names.Add(VekString("stale"));
  d->GetSortedNames(names);
  std::string joined;
  for (int i = 0; i < names.Count(); ++i) joined += "|" + Str(names[i]);
  EXPECT_EQ(joined, "||B|Type|a|ab|a\xC3\xA9|b");
  EXPECT_EQ(Compact(d), "{\"\": 1, \"B\": 1, \"Type\": 1, \"a\": 1, \"ab\": 1, \"a\xC3\xA9\": 1, \"b\": 1}");
}

// Past a handful of names lookups go through an index and writing sorts in pool memory; removal
// rebuilds both. Every name must stay reachable through all of that.
TEST_F(DictValueTest, ManyNamesSurviveIndexGrowthAndRemoval) {
  std::vector<std::string> names;
  for (int i = 0; i < 3000; ++i) names.push_back("name" + std::to_string(i * 7919 % 3001));
  ref<Dictionary> d = new (&poolM) Dictionary();
  for (const std::string& name : names) d->Add(Text(&poolM, name), Text(&poolM, "v" + name));
  d->Add(Text(&poolM, names[5]), VekString("second"));
  // Removal allocates nothing, so running out of memory cannot cost the other names their values.
  std::vector<VekString> removed;
  for (size_t i = 0; i < names.size(); i += 2) removed.push_back(Text(&poolM, names[i]));
  poolM.FailAllocationAfter(1L << 40);
  for (const VekString& name : removed) EXPECT_TRUE(d->Remove(name));
  EXPECT_EQ(poolM.GetFailCountdown(), 1L << 40);
  poolM.FailAllocationAfter(-1);
  EXPECT_EQ(d->CountNames(), 1500u + 1);
  for (size_t i = 0; i < names.size(); ++i) {
    VekString name = Text(&poolM, names[i]);
    ASSERT_EQ(d->CountValues(name), i % 2 == 0 ? 0u : (i == 5 ? 2u : 1u)) << names[i];
    ASSERT_TRUE(i % 2 == 0 || Str(d->GetString(name)) == "v" + names[i]) << names[i];
  }
  d->Add(Text(&poolM, names[0]), VekString("back"));
  EXPECT_EQ(Str(d->GetString(Text(&poolM, names[0]))), "back");

  std::vector<std::string> kept;
  for (size_t i = 1; i < names.size(); i += 2) kept.push_back(names[i]);
  kept.push_back(names[0]);
  std::sort(kept.begin(), kept.end());
  std::string json = Compact(d);
  size_t at = 0;
  for (const std::string& name : kept) {
    size_t found = json.find("\"" + name + "\": ", at);
    ASSERT_NE(found, std::string::npos) << name << " missing or out of order";
    at = found + 1;
  }
}

TEST_F(DictValueTest, EqualityFollowsTheReceiversRule) {
  // {a: 1, <second>: 2, x: x1, x: x2}, with the names added in reverse order when asked.
  auto make = [this](bool isReversed, const char* second, const char* x1, const char* x2) {
    ref<Dictionary> d = new (&poolM) Dictionary();
    std::vector<std::pair<const char*, ref<DictValue>>> adds = {
        {"a", Bare(&poolM, "1")}, {second, Bare(&poolM, "2")}, {"x", StringValue::Make(x1, &poolM)}, {"x", StringValue::Make(x2, &poolM)}};
    if (isReversed) adds = {adds[2], adds[1], adds[3], adds[0]};
    for (const auto& [name, value] : adds) d->Add(VekString(name), value);
    return d;
  };
  ref<Dictionary> a = make(false, "b", "p", "q");
  EXPECT_TRUE(a->Equals(make(true, "b", "p", "q"))) << "name order does not matter";
  EXPECT_FALSE(a->Equals(make(true, "b", "q", "p"))) << "value order under a name does";
  EXPECT_FALSE(a->Equals(make(false, "c", "p", "q")));
  EXPECT_FALSE(make(true, "b", "p", "p")->Equals(a));

  ref<StringValue> quoted = StringValue::Make("5", &poolM);
  EXPECT_TRUE(quoted->Equals(Bare(&poolM, "5"))) << "need-quotes is not compared";
  ref<NullValue> null = new (&poolM) NullValue();
  EXPECT_TRUE(null->kindM == DictValue::KIND_NULL && null->Equals(ref<NullValue>(new (&poolM) NullValue())));
  EXPECT_FALSE(null->Equals(StringValue::Make("null", &poolM)) || StringValue::Make("null", &poolM)->Equals(null) ||
               null->Equals(ref<DictValue>()));

  ref<ArrayValue> left = new (&poolM) ArrayValue();
  ref<ArrayValue> right = new (&poolM) ArrayValue();
  left->Add(a);
  right->Add(make(true, "b", "p", "q"));
  EXPECT_TRUE(left->Equals(right));
  right->Add(null);
  EXPECT_FALSE(left->Equals(right) || left->Equals(a));
  ref<Dictionary> payloadHolder = new (&poolM) Dictionary();
  payloadHolder->Add(VekString("a"), LazyDict::FromDictionary(&poolM, a, 0));
  ref<Dictionary> plainHolder = new (&poolM) Dictionary();
  plainHolder->Add(VekString("a"), a);
  EXPECT_FALSE(payloadHolder->Equals(plainHolder)) << "a payload never equals a dictionary";
}

TEST_F(DictValueTest, TypedReadersConvertOrLeaveTheOutputAlone) {
  // The value read from `text` into `out`, or "no" and what `out` held afterwards.
  auto read = [this](const char* text, auto out) {
    bool fOk = StringValue::Make(text, &poolM)->GetValue(out);
    std::ostringstream printed;
    printed << (fOk ? "" : "no ") << out;
    return printed.str();
  };
  EXPECT_EQ(read("2147483648", int(99)) + "|" + read("-2147483648", int(0)) + "|" + read("4294967296", 5u) + "|" +
                read("4294967295", 5u) + "|" + read("True", false) + "|" + read("true", false) + "|" +
                read("12abc", 0LL) + "|" + read("abc", 7LL) + "|" + read("-1.5e3", 0.0) + "|" +
                read("18446744073709551615", 0ULL),
            "no 99|-2147483648|no 5|4294967295|no 0|1|12|no 7|-1500|18446744073709551615");
  ref<vek::ByteBuffer> bytes;
  EXPECT_TRUE(StringValue::Make("Zm9v", &poolM)->GetValue(bytes) && Str(bytes) == "foo");
  EXPECT_TRUE(StringValue::Make("!!", &poolM)->GetValue(bytes) && bytes->GetLength() == 0);
}

TEST_F(DictValueTest, ArrayRemovesByObjectAndRefusesBadIndexes) {
  ref<ArrayValue> array = new (&poolM) ArrayValue();
  ref<StringValue> s = StringValue::Make("s", &poolM);
  array->Add(s);
  array->Add(VekString("t"));
  array->Add(s);
  EXPECT_FALSE(array->GetValueAt(3) || array->Remove(3));
  EXPECT_TRUE(array->Remove(2));  // the first element that is the same object: index 0
  EXPECT_EQ(Compact(array), R"(["t", "s"])");
  EXPECT_TRUE(array->GetValueAt(1).Get() == s.Get() && array->CountValues() == 2);
}

// Trees built by hand have no depth limit; releasing one must not recurse per level.
TEST_F(DictValueTest, ReleasesHandBuiltTreesOfAnyDepthInFlatStack) {
  RunOnStack(256 * 1024, [this] {
    ref<DictValue> root = new (&poolM) Dictionary();
    DictValue* inner = root.Get();
    for (int level = 0; level < 300000; ++level) {
      ref<DictValue> child = level % 3 == 0 ? ref<DictValue>(new (&poolM) ArrayValue()) : new (&poolM) Dictionary();
      if (inner->kindM == DictValue::KIND_ARRAY) {
        static_cast<ArrayValue*>(inner)->Add(child);
      } else if (level % 3 == 2) {
        // Every few levels the chain passes through a payload holding its Dictionary.
        ref<Dictionary> next = ref<Dictionary>(static_cast<Dictionary*>(child.Get()));
        static_cast<Dictionary*>(inner)->Add(VekString("p"), LazyDict::FromDictionary(&poolM, next, 0));
      } else {
        static_cast<Dictionary*>(inner)->Add(VekString("k"), child);
      }
      inner = child.Get();
    }
    root.Reset();
  });
  EXPECT_EQ(poolM.GetUsedBytes(), 0u);
}

}  // namespace

// Keys that differ in one byte at any position of any length up to 20 (the key cache compares
// short keys by words loaded from both ends) each read back as their own name, by both readers.
TEST_F(DictValueTest, KeysDifferingInOneByteStayApart) {
  std::string json = "{";
  std::vector<std::string> keys;
  for (size_t n = 1; n <= 20; ++n) {
    for (size_t at = 0; at <= n; ++at) {
      keys.push_back(std::string(n, 'a'));
      if (at < n) keys.back()[at] = 'b';
      json += (keys.size() > 1 ? ", \"" : "\"") + keys.back() + "\": " + std::to_string(keys.size());
    }
  }
  json += "}";
  for (int reader = 0; reader < 2; ++reader) {
    bool isOk = true;
    ref<Dictionary> tree = reader == 0 ? Read(&poolM, json) : Parse(&poolM, sarntest::FixedChunks(json, 5), &isOk);
    ASSERT_TRUE(tree && isOk);
    ASSERT_EQ(tree->CountNames(), keys.size());
    for (size_t i = 0; i < keys.size(); ++i) EXPECT_EQ(Str(tree->GetString(VekString(keys[i].c_str()))), std::to_string(i + 1));
  }
}

// Texts taken out of a tree either reader built (through the facade, a copied VekString; each
// text shares its block with its value) stay valid after the tree is gone, unchanged and still of the tree's pool; once they go too, the
// pool is back to zero used bytes.
TEST_F(DictValueTest, TextsTakenOutOutliveTheTreeEachReaderBuilt) {
  const std::string large = "a text long enough to need a large block " + std::string(600, 'y');
  const std::string json = R"({"s": "caf)" "\xC3\xA9" R"( \"q\"\t", "n": -12.5e3, "b": true, "a": ["x", {"k": ")" + large + "\"}]}";
  for (int reader = 0; reader < 2; ++reader) {
    SCOPED_TRACE(reader == 0 ? "hand-written reader" : "streaming reader in 7-byte chunks");
    VekString s, n, b, k;
    {
      bool isOk = true;
      ref<Dictionary> tree = reader == 0 ? Read(&poolM, json) : Parse(&poolM, sarntest::FixedChunks(json, 7), &isOk);
      ASSERT_TRUE(tree && isOk);
      s = ref<Dict>(new (&poolM) Dict(tree))->GetString("s", 0);
      n = tree->GetString(VekString("n"));
      b = static_cast<StringValue*>(tree->Get(VekString("b")).Get())->valueM;
      // A value's text replaced while a copy of the old one lives: both blocks still go in the end.
      static_cast<StringValue*>(tree->Get(VekString("b")).Get())->valueM = VekString::FromUtf8Bytes(&poolM, 1, "x");
      k = static_cast<Dictionary*>(tree->GetArray(VekString("a"))->GetValueAt(1).Get())->GetString(VekString("k"));
    }
    EXPECT_GT(poolM.GetUsedBytes(), 0u) << "the taken texts hold their blocks";
    EXPECT_EQ(Str(s) + "|" + Str(n) + "|" + Str(b) + "|" + Str(k), "caf\xC3\xA9 \"q\"\t|-12.5e3|true|" + large);
    for (const VekString* text : {&s, &n, &b, &k}) EXPECT_EQ(text->GetMempool(), &poolM);
    VekString sCopy = s;
    s = n = b = k = VekString();
    EXPECT_EQ(Str(sCopy), "caf\xC3\xA9 \"q\"\t");
    sCopy = VekString();
    EXPECT_EQ(poolM.GetUsedBytes(), 0u);
  }
}
