// The Dict facade: arrays formed by repeated adds, index addressing, sharing, messages on
// standard error, and its two comparisons.
#include "runtime/DictTestSupport.h"

namespace {

using namespace dicttest;
using DictFacadeTest = sarntest::PoolTest;

TEST_F(DictFacadeTest, RepeatedAddsFormAnArrayThatShrinksAndGoes) {
  ref<Dict> d = MakeDict(&poolM);
  d->AddString("a", "1");
  EXPECT_EQ(Str(d->ToString(false)), R"({"a": "1"})");
  d->AddString("a", "2");
  EXPECT_EQ(d->CountValues("a"), 2u);
  EXPECT_EQ(d->CountNames(), 1u);
  EXPECT_EQ(Str(d->GetString("a", 1)), "2");
  EXPECT_EQ(Str(d->ToString(false)), R"({"a": ["1", "2"]})");
  d->AddString("a", "3");
  EXPECT_EQ(Str(d->ToString(false)), R"({"a": ["1", "2", "3"]})");
  d->Remove("a", 0);
  d->Remove("a", 0);
  EXPECT_EQ(Str(d->ToString(false)), R"({"a": ["3"]})") << "one element left stays an array";
  EXPECT_EQ(d->GetType("a", 0), dictvalue::TYPE_STRING);
  d->Remove("a", 0);
  EXPECT_EQ(d->CountValues("a"), 0u);
  EXPECT_EQ(Str(d->ToString(false)), "{}");

  // Once a name holds an array, every later add lands in it, whatever kind it adds.
  ref<Dict> child = Dict::New(&poolM, VekString("kid"));
  d->AddString("b", "x");
  d->AddDict("b", child);
  d->AddLazyDict("b", LazyDict::FromJsonString(&poolM, VekString("{\"p\":1}"), 0));
  EXPECT_EQ(Str(d->ToString(false)), R"({"b": ["x", {"type": "kid"}, {"p":1}]})");
  bool isLazy = true;
  EXPECT_EQ(d->GetType(VekString("b"), 1, isLazy), dictvalue::TYPE_DICT);
  EXPECT_FALSE(isLazy);
  EXPECT_EQ(d->GetType(VekString("b"), 2, isLazy), dictvalue::TYPE_DICT);
  EXPECT_TRUE(isLazy);
  EXPECT_EQ(d->GetType(VekString("b"), 3, isLazy), dictvalue::TYPE_NONE);
  EXPECT_FALSE(isLazy);
}

TEST_F(DictFacadeTest, NestedDictionariesAreSharedNotCopied) {
  ref<Dict> parent = Dict::New(&poolM, VekString("p"));
  ref<Dict> child = MakeDict(&poolM);
  parent->AddDict("c", child);
  child->AddString("late", "yes");
  EXPECT_EQ(Str(parent->ToString(false)), R"({"c": {"late": "yes"}, "type": "p"})");
  ref<Dict> again = parent->GetDict("c", 0);
  again->AddString("later", "too");
  EXPECT_EQ(Str(child->ToString(false)), R"({"late": "yes", "later": "too"})");
  EXPECT_EQ(again->GetDictionary().Get(), child->GetDictionary().Get());

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
  EXPECT_EQ(Str(d->GetString("sub", 0)), "");
  ref<Dict> fromString = d->GetDict("s", 0);
  EXPECT_EQ(fromString->CountNames(), 0u);
  fromString->AddString("x", "y");
  EXPECT_EQ(d->CountNames(), 3u) << "the empty Dict for a wrong kind is new, not shared";
  EXPECT_EQ(Str(d->GetString("s", -1)), "");
  EXPECT_EQ(d->GetType("s", -1), dictvalue::TYPE_NONE);
  EXPECT_FALSE(d->FindValue(VekString("s"), 1));
  d->Remove("list", -1);
  EXPECT_EQ(d->CountValues("list"), 2u) << "a negative index removes nothing from an array";
  d->Remove("s", -1);
  EXPECT_EQ(d->CountValues("s"), 0u) << "a single value goes whatever the index";
  d->Remove("sub");
  EXPECT_EQ(Str(d->ToString(false)), R"({"list": ["1", "2"]})");
}

TEST_F(DictFacadeTest, LazyLookupsPrintTheirTwoMessages) {
  ref<Dict> d = MakeDict(&poolM);
  d->AddString("s", "text");
  ref<LazyDict> payload = LazyDict::FromJsonString(&poolM, VekString("{\"z\":0}"), 0);
  d->AddLazyDict("lazy", payload);
  d->AddDict("sub", Dict::New(&poolM, VekString("t")));

  testing::internal::CaptureStderr();
  ref<LazyDict> missing = d->GetLazyDict("missing", 3);
  EXPECT_EQ(testing::internal::GetCapturedStderr(), "Dict::GetValueFromWrapper: field missing[3] not found");
  EXPECT_EQ(Str(missing->ToJson(false)), "{}");
  testing::internal::CaptureStderr();
  ref<LazyDict> fromString = d->GetLazyDict("s", 0);
  EXPECT_EQ(testing::internal::GetCapturedStderr(), "s[0] is neither a LazyDict nor a Dict");
  EXPECT_EQ(Str(fromString->ToJson(false)), "{}");

  testing::internal::CaptureStderr();
  EXPECT_EQ(d->GetLazyDict("lazy", 0).Get(), payload.Get());
  ref<LazyDict> wrapped = d->GetLazyDict("sub", 0);
  EXPECT_EQ(testing::internal::GetCapturedStderr(), "");
  EXPECT_EQ(wrapped->repM, LazyDict::REP_DICTIONARY);
  EXPECT_EQ(wrapped->dictionaryM.Get(), d->GetDict("sub", 0)->GetDictionary().Get());
  EXPECT_EQ(Str(d->GetDict("lazy", 0)->ToString(false)), R"({"z": 0})");
}

TEST_F(DictFacadeTest, FacadeSeesOnlyTheFirstOfRepeatedNames) {
  ref<Dictionary> raw = new (&poolM) Dictionary();
  raw->Add(VekString("x"), VekString("first"));
  raw->Add(VekString("x"), VekString("second"));
  ref<Dict> d = MempoolNew<Dict>(&poolM, raw);
  EXPECT_EQ(Str(d->GetString("x", 0)), "first");
  EXPECT_EQ(Str(d->GetString("x", 1)), "");
  EXPECT_EQ(d->CountValues("x"), 1u);
  EXPECT_EQ(d->CountNames(), 2u);
  d->AddString("x", "third");
  EXPECT_EQ(Str(d->ToString(false)), R"({"x": ["first", "third"]})") << "forming the array drops the other values";
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
  EXPECT_TRUE(a->Equals(make("1")));
  EXPECT_TRUE(*a == *make("1"));
  EXPECT_FALSE(a->Equals(make("2")));
  EXPECT_FALSE(a->Equals(ref<Dict>()));

  // A bare 5 and a quoted 5 are equal as values but not as text.
  ref<Dict> bare = MakeDict(&poolM);
  ref<StringValue> five = StringValue::Make(5, &poolM);
  bare->GetDictionary()->Add(VekString("n"), five);
  ref<Dict> quoted = MakeDict(&poolM);
  quoted->AddString("n", "5");
  EXPECT_TRUE(bare->Equals(quoted.Get()));
  EXPECT_TRUE(bare->Equals(quoted));
  EXPECT_FALSE(*bare == *quoted);

  // Array elements are compared one by one, but a nested array or a null makes the facade
  // comparison fail, even against itself.
  ref<Dict> withArray = make("1");
  withArray->AddString("v", "again");
  EXPECT_TRUE(withArray->Equals(withArray));
  ref<ArrayValue> outer = new (&poolM) ArrayValue();
  outer->Add(ref<ArrayValue>(new (&poolM) ArrayValue()));
  withArray->GetDictionary()->Add(VekString("nested"), outer);
  EXPECT_TRUE(withArray->Equals(withArray.Get()));
  EXPECT_FALSE(withArray->Equals(withArray));
  ref<Dict> withNull = MakeDict(&poolM);
  withNull->GetDictionary()->Add(VekString("z"), ref<NullValue>(new (&poolM) NullValue()));
  EXPECT_FALSE(withNull->Equals(withNull));

  // Payloads compare by identity through the facade, by content through the tree.
  ref<LazyDict> payload = LazyDict::FromJsonString(&poolM, VekString("{}"), 0);
  ref<Dict> p1 = MakeDict(&poolM);
  ref<Dict> p2 = MakeDict(&poolM);
  p1->AddLazyDict("l", payload);
  p2->AddLazyDict("l", payload);
  EXPECT_TRUE(p1->Equals(p2));
  ref<Dict> p3 = MakeDict(&poolM);
  p3->AddLazyDict("l", LazyDict::FromJsonString(&poolM, VekString("{}"), 0));
  EXPECT_FALSE(p1->Equals(p3));
  EXPECT_TRUE(p1->Equals(p3.Get()));
  ref<Dict> p4 = MakeDict(&poolM);
  p4->AddDict("l", MakeDict(&poolM));
  EXPECT_FALSE(p4->Equals(p1)) << "a dictionary against a payload";
}

}  // namespace
