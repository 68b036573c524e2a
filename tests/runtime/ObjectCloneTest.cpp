// The conversion members and Clone from a table: the texts of ToString, ToDictionary and ToDict
// (also with a rebuilt name cache), and per field what a copy through the dictionary texts gives
// back, whether it shares the source's value, and which ids are refused before anything is made.
#include <gtest/gtest.h>

#include "runtime/ObjectOpsSupport.h"

using namespace objopstest;

namespace {

// How the copy's field stands to the source's: "equal" or "unequal" values, the "same" reference
// (a free-form field: the same Dictionary behind its Dict), or "rebuilt" (another, equal object).
std::string Relation(const SarnObject* copy, const SarnObject* source, const FieldInfo* f) {
  VekCore *mine = FieldAccess::ReferenceAt(copy, *f, 0), *theirs = FieldAccess::ReferenceAt(source, *f, 0);
  if (f->dataType == SARN_DATA_TYPE_ANY_DICT) return static_cast<Dict*>(mine)->dictionaryM == static_cast<Dict*>(theirs)->dictionaryM ? "same" : "copied";
  if (TraitsOf(f->dataType).isHoldingObjects) return mine == theirs ? "same" : *static_cast<SarnObject*>(mine) == *static_cast<SarnObject*>(theirs) ? "rebuilt" : "unequal";
  return SarnObject::SingleFieldEquals(f, FieldStorage(const_cast<SarnObject*>(copy), *f), FieldStorage(const_cast<SarnObject*>(source), *f)) ? "equal" : "unequal";
}

}  // namespace

// Rows: "text VERSION compact|pretty" => JSON of an object => the text of all three members => -;
// "clone ID type.field" => the field's value (as Side takes it) => the copy's field's text ("-":
// not written, "null": no copy) => its Relation to the source's, or without a copy "refused"
// (nothing was allocated) or "none".
TEST(ObjectConvert, TextsAndCopiesFromTable) {
  VekMempool pool("conversions");
  for (int round = 0; round < 2; ++round, DestroyGlobalSarnHashTable()) {
    for (const auto& row : sarntest::ReadTable("objects/conversions.txt", 4)) {
      std::stringstream words(row[0]);
      std::string op, number, subject, what = row[0] + " of " + row[1];
      words >> op >> number >> subject;
      const FieldInfo* f = nullptr;
      ref<SarnObject> object = op == "text" ? FromJson(&pool, row[1]) : Side(&pool, subject, row[1], f);
      if (op == "text") {
        const bool isPretty = subject == "pretty";
        const std::string texts[] = {Str(object->ToString(isPretty, std::stoi(number))),
                                     Str(object->ToDictionary(std::stoi(number))->ToJson(isPretty)),
                                     Str(object->ToDict(std::stoi(number))->ToString(isPretty))};
        for (const std::string& text : texts) EXPECT_EQ(text, row[2]) << what;
        continue;
      }
      pool.FailAllocationAfter(1000000);
      ref<SarnObject> copy = object->Clone(static_cast<unsigned>(std::stoul(number)));
      const bool isRefused = pool.GetFailCountdown() == 1000000;  // before anything was allocated
      pool.FailAllocationAfter(-1);
      ref<Dictionary> tree = copy ? copy->ToDictionary(0) : nullptr;
      const VekString name(FieldName(object->GetStructInfo(), *f));
      const std::string text = !tree ? "null" : tree->CountValues(name) == 0 ? "-" : Str(tree->GetString(name));
      EXPECT_EQ(text.empty() ? Str(tree->Get(name)->ToJson(false)) : text, row[2]) << what;  // not a string: its JSON
      EXPECT_TRUE(!copy || (copy->GetTypeId() == object->GetTypeId() && copy->GetMempool() == &pool)) << what;
      EXPECT_EQ(copy ? Relation(copy.Get(), object.Get(), f) : isRefused ? "refused" : "none", row[3]) << what;
    }
  }
  EXPECT_EQ(pool.GetUsedBytes(), 0u);
  // The readers' limit counts each list twice (its dictionary and its item array), then the success.
  EXPECT_TRUE(Nest(&pool, JsonLimits::kDefaultMaxDepth / 2 - 1, "")->Clone(644) && !Nest(&pool, JsonLimits::kDefaultMaxDepth / 2, "")->Clone(644));
  ref<SarnObject> error = FromJson(&pool, R"({"type": "error", "code": "timeout", "traceInfo": {"a": "1"}})");
  ref<SarnObject> copy = error->Clone(191);
  ASSERT_TRUE(dynamic_cast<sarnschema::Error*>(copy.Get()) != nullptr);
  static_cast<sarnschema::Error*>(error.Get())->traceInfoM->AddString("b", "2");
  EXPECT_TRUE(*copy == *error && static_cast<sarnschema::Error*>(copy.Get())->traceInfoM->CountValues("b") == 1);
}
