// The object operations: equality by its rules from a table and as a property of seeded random
// objects and their copies (every change to a copy is seen, and undoing it makes them equal
// again), depth compared without C stack, and the conversion members and Clone from a table.
#include <cstring>
#include <utility>

#include "runtime/ObjectOpsSupport.h"
#include "testutil/RandomObject.h"

using namespace objopstest;

// Rows: subject => one side => the other => equal or unequal, compared both ways. A subject
// "type.field" compares that field's storage through SingleFieldEquals or MultiFieldEquals (sides
// as Side takes them) where both sides have the field, then, for a type without byte strings, the
// whole objects, which must agree and allocate nothing unless they hold free-form or lazy fields;
// a bare type compares whole objects read from JSON ('=': the same object).
TEST(ObjectEquality, RulesFromTable) {
  VekMempool pool("rules");
  for (const auto& row : sarntest::ReadTable("objects/equality.txt", 4)) {
    const std::string what = row[0] + ": " + row[1] + " against " + row[2];
    const bool isEqual = row[3] == "equal", isObjects = row[0].find('.') == std::string::npos;
    const FieldInfo* f = nullptr;
    ref<SarnObject> a = isObjects ? FromJson(&pool, row[1]) : Side(&pool, row[0], row[1], f);
    ref<SarnObject> b = row[2] == "=" ? a : isObjects ? FromJson(&pool, row[2]) : Side(&pool, row[0], row[2], f);
    ASSERT_TRUE(a && b) << what;
    if (!isObjects && IsFieldPresent(a.Get(), *f) && IsFieldPresent(b.Get(), *f)) {
      auto equals = f->arity == SARN_ARITY_MULTI ? &SarnObject::MultiFieldEquals : &SarnObject::SingleFieldEquals;
      EXPECT_EQ(equals(f, FieldStorage(a.Get(), *f), FieldStorage(b.Get(), *f)), isEqual) << what;
      EXPECT_EQ(equals(f, FieldStorage(b.Get(), *f), FieldStorage(a.Get(), *f)), isEqual) << what;
    }
    if (!isObjects && Holds(a->GetTypeId(), SARN_DATA_TYPE_BYTESTRING, true)) continue;
    pool.FailAllocationAfter(1000000);
    EXPECT_TRUE((*a == *b) == isEqual && (*b != *a) != isEqual) << what;
    const bool isPlain = !Holds(a->GetTypeId(), SARN_DATA_TYPE_ANY_DICT, true) && !Holds(a->GetTypeId(), SARN_DATA_TYPE_KNOWN_DICT_AS_LAZY, true);
    EXPECT_TRUE(isObjects || !isPlain || pool.GetFailCountdown() == 1000000) << what << ": allocations made by a comparison";
    pool.FailAllocationAfter(-1);
  }
  EXPECT_EQ(pool.GetUsedBytes(), 0u);
}

// Depth compares without C stack; arrays are read with their own element widths.
TEST(ObjectEquality, DepthAndArrayWidths) {
  VekMempool pool("deep");
  VekGenericIntArray narrow(4, &pool, 0), wide(8, &pool, 0);
  for (uint64_t value : {uint64_t{7}, uint64_t{0xFFFFFFFF}}) narrow.Add(&value), wide.Add(&value);
  const FieldInfo* ints = FieldNamed(StructInfoForId(1259), "intMulti");
  EXPECT_TRUE(SarnObject::MultiFieldEquals(ints, &narrow, &wide) && SarnObject::MultiFieldEquals(ints, &wide, &narrow));
  EXPECT_FALSE(SarnObject::MultiFieldEquals(FieldNamed(StructInfoForId(1259), "floatMulti"), &narrow, &wide));
  const int depth = 10 * JsonLimits::kDefaultMaxDepth;
  ref<SarnObject> a = Nest(&pool, depth, "bottom"), b = Nest(&pool, depth, "bottom"), c = Nest(&pool, depth, "other");
  sarntest::RunOnStack(256 * 1024, [&] { EXPECT_TRUE(*a == *b && *a != *c && *c != *a); });
}

// Seeded random objects (every value with a text that reads back) equal themselves and their
// copies made by Clone, by JSON and by the binary form; changing one field anywhere in a copy
// (presence flipped, the lowest byte of a first value or the highest of a last one, a single
// string or reference swapped out, an element added, which seen from the other side is one
// removed) makes the two unequal in both orders, and undoing it makes them equal again.
namespace {

// Makes change `kind` to `field` of `o`, or undoes it; false when it does not apply. `spare` is
// what a single string or reference is swapped with (both are one pointer).
bool Change(SarnObject* o, const FieldInfo& field, int kind, bool isUndo, uint64_t& spare) {
  const DataTypeTraits& traits = TraitsOf(field.dataType);
  const unsigned count = FieldAccess::Count(o, field);
  const bool isMulti = field.arity == SARN_ARITY_MULTI, isPresent = isUndo || IsFieldPresent(o, field);
  if (kind == 0 && field.arity == SARN_ARITY_OPTIONAL && field.flagOffset != 0) {
    reinterpret_cast<uint8_t*>(o)[field.flagOffset] ^= 1;
  } else if ((kind == 1 || kind == 2) && traits.storage == DataTypeTraits::STORAGE_SCALAR && isPresent && count > 0) {
    const unsigned at = kind == 1 ? 0 : field.dataType == SARN_DATA_TYPE_ENUM ? 1 : traits.width - 1;  // enums: 16 bits
    static_cast<uint8_t*>(const_cast<void*>(FieldAccess::ScalarAt(o, field, kind == 1 ? 0 : count - 1)))[at] ^= 1;
  } else if (kind == 3 && !isMulti && isPresent && traits.storage != DataTypeTraits::STORAGE_SCALAR) {
    std::swap(FieldRef<uint64_t>(o, field), spare);
  } else if (kind == 4 && isMulti && !isUndo) {
    const uint64_t zero = 0;
    traits.storage == DataTypeTraits::STORAGE_SCALAR   ? FieldAccess::PutScalar(o, field, &zero)
    : traits.storage == DataTypeTraits::STORAGE_STRING ? FieldAccess::PutString(o, field, VekString("\x7f"))
                                                       : FieldAccess::PutReference(o, field, nullptr);
  } else if (kind == 4 && isMulti) {
    traits.storage == DataTypeTraits::STORAGE_SCALAR   ? FieldRef<VekGenericIntArray>(o, field).RemoveAt(static_cast<int>(count) - 1)
    : traits.storage == DataTypeTraits::STORAGE_STRING ? FieldRef<VekStringArray>(o, field).RemoveAt(static_cast<int>(count) - 1)
                                                       : FieldRef<VekGenericArray>(o, field).RemoveAt(static_cast<int>(count) - 1);
  } else {
    return false;
  }
  return true;
}

// Every change to every field of `target` inside `copy`, and of its first nested objects down to `depth` levels.
void ExpectChangesSeen(const SarnObject& original, const SarnObject& copy, SarnObject* target, int depth, const std::string& what) {
  const StructInfo* info = target->GetStructInfo();
  for (unsigned n = 0; n < info->nFieldInfo; ++n) {
    const FieldInfo& field = info->vFieldInfo[n];
    const std::string name = what + "." + (field.arity == SARN_ARITY_NONE ? "" : FieldName(info, field));
    VekString text("\x7f");
    for (int kind = 0; kind < 5; ++kind) {
      uint64_t spare = 0;
      if (TraitsOf(field.dataType).storage == DataTypeTraits::STORAGE_STRING) std::memcpy(&spare, &text, sizeof spare);
      if (!Change(target, field, kind, false, spare)) continue;
      EXPECT_TRUE(original != copy && copy != original) << name << " change " << kind;
      Change(target, field, kind, true, spare);
      ASSERT_TRUE(original == copy) << name << " undone " << kind;
    }
    const bool isObject = field.dataType == SARN_DATA_TYPE_KNOWN_DICT || field.dataType == SARN_DATA_TYPE_SUBDICT;
    auto* inner = isObject && IsFieldPresent(target, field) && FieldAccess::Count(target, field) > 0 ? FieldAccess::ReferenceAt(target, field, 0) : nullptr;
    if (depth > 0 && inner != nullptr) ExpectChangesSeen(original, copy, static_cast<SarnObject*>(inner), depth - 1, name);
  }
}

// How the copy's field stands to the source's: "equal" or "unequal" values, the "same" reference
// (a free-form field: the same Dictionary behind its Dict), or "rebuilt" (another, equal object).
std::string Relation(const SarnObject* copy, const SarnObject* source, const FieldInfo* f) {
  VekCore *mine = FieldAccess::ReferenceAt(copy, *f, 0), *theirs = FieldAccess::ReferenceAt(source, *f, 0);
  if (f->dataType == SARN_DATA_TYPE_ANY_DICT) return static_cast<Dict*>(mine)->dictionaryM == static_cast<Dict*>(theirs)->dictionaryM ? "same" : "copied";
  if (TraitsOf(f->dataType).isHoldingObjects) return mine == theirs ? "same" : *static_cast<SarnObject*>(mine) == *static_cast<SarnObject*>(theirs) ? "rebuilt" : "unequal";
  return SarnObject::SingleFieldEquals(f, FieldStorage(const_cast<SarnObject*>(copy), *f), FieldStorage(const_cast<SarnObject*>(source), *f)) ? "equal" : "unequal";
}

}  // namespace

TEST(ObjectEqualityProperty, CopiesAreEqualAndEveryChangeIsSeen) {
  VekMempool pool("property");
  {
    std::vector<unsigned> types = {346, 470, 543, 974, 1259};
    for (sarntest::RandomObjects draw(&pool, 17, {}); types.size() < 5 + 200;) {
      const unsigned id = static_cast<unsigned>(draw.Next(Schema::nStructDefG));
      if (StructInfoForId(id) != nullptr) types.push_back(id);
    }
    // Known dicts hold objects of the first four (no byte string set, no payload).
    sarntest::RandomObjects objects(&pool, 2026, {346, 470, 543, 974}, 3, false);
    for (int i = 0; i < 1200; ++i) {
      const unsigned id = i < 1000 ? types[i % 5] : types[5 + i - 1000];
      const std::string what = "object " + std::to_string(i) + " of type " + std::to_string(id);
      ref<SarnObject> made = objects.Make(id);
      if (Holds(id, SARN_DATA_TYPE_BYTESTRING, false)) {
        EXPECT_TRUE(id != 1259 || *made != *made) << what;  // a required byte string
        continue;
      }
      // Floats and ids as the dictionary texts give them back, control characters as the JSON
      // escapes that the readers keep as they are.
      auto jsonCopy = [&](const ref<SarnObject>& o) { return o ? FromJson(&pool, Str(JsonSarnObject(&pool).SarnObjectToJson(o.Get(), 0))) : o; };
      ref<SarnObject> object = jsonCopy(made->Clone(id));
      ref<SarnObject> copies[] = {object, object ? object->Clone(543) : object, jsonCopy(object), object ? BinaryCopy(&pool, object.Get()) : object};
      for (const ref<SarnObject>& copy : copies) {
        ASSERT_TRUE(copy && *object == *copy && *copy == *object) << what << ", copy " << (&copy - copies) << ": " << Str(made->ToString(false, 0));
      }
      ExpectChangesSeen(*object, *copies[2], copies[2].Get(), 2, what);
      if (HasFatalFailure()) return;
    }
  }
  EXPECT_EQ(pool.GetLiveBlocks(), 0u);
}

// The conversion members and Clone from a table: the texts of ToString, ToDictionary and ToDict
// (also with a rebuilt name cache), and per field what a copy through the dictionary texts gives
// back, whether it shares the source's value, and which ids are refused before anything is made.
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
