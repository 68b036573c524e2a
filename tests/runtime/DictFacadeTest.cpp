// The Dict facade: arrays formed by repeated adds, index addressing, sharing, messages on
// standard error, and its two comparisons.
#include "runtime/DictTestSupport.h"

namespace {

using namespace dicttest;
using DictFacadeTest = sarntest::PoolTest;

std::string Text(const ref<Dict>& d) { return Str(d->ToString(false)); }

TEST_F(DictFacadeTest, RepeatedAddsFormAnArrayThatShrinksAndGoes) {
  ref<Dict> d = MakeDict(&poolM);
  std::vector<std::string> texts;
  for (const char* value : {"1", "2", "3"}) {
    d->AddString("a", value);
    texts.push_back(Text(d));
  }
  EXPECT_EQ(texts, std::vector<std::string>({R"({"a": "1"})", R"({"a": ["1", "2"]})", R"({"a": ["1", "2", "3"]})"}));
  EXPECT_TRUE(d->CountValues("a") == 3 && d->CountNames() == 1 && Str(d->GetString("a", 1)) == "2");
  d->Remove("a", 0);
  d->Remove("a", 0);
  EXPECT_TRUE(Text(d) == R"({"a": ["3"]})" && d->GetType("a", 0) == dictvalue::TYPE_STRING) << "one element stays an array";
  d->Remove("a", 0);
  EXPECT_TRUE(d->CountValues("a") == 0 && Text(d) == "{}");

  // Once a name holds an array, every later add lands in it, whatever kind it adds.
  d->AddString("b", "x");
  d->AddDict("b", Dict::New(&poolM, VekString("kid")));
  d->AddLazyDict("b", LazyDict::FromJsonString(&poolM, VekString("{\"p\":1}"), 0));
  EXPECT_EQ(Text(d), R"({"b": ["x", {"type": "kid"}, {"p":1}]})");
  std::string kinds;
  for (int i = 1; i <= 3; ++i) {
    bool isLazy = true;
    kinds += std::to_string(d->GetType(VekString("b"), i, isLazy));
    kinds += isLazy ? "L " : " ";
  }
  EXPECT_EQ(kinds, std::to_string(dictvalue::TYPE_DICT) + " " + std::to_string(dictvalue::TYPE_DICT) + "L " +
                       std::to_string(dictvalue::TYPE_NONE) + " ");
}

TEST_F(DictFacadeTest, NestedDictionariesAreSharedNotCopied) {
  ref<Dict> parent = Dict::New(&poolM, VekString("p"));
  ref<Dict> child = MakeDict(&poolM);
  parent->AddDict("c", child);
  child->AddString("late", "yes");
  EXPECT_EQ(Text(parent), R"({"c": {"late": "yes"}, "type": "p"})");
  ref<Dict> again = parent->GetDict("c", 0);
  again->AddString("later", "too");
  EXPECT_TRUE(Text(child) == R"({"late": "yes", "later": "too"})" && again->GetDictionary().Get() == child->GetDictionary().Get());
  parent->AddDict("n", ref<Dict>());
  parent->AddLazyDict("n", ref<LazyDict>());
  EXPECT_EQ(parent->CountNames(), 2u) << "null adds change nothing";
  parent->InsertTypeZero(VekString("q"));
  EXPECT_EQ(Str(parent->GetString("type", 1)), "q");
}

TEST_F(DictFacadeTest, WrongKindsAndNegativeIndexesGiveEmptyAnswers) {
  ref<Dict> d = MakeDict(&poolM);
  d->AddString("s", "text");
  d->AddDict("sub", Dict::New(&poolM, VekString("t")));
  d->AddString("list", "1");
  d->AddString("list", "2");
  ref<Dict> fromString = d->GetDict("s", 0);
  fromString->AddString("x", "y");
  EXPECT_TRUE(d->CountNames() == 3 && fromString->CountNames() == 1) << "the empty Dict for a wrong kind is new, not shared";
  EXPECT_EQ(Str(d->GetString("sub", 0)) + Str(d->GetString("s", -1)), "");
  EXPECT_TRUE(d->GetType("s", -1) == dictvalue::TYPE_NONE && !d->FindValue(VekString("s"), 1));
  d->Remove("list", -1);
  EXPECT_EQ(d->CountValues("list"), 2u) << "a negative index removes nothing from an array";
  d->Remove("s", -1);
  EXPECT_EQ(d->CountValues("s"), 0u) << "a single value goes whatever the index";
  d->Remove("sub");
  EXPECT_EQ(Text(d), R"({"list": ["1", "2"]})");
}

TEST_F(DictFacadeTest, LazyLookupsPrintTheirTwoMessages) {
  ref<Dict> d = MakeDict(&poolM);
  d->AddString("s", "text");
  ref<LazyDict> payload = LazyDict::FromJsonString(&poolM, VekString("{\"z\":0}"), 0);
  d->AddLazyDict("lazy", payload);
  d->AddDict("sub", Dict::New(&poolM, VekString("t")));
  const std::pair<const char*, const char*> failures[] = {
      {"missing", "Dict::GetValueFromWrapper: field missing[3] not found"}, {"s", "s[0] is neither a LazyDict nor a Dict"}};
  for (const auto& [name, message] : failures) {
    testing::internal::CaptureStderr();
    ref<LazyDict> empty = d->GetLazyDict(name, name[0] == 'm' ? 3 : 0);
    EXPECT_EQ(testing::internal::GetCapturedStderr(), message);
    EXPECT_EQ(Str(empty->ToJson(false)), "{}");
  }
  testing::internal::CaptureStderr();
  EXPECT_EQ(d->GetLazyDict("lazy", 0).Get(), payload.Get());
  ref<LazyDict> wrapped = d->GetLazyDict("sub", 0);
  EXPECT_EQ(testing::internal::GetCapturedStderr(), "");
  EXPECT_TRUE(wrapped->repM == LazyDict::REP_DICTIONARY && wrapped->dictionaryM.Get() == d->GetDict("sub", 0)->GetDictionary().Get());
  EXPECT_EQ(Text(d->GetDict("lazy", 0)), R"({"z": 0})");
}

TEST_F(DictFacadeTest, FacadeSeesOnlyTheFirstOfRepeatedNames) {
  ref<Dictionary> raw = new (&poolM) Dictionary();
  raw->Add(VekString("x"), VekString("first"));
  raw->Add(VekString("x"), VekString("second"));
  ref<Dict> d = MempoolNew<Dict>(&poolM, raw);
  EXPECT_EQ(Str(d->GetString("x", 0)) + "|" + Str(d->GetString("x", 1)), "first|");
  EXPECT_TRUE(d->CountValues("x") == 1 && d->CountNames() == 2);
  d->AddString("x", "third");
  EXPECT_EQ(Text(d), R"({"x": ["first", "third"]})") << "forming the array drops the other values";
}

TEST_F(DictFacadeTest, ComparesByFacadeByTreeAndByText) {
  auto make = [this](const char* value) {
    ref<Dict> d = Dict::New(&poolM, VekString("t"));
    d->AddString("v", value);
    ref<Dict> sub = MakeDict(&poolM);
    sub->AddString("w", "1");
    d->AddDict("sub", sub);
    return d;
  };
  ref<Dict> a = make("1");
  EXPECT_TRUE(a->Equals(make("1")) && *a == *make("1"));
  EXPECT_FALSE(a->Equals(make("2")) || a->Equals(ref<Dict>()));

  // A bare 5 and a quoted 5 are equal as values but not as text.
  ref<Dict> bare = MakeDict(&poolM);
  bare->GetDictionary()->Add(VekString("n"), StringValue::Make(5, &poolM));
  ref<Dict> quoted = MakeDict(&poolM);
  quoted->AddString("n", "5");
  EXPECT_TRUE(bare->Equals(quoted.Get()) && bare->Equals(quoted));
  EXPECT_FALSE(*bare == *quoted);

  // Array elements are compared one by one, but a nested array or a null makes the facade
  // comparison fail, even against itself.
  ref<Dict> withArray = make("1");
  withArray->AddString("v", "again");
  EXPECT_TRUE(withArray->Equals(withArray));
  ref<ArrayValue> outer = new (&poolM) ArrayValue();
  outer->Add(ref<ArrayValue>(new (&poolM) ArrayValue()));
  withArray->GetDictionary()->Add(VekString("nested"), outer);
  EXPECT_TRUE(withArray->Equals(withArray.Get()) && !withArray->Equals(withArray));
  ref<Dict> withNull = MakeDict(&poolM);
  withNull->GetDictionary()->Add(VekString("z"), ref<NullValue>(new (&poolM) NullValue()));
  EXPECT_FALSE(withNull->Equals(withNull));

  // Payloads compare by identity through the facade, by content through the tree; a dictionary
  // never equals a payload.
  ref<LazyDict> payload = LazyDict::FromJsonString(&poolM, VekString("{}"), 0);
  std::vector<ref<Dict>> p = {MakeDict(&poolM), MakeDict(&poolM), MakeDict(&poolM), MakeDict(&poolM)};
  p[0]->AddLazyDict("l", payload);
  p[1]->AddLazyDict("l", payload);
  p[2]->AddLazyDict("l", LazyDict::FromJsonString(&poolM, VekString("{}"), 0));
  p[3]->AddDict("l", MakeDict(&poolM));
  EXPECT_EQ(std::vector<bool>({p[0]->Equals(p[1]), p[0]->Equals(p[2]), p[0]->Equals(p[2].Get()), p[3]->Equals(p[0])}),
            std::vector<bool>({true, false, true, false}));
}

}  // namespace
