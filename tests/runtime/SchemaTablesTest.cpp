// The compiled default schema: record bytes, object layouts, the representative types field for
// field (tests/data/generator/fields.txt), the published statistics, the struct-name table and the
// field-selection rules.
#include <cstring>
#include <set>
#include <sstream>
#include <string>
#include <vector>

#include "sarn/Sarn.h"
#include "testutil/TestUtil.h"

using namespace sarn;

namespace {

const StructInfo* Type(const char* name) {
  const StructInfo* info = StructInfoMap::LookupStructByName(name);
  EXPECT_NE(info, nullptr) << name;
  return info;
}

const char* const kDataTypeNames[] = {"bool", "bytestring", "channelNumber", "currency", "date", "dateTime", "anyDict",
                                      "enum", "float", "intId", "longId", "stringId", "knownDict", "knownDictAsLazy",
                                      "subdict", "s64", "s32", "string", "time", "u32", "u64"};
const char* const kArityNames[] = {"optional", "required", "multi", "none"};

std::string Describe(const StructInfo* info, const FieldInfo& f) {
  std::ostringstream out;
  out << FieldName(info, f) << " " << kDataTypeNames[f.dataType] << " " << kArityNames[f.arity] << " "
      << int(f.minVersion) << "-" << int(f.maxVersion);
  if (f.refIndex != 0) out << " [" << f.refIndex << "]";
  return out.str();
}

// "n name type arity min-max [ref]" per field number in use (or only the one named), older
// records indented below.
std::string Fields(const StructInfo* info, const std::string& only = "") {
  std::ostringstream out;
  for (unsigned n = 0; info != nullptr && n < info->nFieldInfo; ++n) {
    const FieldInfo& f = info->vFieldInfo[n];
    if (f.arity == SARN_ARITY_NONE || (!only.empty() && only != FieldName(info, f))) continue;
    out << n << " " << Describe(info, f) << "\n";
    const FieldInfoHistory& h = info->vFieldInfoHistory[n];
    for (uint32_t i = 0; i < h.nFieldInfo; ++i) out << "  older " << Describe(info, h.vFieldInfo[i]) << "\n";
  }
  return out.str();
}

// "number=name" for each named value, then the count of numbers.
std::string EnumValues(long id) {
  const EnumDef* def = EnumDefForId(id);
  if (def == nullptr) return "missing";
  std::string text;
  for (uint64_t i = 0; i < def->nValue; ++i) {
    if (def->vName[i] != nullptr) text += std::to_string(i) + "=" + def->vName[i] + " ";
  }
  return text + "nValue " + std::to_string(def->nValue);
}

size_t OffsetOf(const void* object, const void* member) { return static_cast<const char*>(member) - static_cast<const char*>(object); }

}  // namespace

TEST(SchemaTables, AddressRecordsByteForByte) {
  static const unsigned char kRecords[9][12] = {
      {0x00, 0x00, 0x75, 0x00, 0x00, 0x00, 0x00, 0x00, 0x00, 0x00, 0x00, 0x00},
      {0x07, 0x2a, 0x0a, 0x0c, 0x20, 0x00, 0xbf, 0x00, 0x00, 0x00, 0x00, 0x00},
      {0x07, 0x2a, 0x31, 0x00, 0x28, 0x00, 0x00, 0x00, 0x0a, 0x00, 0x00, 0x00},
      {0x07, 0x2a, 0x31, 0x00, 0x30, 0x00, 0x00, 0x00, 0x0f, 0x00, 0x00, 0x00},
      {0x07, 0x2a, 0x87, 0x0c, 0x38, 0x00, 0xca, 0x02, 0x17, 0x00, 0x00, 0x00},
      {0x07, 0x2a, 0x31, 0x00, 0x40, 0x00, 0x00, 0x00, 0x25, 0x00, 0x00, 0x00},
      {0x07, 0x2a, 0x31, 0x00, 0x48, 0x00, 0x00, 0x00, 0x30, 0x00, 0x00, 0x00},
      {0x07, 0x2a, 0x31, 0x00, 0x50, 0x00, 0x00, 0x00, 0x36, 0x00, 0x00, 0x00},
      {0x07, 0x2a, 0x11, 0x0d, 0x58, 0x00, 0x00, 0x00, 0x3e, 0x00, 0x00, 0x00}};
  const StructInfo* info = Schema::vStructDefG[191];
  ASSERT_TRUE(info == &sarnschema::Address::structInfoG && info->nFieldInfo == 9);
  EXPECT_EQ(std::string(info->pName) + " " + info->pIdPrefix, "address vask:ds.");
  EXPECT_TRUE(std::memcmp(info->vFieldInfo, kRecords, sizeof kRecords) == 0 && info->pFieldNames == sarnschema::Address::pFieldNamesG);
  EXPECT_EQ(std::string(info->pFieldNames, 70),
            std::string("addressId\0city\0country\0levelOfDetail\0postalCode\0state\0street1\0street2\0", 70));
  for (int i = 0; i < 9; ++i) EXPECT_EQ(info->vFieldInfoHistory[i].nFieldInfo, 0u);
  static_assert(sizeof(sarnschema::Address) == 96, "the address object's size");
  // The bit fields over the record's bytes: LONG_ID, optional, flag at byte 24.
  const FieldInfo& id = info->vFieldInfo[1];
  EXPECT_EQ(std::vector<int>({id.typeBits, id.flagOffset, id.dataType, id.arity}),
            std::vector<int>({0x0C0A, 24, SARN_DATA_TYPE_LONG_ID, SARN_ARITY_OPTIONAL}));
}

TEST(SchemaTables, ObjectLayouts) {
  VekMempool pool("layout");
  {
    ref<SarnObject> object = sarnschema::ChannelIdentifier::Factory(&pool);
    auto* c = static_cast<sarnschema::ChannelIdentifier*>(object.Get());
    EXPECT_EQ(std::vector<size_t>({OffsetOf(c, &c->typeIdM), OffsetOf(c, &c->fHasChannelNumberM),
                                   OffsetOf(c, &c->fHasPartnerStationIdM), OffsetOf(c, &c->fHasSourceTypeM),
                                   OffsetOf(c, &c->fHasStationIdM), OffsetOf(c, &c->channelNumberM),
                                   size_t(c->structInfoG.vFieldInfo[1].valueOffset)}),
              std::vector<size_t>({20, 24, 25, 26, 27, 28, 28}));
    ref<SarnObject> account = sarnschema::Account::Factory(&pool);
    auto* a = static_cast<sarnschema::Account*>(account.Get());
    EXPECT_EQ(std::vector<size_t>({OffsetOf(a, &a->accountIdM), OffsetOf(a, &a->bodyIdM), sizeof(sarnschema::Account)}),
              std::vector<size_t>({24, 32, 56}));
  }
  const StructInfo* all = Type("testAllTypes");
  std::set<int> flags;
  int firstValue = 1 << 16;
  for (unsigned n = 1; n < all->nFieldInfo; ++n) {
    if (all->vFieldInfo[n].flagOffset != 0) flags.insert(all->vFieldInfo[n].flagOffset);
    firstValue = std::min<int>(firstValue, all->vFieldInfo[n].valueOffset);
  }
  EXPECT_EQ(std::vector<int>({int(flags.size()), *flags.begin(), *flags.rbegin(), firstValue, all->nFieldInfo}),
            std::vector<int>({21, 24, 44, 48, 79}));
  EXPECT_TRUE(sizeof(sarnschema::TestAllTypes) == 1088 && pool.GetUsedBytes() == 0);
}

TEST(SchemaTables, RepresentativeTypesFieldForField) {
  std::string text;
  ASSERT_TRUE(sarntest::ReadFile(std::string(getenv("SARN_SOURCE_DIR")) + "/tests/data/generator/fields.txt", text));
  std::string line, section, expected;
  int sections = 0;
  for (std::istringstream in(text + "\n== end\n"); std::getline(in, line);) {
    if (line.rfind("== ", 0) == 0) {
      size_t dot = section.find('.');
      if (section.rfind("enum ", 0) == 0) {
        EXPECT_EQ(EnumValues(std::stol(section.substr(5))) + "\n", expected) << section;
      } else if (!section.empty()) {
        EXPECT_EQ(Fields(Type(section.substr(0, dot).c_str()), dot == std::string::npos ? "" : section.substr(dot + 1)),
                  expected)
            << section;
      }
      sections += !section.empty();
      section = line.substr(3);
      expected.clear();
    } else if (!line.empty() && line[0] != '#') {
      expected += line + "\n";
    }
  }
  EXPECT_EQ(sections, 24);
  EXPECT_EQ(Type("kernoCurrentTimeGet")->nFieldInfo, 1);
}

// Every type of the list (all of them: the registry holds no other) has its id, name and prefix,
// is found by its name within five probes, and its factory makes an object of it whose optional
// fields are all absent; its records keep the rules below; and the counts are the published ones.
TEST(SchemaTables, EveryTypeOfTheListAndThePublishedStatistics) {
  VekMempool pool("factories");
  static const unsigned char kPlaceholder[12] = {0, 0, 0x75, 0, 0, 0, 0, 0, 0, 0, 0, 0};
  std::string text, line;
  ASSERT_TRUE(sarntest::ReadFile(std::string(getenv("SARN_SOURCE_DIR")) + "/tests/data/generator/default-types.txt", text));
  int count = 0, worst = 0, filled = 0, slots = 0, records = 0, placeholders = 0, largest = 0, alphabetical = 0,
      olderFields = 0;
  std::string largestName;
  std::set<std::string> typesWithOlder;
  const EnumDef* typeNames = EnumDefForId(1361);
  ASSERT_NE(typeNames, nullptr);
  EXPECT_EQ(typeNames->nValue, 5934u);
  for (std::istringstream in(text); std::getline(in, line);) {
    if (line.empty() || line[0] == '#') continue;
    std::istringstream words(line);
    int id;
    std::string name, prefix;
    words >> id >> name >> prefix;
    const StructInfo* info = StructInfoForId(id);
    ASSERT_NE(info, nullptr) << line;
    EXPECT_EQ(info->pName, name) << line;
    EXPECT_EQ(info->pIdPrefix == nullptr ? "-" : info->pIdPrefix, prefix) << line;
    EXPECT_STREQ(typeNames->vName[id], name.c_str()) << line;
    EXPECT_EQ(StructInfoMap::LookupStructByName(info->pName), info);
    ++count;
    ref<SarnObject> object = info->pFactory(&pool);
    ASSERT_TRUE(object) << name;
    EXPECT_TRUE(object->GetRefCount() == 1 && object->GetTypeId() == static_cast<uint32_t>(id) &&
                object->GetMempool() == &pool && object->GetStructInfo() == info && object->GetTypeName() == info->pName)
        << name;
    uint32_t slot = StructInfoMap::HomeSlot(info->pName, Schema::structNameHashTableSizeG);
    int probes = 1;
    for (; Schema::structNameHashTableG[slot] != info; ++probes) slot = (slot + 1) % Schema::structNameHashTableSizeG;
    worst = std::max(worst, probes);
    records += info->nFieldInfo;
    if (info->nFieldInfo > largest) largest = info->nFieldInfo, largestName = name;
    std::vector<std::string> sinceFirst;
    for (unsigned n = 0; n < info->nFieldInfo; ++n) {
      const FieldInfo& f = info->vFieldInfo[n];
      EXPECT_FALSE(f.arity == SARN_ARITY_OPTIONAL && IsFieldPresent(object.Get(), f)) << name << " " << n;
      if (std::memcmp(&f, kPlaceholder, sizeof kPlaceholder) == 0) {
        ++placeholders;
        continue;
      }
      EXPECT_NE(f.arity, SARN_ARITY_NONE);
      if (f.minVersion == Schema::firstSchemaVersionG) sinceFirst.push_back(FieldName(info, f));
      // Fields found through a reference name a real enum or type; lazy payloads are required.
      EXPECT_TRUE(f.dataType != SARN_DATA_TYPE_ENUM || EnumDefForId(f.refIndex) != nullptr) << name;
      EXPECT_TRUE(f.dataType != SARN_DATA_TYPE_SUBDICT || StructInfoForId(f.refIndex) != nullptr) << name;
      EXPECT_TRUE(f.dataType != SARN_DATA_TYPE_KNOWN_DICT_AS_LAZY || f.arity == SARN_ARITY_REQUIRED) << name;
      const FieldInfoHistory& h = info->vFieldInfoHistory[n];
      // Exactly the optional records that hold no reference, older ones included, carry a flag.
      for (uint32_t i = 0; i <= h.nFieldInfo; ++i) {
        const FieldInfo& r = i == 0 ? f : h.vFieldInfo[i - 1];
        bool isReference = FieldAccess::StorageOf(r.dataType) == FieldAccess::STORAGE_REFERENCE;
        EXPECT_EQ(r.flagOffset != 0, r.arity == SARN_ARITY_OPTIONAL && !isReference) << name << " " << n;
      }
      if (h.nFieldInfo == 0) continue;
      // At most one older representation, in a slot of its own under the same name.
      EXPECT_TRUE(h.nFieldInfo == 1 && h.vFieldInfo[0].valueOffset != f.valueOffset &&
                  h.vFieldInfo[0].nameOffset == f.nameOffset)
          << name;
      ++olderFields;
      typesWithOlder.insert(name);
    }
    alphabetical += std::is_sorted(sinceFirst.begin(), sinceFirst.end());
  }
  EXPECT_LE(worst, 5);
  for (int id = 0; id < Schema::nStructDefG; ++id) filled += Schema::vStructDefG[id] != nullptr;
  for (int slot = 0; slot < Schema::structNameHashTableSizeG; ++slot) slots += Schema::structNameHashTableG[slot] != nullptr;
  EXPECT_EQ(std::vector<int>({count, filled, slots, Schema::nStructDefG, Schema::nStructTypeG, Schema::firstSchemaVersionG,
                              Schema::lastSchemaVersionG, Schema::defaultSchemaVersionG, Schema::structNameHashTableSizeG,
                              records, placeholders, largest, olderFields, int(typesWithOlder.size()), alphabetical}),
            std::vector<int>({1272, 1272, 1272, 5919, 1272, 7, 42, 42, 3532, 10535, 1803, 197, 19, 15, 975}));
  EXPECT_EQ(largestName, "recording");
  EXPECT_EQ(StructInfoForId(5919), nullptr);
  EXPECT_EQ(StructInfoForId(-1), nullptr);
  EXPECT_EQ(StructInfoMap::HomeSlot("ad", 3532), 3107u);
  EXPECT_EQ(StructInfoMap::LookupStructByName("address"), &sarnschema::Address::structInfoG);
  for (const char* miss : {"Address", "", "addres", "addressX"}) EXPECT_EQ(StructInfoMap::LookupStructByName(miss), nullptr) << miss;
  EXPECT_EQ(StructInfoMap::LookupStructByName(nullptr), nullptr);
  EXPECT_EQ(sarnschema::Ad::Factory(&pool)->GetTypeId(), 140u);
  EXPECT_EQ(pool.GetUsedBytes(), 0u);

  int enums = 0, withGaps = 0;
  for (int id = 0; id < Schema::nEnumDefG; ++id) {
    const EnumDef* def = Schema::vEnumDefG[id];
    if (def == nullptr) continue;
    ++enums;
    EXPECT_TRUE(id >= 668 && id <= 5800 && StructInfoForId(id) == nullptr) << "enum id " << id << " out of range or a type id";
    bool gap = false;
    for (uint64_t i = 0; i < def->nValue; ++i) gap = gap || def->vName[i] == nullptr;
    withGaps += gap;
  }
  EXPECT_EQ(std::vector<int>({enums, Schema::nEnumTypeG, Schema::nEnumDefG, withGaps}),
            std::vector<int>({378, 378, 5801, 346}));
  EXPECT_TRUE(Schema::vEnumDefG[668] != nullptr && Schema::vEnumDefG[5800] != nullptr);
  const StructInfo* success = Type("success");
  for (unsigned n = 0; n < success->nFieldInfo; ++n) EXPECT_NE(success->vFieldInfo[n].arity, SARN_ARITY_REQUIRED);
}

TEST(SchemaTables, FieldSelectionByVersion) {
  // endUserMessageId: required up to 21 (the older record, no flag), optional from 22.
  const StructInfo* info = Type("endUserMessage");
  const FieldInfo* current = &sarntest::FieldNamed(info, "endUserMessageId");
  unsigned n = static_cast<unsigned>(current - info->vFieldInfo);
  const FieldInfo* older = &info->vFieldInfoHistory[n].vFieldInfo[0];
  EXPECT_TRUE(older->flagOffset == 0 && current->flagOffset != 0);
  // Version 0 never consults the history; the placeholder and numbers past the end give nothing.
  const struct {
    unsigned number;
    KernoVersion version;
    const FieldInfo* expected;
  } kCases[] = {{n, 21, older}, {n, 7, older}, {n, 22, current}, {n, 0, current}, {n, 6, nullptr},
                {n, 43, nullptr}, {0, 0, nullptr}, {info->nFieldInfo, 0, nullptr}};
  for (const auto& c : kCases) EXPECT_EQ(FieldForVersion(info, c.number, c.version), c.expected) << c.version;

  // A field dropped after version 7 takes part at 7 and at 0 only.
  const StructInfo* ad = Type("ad");
  const FieldInfo& imageUrl = ad->vFieldInfo[6];
  EXPECT_TRUE(FieldTakesPart(imageUrl, 0) && FieldTakesPart(imageUrl, 7));
  EXPECT_FALSE(FieldTakesPart(imageUrl, 8));
  EXPECT_FALSE(FieldTakesPart(ad->vFieldInfo[0], 0));
}
