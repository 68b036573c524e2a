// The compiled default schema: record bytes, object layouts, the representative types field for
// field, the published statistics, the struct-name table and the field-selection rules.
#include <cstring>
#include <fstream>
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

bool IsPlaceholder(const FieldInfo& f) {
  static const unsigned char kBytes[12] = {0, 0, 0x75, 0, 0, 0, 0, 0, 0, 0, 0, 0};
  return std::memcmp(&f, kBytes, sizeof kBytes) == 0;
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

// "n name type arity min-max [ref]" per field number in use, older records indented below.
std::string Fields(const char* typeName) {
  const StructInfo* info = Type(typeName);
  if (info == nullptr) return "";
  std::ostringstream out;
  for (unsigned n = 0; n < info->nFieldInfo; ++n) {
    const FieldInfo& f = info->vFieldInfo[n];
    if (f.arity == SARN_ARITY_NONE) continue;
    out << n << " " << Describe(info, f) << "\n";
    const FieldInfoHistory& h = info->vFieldInfoHistory[n];
    for (uint32_t i = 0; i < h.nFieldInfo; ++i) out << "  older " << Describe(info, h.vFieldInfo[i]) << "\n";
  }
  return out.str();
}

size_t OffsetOf(const void* object, const void* member) {
  return static_cast<const char*>(member) - static_cast<const char*>(object);
}

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
  ASSERT_EQ(info, &sarnschema::Address::structInfoG);
  EXPECT_STREQ(info->pName, "address");
  EXPECT_STREQ(info->pIdPrefix, "vask:ds.");
  ASSERT_EQ(info->nFieldInfo, 9);
  EXPECT_EQ(std::memcmp(info->vFieldInfo, kRecords, sizeof kRecords), 0);
  const char* const kNames[] = {"addressId", "city", "country", "levelOfDetail", "postalCode", "state", "street1", "street2"};
  const int kOffsets[] = {0, 10, 15, 23, 37, 48, 54, 62};
  for (int i = 0; i < 8; ++i) {
    EXPECT_EQ(info->vFieldInfo[i + 1].nameOffset, kOffsets[i]);
    EXPECT_STREQ(info->pFieldNames + kOffsets[i], kNames[i]);
  }
  EXPECT_EQ(info->pFieldNames, sarnschema::Address::pFieldNamesG);
  for (int i = 0; i < 9; ++i) EXPECT_EQ(info->vFieldInfoHistory[i].nFieldInfo, 0u);
  EXPECT_EQ(sizeof(sarnschema::Address), 96u);
  // The example of the typeBits layout: LONG_ID, optional, flag at byte 24.
  EXPECT_EQ(info->vFieldInfo[1].typeBits, 0x0C0A);
  EXPECT_EQ(info->vFieldInfo[1].flagOffset, 24);
  EXPECT_EQ(info->vFieldInfo[1].dataType, SARN_DATA_TYPE_LONG_ID);
  EXPECT_EQ(info->vFieldInfo[1].arity, SARN_ARITY_OPTIONAL);
}

TEST(SchemaTables, ObjectLayouts) {
  VekMempool pool("layout");
  {
    ref<SarnObject> object = sarnschema::ChannelIdentifier::Factory(&pool);
    auto* c = static_cast<sarnschema::ChannelIdentifier*>(object.Get());
    EXPECT_EQ(OffsetOf(c, &c->typeIdM), 20u);
    EXPECT_EQ(OffsetOf(c, &c->fHasChannelNumberM), 24u);
    EXPECT_EQ(OffsetOf(c, &c->fHasPartnerStationIdM), 25u);
    EXPECT_EQ(OffsetOf(c, &c->fHasSourceTypeM), 26u);
    EXPECT_EQ(OffsetOf(c, &c->fHasStationIdM), 27u);
    EXPECT_EQ(OffsetOf(c, &c->channelNumberM), 28u);
    EXPECT_EQ(c->structInfoG.vFieldInfo[1].valueOffset, 28);
  }
  {
    ref<SarnObject> object = sarnschema::Account::Factory(&pool);
    auto* a = static_cast<sarnschema::Account*>(object.Get());
    EXPECT_EQ(OffsetOf(a, &a->accountIdM), 24u);
    EXPECT_EQ(OffsetOf(a, &a->bodyIdM), 32u);
    EXPECT_EQ(sizeof(sarnschema::Account), 56u);
  }
  const StructInfo* all = Type("testAllTypes");
  std::set<int> flags;
  int firstValue = 1 << 16;
  for (unsigned n = 1; n < all->nFieldInfo; ++n) {
    if (all->vFieldInfo[n].flagOffset != 0) flags.insert(all->vFieldInfo[n].flagOffset);
    firstValue = std::min<int>(firstValue, all->vFieldInfo[n].valueOffset);
  }
  EXPECT_EQ(flags.size(), 21u);
  EXPECT_EQ(*flags.begin(), 24);
  EXPECT_EQ(*flags.rbegin(), 44);
  EXPECT_EQ(firstValue, 48);
  EXPECT_EQ(all->nFieldInfo, 79);
  EXPECT_EQ(sizeof(sarnschema::TestAllTypes), 1088u);
  EXPECT_EQ(pool.GetUsedBytes(), 0u);
}

TEST(SchemaTables, RepresentativeTypesFieldForField) {
  EXPECT_EQ(Fields("account"), "1 accountId stringId required 7-42 [129]\n2 bodyId string multi 7-42\n");
  EXPECT_EQ(Fields("channelIdentifier"),
            "1 channelNumber channelNumber optional 7-42\n2 sourceType enum optional 7-42 [682]\n"
            "3 stationId longId optional 7-42 [523]\n4 partnerStationId string optional 7-42\n");
  EXPECT_EQ(Fields("ad"),
            "1 adBrandId intId required 7-42 [146]\n2 adGroupMapForAdId subdict multi 7-42 [164]\n"
            "3 adId intId required 7-42 [140]\n4 adInterestForAdId subdict optional 7-42 [169]\n"
            "5 description string optional 7-42\n6 imageUrl string optional 7-7\n7 isActive bool optional 7-42\n"
            "8 levelOfDetail enum optional 7-42 [714]\n9 maxStartTime dateTime optional 7-42\n"
            "10 minEndTime dateTime optional 7-42\n11 offerId stringId required 7-42 [423]\n"
            "12 shortDescription string required 7-42\n13 title string required 7-42\n14 image subdict multi 7-42 [968]\n");
  EXPECT_EQ(Fields("assetViewModify"),
            "1 bodyId string required 7-42\n2 savedPosition string optional 7-42\n3 assetId longId required 13-42 [219]\n"
            "  older assetId longId optional 7-12 [219]\n4 partnerOfferId string required 11-42\n");
  EXPECT_EQ(Fields("error"),
            "1 code enum required 7-42 [702]\n2 debug string optional 7-42\n3 text string required 7-42\n"
            "4 retryInterval s32 optional 7-42\n5 cause knownDict optional 7-42\n6 traceInfo anyDict optional 27-42\n");
  EXPECT_EQ(Fields("kernoRpcRequest"),
            "1 monitorFutureChanges bool required 7-42\n2 request knownDictAsLazy required 7-42\n"
            "3 rpcId s32 required 7-42\n4 kernoVersion s32 required 7-42\n5 partnerId intId optional 7-42 [433]\n"
            "6 sendAndForget bool optional 7-42\n7 headers anyDict optional 9-42\n");
  EXPECT_EQ(Fields("kernoRpcResponse"),
            "1 isFinalResponse bool required 7-42\n2 response knownDictAsLazy required 7-42\n3 rpcId s32 required 7-42\n"
            "4 kernoVersion s32 optional 7-42\n5 headers anyDict optional 9-42\n");
  EXPECT_EQ(Fields("kernoRpcCancel"), "1 rpcId s32 required 7-42\n2 headers anyDict optional 9-42\n");
  EXPECT_EQ(Fields("kernoRpcRequestUpdate"),
            "1 headers anyDict optional 9-42\n2 request knownDictAsLazy required 7-42\n3 rpcId s32 required 7-42\n");
  EXPECT_EQ(Fields("kernoRpcHello"), "1 identity string multi 7-42\n");
  EXPECT_EQ(Fields("kernoCurrentTimeGet"), "");
  EXPECT_EQ(Type("kernoCurrentTimeGet")->nFieldInfo, 1);

  // testAllTypes: a required, a multi and an optional field of each kind, in that order.
  const char* const kKinds[][3] = {
      {"anyDict", "anyDict", ""}, {"boolean", "bool", ""}, {"channelNumber", "channelNumber", ""},
      {"currency", "currency", ""}, {"date", "date", ""}, {"dateTime", "dateTime", ""}, {"enum", "enum", " [692]"},
      {"float", "float", ""}, {"idBase64", "stringId", " [137]"}, {"idBody", "string", ""}, {"idInt", "intId", " [463]"},
      {"idLong", "longId", " [320]"}, {"idString", "stringId", " [423]"}, {"imageUrl", "string", ""}, {"int", "s32", ""},
      {"knownDict", "knownDict", ""}, {"long", "s64", ""}, {"string", "string", ""}, {"struct", "subdict", " [543]"},
      {"time", "time", ""}, {"union", "knownDict", ""}, {"url", "string", ""}, {"idLongAndType", "string", ""},
      {"uri", "string", ""}, {"bytestring", "bytestring", ""}, {"idAnyBody", "string", ""}};
  std::ostringstream expected;
  int n = 1;
  for (const auto& kind : kKinds) {
    expected << n++ << " " << kind[0] << " " << kind[1] << " required 7-42" << kind[2] << "\n";
    expected << n++ << " " << kind[0] << "Multi " << kind[1] << " multi 7-42" << kind[2] << "\n";
    expected << n++ << " " << kind[0] << "Optional " << kind[1] << " optional 7-42" << kind[2] << "\n";
  }
  EXPECT_EQ(Fields("testAllTypes"), expected.str());
}

TEST(SchemaTables, NamedEnums) {
  auto names = [](long id) {
    std::string text;
    const EnumDef* def = EnumDefForId(id);
    if (def == nullptr) return std::string("missing");
    for (uint64_t i = 0; i < def->nValue; ++i) {
      if (def->vName[i] != nullptr) text += std::to_string(i) + "=" + def->vName[i] + " ";
    }
    return text + "nValue " + std::to_string(def->nValue);
  };
  EXPECT_EQ(names(692), "0=sunday 1=monday 2=tuesday 3=wednesday 4=thursday 5=friday 6=saturday nValue 7");
  EXPECT_EQ(names(714), "0=low 1=medium 2=high nValue 3");
  EXPECT_EQ(names(682).rfind("0=unknown 1=terrestrial 2=cable 3=satellite ", 0), 0u);
  EXPECT_EQ(EnumNumberName(702, 0), nullptr);
  EXPECT_STREQ(EnumNumberName(702, 1), "authenticationFailed");
  EXPECT_STREQ(EnumNumberName(702, 3), "badArgument");
  unsigned int number = 99;
  EXPECT_TRUE(EnumNameNumber(702, "internalError", number));
  // The video-resolution enum is the one asset.videoResolution names.
  const StructInfo* asset = Type("asset");
  long resolution = -1;
  for (unsigned i = 0; i < asset->nFieldInfo; ++i) {
    if (std::strcmp(FieldName(asset, asset->vFieldInfo[i]), "videoResolution") == 0 &&
        asset->vFieldInfo[i].arity != SARN_ARITY_NONE) {
      resolution = asset->vFieldInfo[i].refIndex;
    }
  }
  EXPECT_EQ(names(resolution), "1=sd 100=hd 200=uhd nValue 201");
}

TEST(SchemaTables, TypesIdsNamesAndPrefixes) {
  std::string text;
  ASSERT_TRUE(sarntest::ReadFile(std::string(getenv("SARN_SOURCE_DIR")) + "/tests/data/generator/default-types.txt", text));
  std::istringstream in(text);
  std::string line;
  int count = 0, prefixes = 0;
  std::set<std::string> distinctPrefixes;
  const EnumDef* typeNames = EnumDefForId(1361);
  ASSERT_NE(typeNames, nullptr);
  EXPECT_EQ(typeNames->nValue, 5934u);
  while (std::getline(in, line)) {
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
    if (prefix != "-") {
      ++prefixes;
      distinctPrefixes.insert(prefix);
      EXPECT_EQ(prefix.rfind("vask:", 0), 0u);
      EXPECT_EQ(prefix.back(), '.');
    }
    ++count;
  }
  EXPECT_EQ(count, 1272);
  EXPECT_EQ(prefixes, 92);
  EXPECT_EQ(distinctPrefixes.size(), 92u);
  int filled = 0;
  for (int id = 0; id < Schema::nStructDefG; ++id) filled += Schema::vStructDefG[id] != nullptr;
  EXPECT_EQ(filled, 1272);
  EXPECT_EQ(Schema::nStructDefG, 5919);
  EXPECT_EQ(Schema::nStructTypeG, 1272);
  EXPECT_EQ(StructInfoForId(5919), nullptr);
  EXPECT_EQ(StructInfoForId(-1), nullptr);
  EXPECT_NE(Type("channelMapConfigInstructions"), nullptr);
  EXPECT_EQ(Schema::firstSchemaVersionG, 7);
  EXPECT_EQ(Schema::lastSchemaVersionG, 42);
  EXPECT_EQ(Schema::defaultSchemaVersionG, 42);
}

TEST(SchemaTables, PublishedStatistics) {
  int records = 0, placeholders = 0, largest = 0, alphabetical = 0, olderFields = 0;
  std::string largestName;
  std::set<std::string> typesWithOlder;
  for (int id = 0; id < Schema::nStructDefG; ++id) {
    const StructInfo* info = Schema::vStructDefG[id];
    if (info == nullptr) continue;
    records += info->nFieldInfo;
    if (info->nFieldInfo > largest) {
      largest = info->nFieldInfo;
      largestName = info->pName;
    }
    std::vector<std::string> sinceFirst;
    for (unsigned n = 0; n < info->nFieldInfo; ++n) {
      const FieldInfo& f = info->vFieldInfo[n];
      if (IsPlaceholder(f)) {
        ++placeholders;
        continue;
      }
      EXPECT_NE(f.arity, SARN_ARITY_NONE);
      if (f.minVersion == Schema::firstSchemaVersionG) sinceFirst.push_back(FieldName(info, f));
      const FieldInfoHistory& h = info->vFieldInfoHistory[n];
      if (h.nFieldInfo != 0) {
        EXPECT_EQ(h.nFieldInfo, 1u) << info->pName;
        ++olderFields;
        typesWithOlder.insert(info->pName);
      }
    }
    alphabetical += std::is_sorted(sinceFirst.begin(), sinceFirst.end());
  }
  EXPECT_EQ(records, 10535);
  EXPECT_EQ(placeholders, 1803);
  EXPECT_EQ(largestName, "recording");
  EXPECT_EQ(largest, 197);
  EXPECT_EQ(olderFields, 19);
  EXPECT_EQ(typesWithOlder.size(), 15u);
  EXPECT_EQ(alphabetical, 975);

  int enums = 0, withGaps = 0;
  for (int id = 0; id < Schema::nEnumDefG; ++id) {
    const EnumDef* def = Schema::vEnumDefG[id];
    if (def == nullptr) continue;
    ++enums;
    EXPECT_GE(id, 668);
    EXPECT_LE(id, 5800);
    EXPECT_EQ(StructInfoForId(id), nullptr) << "enum id " << id << " is also a type id";
    bool gap = false;
    for (uint64_t i = 0; i < def->nValue; ++i) gap = gap || def->vName[i] == nullptr;
    withGaps += gap;
  }
  EXPECT_EQ(enums, 378);
  EXPECT_EQ(Schema::nEnumTypeG, 378);
  EXPECT_EQ(Schema::nEnumDefG, 5801);
  EXPECT_EQ(withGaps, 346);
  EXPECT_NE(Schema::vEnumDefG[668], nullptr);
  EXPECT_NE(Schema::vEnumDefG[5800], nullptr);

  // Fields whose storage every caller finds through a reference to a type must name a real one,
  // and enum fields a real enum.
  for (int id = 0; id < Schema::nStructDefG; ++id) {
    const StructInfo* info = Schema::vStructDefG[id];
    if (info == nullptr) continue;
    for (unsigned n = 0; n < info->nFieldInfo; ++n) {
      const FieldInfo& f = info->vFieldInfo[n];
      if (f.dataType == SARN_DATA_TYPE_ENUM) {
        EXPECT_NE(EnumDefForId(f.refIndex), nullptr) << info->pName;
      } else if (f.dataType == SARN_DATA_TYPE_SUBDICT) {
        EXPECT_NE(StructInfoForId(f.refIndex), nullptr) << info->pName;
      } else if (f.dataType == SARN_DATA_TYPE_KNOWN_DICT_AS_LAZY) {
        EXPECT_EQ(f.arity, SARN_ARITY_REQUIRED);
      }
    }
  }
  const StructInfo* success = Type("success");
  for (unsigned n = 0; n < success->nFieldInfo; ++n) EXPECT_NE(success->vFieldInfo[n].arity, SARN_ARITY_REQUIRED);
}

TEST(SchemaTables, OlderRecordsOfTheNamedFields) {
  struct Case {
    const char* type;
    const char* field;
    const char* current;
    const char* older;
  };
  const Case kCases[] = {
      {"endUserMessage", "endUserMessageId", "longId optional 22-42 flag", "longId required 7-21"},
      {"audioStream", "audioStreamFormat", "enum optional 22-42 flag", "enum required 7-21"},
      {"assetViewModify", "assetId", "longId required 13-42", "longId optional 7-12 flag"},
      {"promotionalItem", "promotionalItemType", "enum multi 27-42", "enum required 7-26"},
      {"localApplicationDataRemove", "key", "string multi 26-42", "string multi 7-25"},
      {"gridRowSearch", "streamingPermission", "enum multi 17-42", "enum multi 14-16"},
  };
  auto text = [](const FieldInfo& f) {
    std::string s = std::string(kDataTypeNames[f.dataType]) + " " + kArityNames[f.arity] + " " +
                    std::to_string(f.minVersion) + "-" + std::to_string(f.maxVersion);
    return f.flagOffset != 0 ? s + " flag" : s;
  };
  for (const Case& c : kCases) {
    const StructInfo* info = Type(c.type);
    ASSERT_NE(info, nullptr);
    bool found = false;
    for (unsigned n = 0; n < info->nFieldInfo; ++n) {
      const FieldInfo& f = info->vFieldInfo[n];
      if (f.arity == SARN_ARITY_NONE || std::strcmp(FieldName(info, f), c.field) != 0) continue;
      found = true;
      EXPECT_EQ(text(f), c.current) << c.type;
      ASSERT_EQ(info->vFieldInfoHistory[n].nFieldInfo, 1u) << c.type;
      const FieldInfo& older = info->vFieldInfoHistory[n].vFieldInfo[0];
      EXPECT_EQ(text(older), c.older) << c.type;
      EXPECT_NE(older.valueOffset, f.valueOffset) << "older representations keep their own slot";
      EXPECT_EQ(older.nameOffset, f.nameOffset);
    }
    EXPECT_TRUE(found) << c.type << "." << c.field;
  }
}

TEST(SchemaTables, RuleBPicksTheRecordOfTheVersion) {
  const StructInfo* info = Type("endUserMessage");
  ASSERT_NE(info, nullptr);
  unsigned n = 0;
  while (n < info->nFieldInfo && std::strcmp(FieldName(info, info->vFieldInfo[n]), "endUserMessageId") != 0) ++n;
  ASSERT_LT(n, info->nFieldInfo);
  const FieldInfo* current = &info->vFieldInfo[n];
  const FieldInfo* older = &info->vFieldInfoHistory[n].vFieldInfo[0];

  const FieldInfo* at21 = FieldForVersion(info, n, 21);
  ASSERT_EQ(at21, older);
  EXPECT_EQ(at21->arity, SARN_ARITY_REQUIRED);
  EXPECT_EQ(at21->flagOffset, 0);
  const FieldInfo* at22 = FieldForVersion(info, n, 22);
  ASSERT_EQ(at22, current);
  EXPECT_EQ(at22->arity, SARN_ARITY_OPTIONAL);
  EXPECT_NE(at22->flagOffset, 0);
  EXPECT_EQ(FieldForVersion(info, n, 0), current) << "version 0 never consults the history";
  EXPECT_EQ(FieldForVersion(info, n, 7), older);
  EXPECT_EQ(FieldForVersion(info, n, 6), nullptr);
  EXPECT_EQ(FieldForVersion(info, n, 43), nullptr);
  EXPECT_EQ(FieldForVersion(info, 0, 0), nullptr) << "placeholder";
  EXPECT_EQ(FieldForVersion(info, info->nFieldInfo, 0), nullptr);

  // Rule A: a field dropped after version 7 takes part at 7 and at 0 only.
  const StructInfo* ad = Type("ad");
  const FieldInfo& imageUrl = ad->vFieldInfo[6];
  EXPECT_TRUE(FieldTakesPart(imageUrl, 0));
  EXPECT_TRUE(FieldTakesPart(imageUrl, 7));
  EXPECT_FALSE(FieldTakesPart(imageUrl, 8));
  EXPECT_FALSE(FieldTakesPart(ad->vFieldInfo[0], 0));
}

TEST(SchemaTables, LookupByNameWithinFiveProbes) {
  EXPECT_EQ(Schema::structNameHashTableSizeG, 3532);
  int filled = 0;
  for (int slot = 0; slot < Schema::structNameHashTableSizeG; ++slot) filled += Schema::structNameHashTableG[slot] != nullptr;
  EXPECT_EQ(filled, 1272);
  EXPECT_EQ(StructInfoMap::HomeSlot("ad", 3532), 3107u);
  int worst = 0;
  for (int id = 0; id < Schema::nStructDefG; ++id) {
    const StructInfo* info = Schema::vStructDefG[id];
    if (info == nullptr) continue;
    EXPECT_EQ(StructInfoMap::LookupStructByName(info->pName), info);
    uint32_t slot = StructInfoMap::HomeSlot(info->pName, Schema::structNameHashTableSizeG);
    int probes = 1;
    while (Schema::structNameHashTableG[slot] != info) {
      slot = (slot + 1) % Schema::structNameHashTableSizeG;
      ++probes;
    }
    worst = std::max(worst, probes);
  }
  EXPECT_LE(worst, 5);
  EXPECT_EQ(StructInfoMap::LookupStructByName("address"), &sarnschema::Address::structInfoG);
  EXPECT_EQ(StructInfoMap::LookupStructByName("Address"), nullptr);
  EXPECT_EQ(StructInfoMap::LookupStructByName(""), nullptr);
  EXPECT_EQ(StructInfoMap::LookupStructByName(nullptr), nullptr);
  EXPECT_EQ(StructInfoMap::LookupStructByName("addres"), nullptr);
  EXPECT_EQ(StructInfoMap::LookupStructByName("addressX"), nullptr);
}
