// The recordingList bodies that the object benchmarks share: filled recordings (their nested
// objects one level deep) grown until the body's JSON reaches a target size, built once per size.
// The bodies are the benchmarks' own, filled by the plain derivation below, so that figures stay
// comparable from run to run whatever the tests' object builders become.
#pragma once

#include <cstdio>
#include <cstring>
#include <map>
#include <memory>
#include <string>

#include "sarn/Sarn.h"

namespace benchbody {

using namespace sarn;

// The first named value of enum `enumId` at or after `start` (wrapping), or 0.
inline uint32_t SomeEnumValue(unsigned enumId, unsigned start) {
  const sarn::EnumDef* def = sarn::EnumDefForId(enumId);
  if (def == nullptr || def->nValue == 0) return 0;
  for (uint64_t k = 0; k < def->nValue; ++k) {
    uint64_t i = (start + k) % def->nValue;
    if (def->vName[i] != nullptr) return static_cast<uint32_t>(i);
  }
  return 0;
}

template <typename T>
void PutValue(sarn::SarnObject* object, const sarn::FieldInfo& field, T value) {
  sarn::FieldAccess::PutScalar(object, field, &value);
}

// Sets every field that the current records describe (version 0), `nMulti` elements per array,
// and nested objects down to `depth` more levels (required ones a little further) (KNOWN_DICT
// fields get a `success`). Strings hold bytes that JSON must escape unless `fPlainText`.
inline void FillRecordFields(VekMempool* pool, sarn::SarnObject* object, unsigned seed, int depth, unsigned nMulti,
                       bool fPlainText) {
  using namespace sarn;
  const StructInfo* info = object->GetStructInfo();
  for (unsigned n = 0; n < info->nFieldInfo; ++n) {
    const FieldInfo& field = info->vFieldInfo[n];
    if (field.arity == SARN_ARITY_NONE) continue;
    unsigned count = field.arity == SARN_ARITY_MULTI ? nMulti : 1;
    for (unsigned e = 0; e < count; ++e) {
      unsigned s = seed * 31 + n * 7 + e;
      switch (field.dataType) {
        case SARN_DATA_TYPE_BOOL: PutValue(object, field, static_cast<uint8_t>(s % 2)); break;
        case SARN_DATA_TYPE_DATE: PutValue(object, field, Date(18000 + static_cast<int>(s % 1000))); break;
        case SARN_DATA_TYPE_TIME: PutValue(object, field, Time(static_cast<int>(s % 86400) * 1000)); break;
        case SARN_DATA_TYPE_DATETIME: PutValue(object, field, DateTime(1614863109000LL + static_cast<long long>(s) * 60000)); break;
        case SARN_DATA_TYPE_ENUM: PutValue(object, field, SomeEnumValue(field.refIndex, s)); break;
        case SARN_DATA_TYPE_INT_ID:
        case SARN_DATA_TYPE_U32: PutValue(object, field, 1000 + s); break;
        case SARN_DATA_TYPE_S32: PutValue(object, field, static_cast<uint32_t>(-static_cast<int>(s))); break;
        case SARN_DATA_TYPE_CHANNEL_NUMBER: PutValue(object, field, ChannelNumber(static_cast<int>(s % 999) + 1, s % 2 ? -2 : 1)); break;
        case SARN_DATA_TYPE_CURRENCY: PutValue(object, field, Currency(static_cast<int>(s), "USD")); break;
        case SARN_DATA_TYPE_FLOAT: PutValue(object, field, s + 0.25); break;
        case SARN_DATA_TYPE_S64: PutValue(object, field, static_cast<uint64_t>(-1 - static_cast<long long>(s))); break;
        case SARN_DATA_TYPE_LONG_ID:
        case SARN_DATA_TYPE_U64: PutValue(object, field, (s % 3 == 0 ? 5ull << 48 : 0) + s * 1000003ull); break;
        case SARN_DATA_TYPE_STRING:
        case SARN_DATA_TYPE_STRING_ID: {
          char text[64];
          std::snprintf(text, sizeof text,
                        field.dataType == SARN_DATA_TYPE_STRING_ID ? "sid%u"
                        : fPlainText                              ? "Some text of item %u"
                                                                  : "Text %u \"q\" \\ \xC3\xA9\t/end",
                        s);
          FieldAccess::PutString(object, field, VekString::FromUtf8Bytes(pool, std::strlen(text), text));
          break;
        }
        case SARN_DATA_TYPE_BYTESTRING: {
          unsigned char bytes[5] = {0, 1, static_cast<unsigned char>(s), 0xFE, 0xFF};
          FieldAccess::PutReference(object, field, vek::ByteBuffer::New(pool, bytes, 1 + s % 5).Get());
          break;
        }
        case SARN_DATA_TYPE_ANY_DICT: {
          ref<Dict> v = Dict::New(pool, VekString());
          v->AddString("key", "value");
          v->AddString("n", "1");
          FieldAccess::PutReference(object, field, v.Get());
          break;
        }
        case SARN_DATA_TYPE_KNOWN_DICT_AS_LAZY:
          FieldAccess::PutReference(object, field, LazyDict::FromJsonString(pool, "{\"type\": \"success\"}", 0).Get());
          break;
        case SARN_DATA_TYPE_KNOWN_DICT:
        case SARN_DATA_TYPE_SUBDICT: {
          // Past the depth only required objects are made (readers insist on them), up to a bound.
          if (depth <= 0 && (field.arity != SARN_ARITY_REQUIRED || depth < -8)) break;
          const StructInfo* target = StructInfoForId(field.dataType == SARN_DATA_TYPE_SUBDICT ? field.refIndex : 543);
          if (target == nullptr) break;
          ref<SarnObject> v = target->pFactory(pool);
          FillRecordFields(pool, v.Get(), s, depth - 1, nMulti, fPlainText);
          FieldAccess::PutReference(object, field, v.Get());
          break;
        }
        default: break;
      }
    }
    MarkFieldPresent(object, field);
  }
}

constexpr KernoVersion kVersion = 42;

struct Body {
  VekMempool poolM{"bench-objects"};
  ref<SarnObject> listM;
  std::string jsonM;
  size_t nObjectM = 0;
  size_t objectBytesM = 0;
};

inline std::string Json(VekMempool* pool, const SarnObject* object) {
  JsonSarnObject json(pool);
  VekString text = json.SarnObjectToJson(object, kVersion);
  return std::string(text.Utf8(), text.NByte());
}

// A recordingList of filled recordings (their nested objects one level deep), grown until its JSON
// reaches `targetBytes`.
inline Body& GetBody(size_t targetBytes) {
  static std::map<size_t, std::unique_ptr<Body>> bodies;
  std::unique_ptr<Body>& body = bodies[targetBytes];
  if (body) return *body;
  body.reset(new Body);
  VekMempool* pool = &body->poolM;
  body->listM = sarnschema::RecordingList::Factory(pool);
  auto* list = static_cast<sarnschema::RecordingList*>(body->listM.Get());
  VekMempool scratch("bench-scratch");
  size_t perRecording = 0;
  for (unsigned i = 0; perRecording == 0 || list->recordingM.Count() * perRecording < targetBytes; ++i) {
    ref<SarnObject> recording = sarnschema::Recording::Factory(pool);
    FillRecordFields(pool, recording.Get(), i, 1, 2, true);
    list->recordingM.Add(recording.Get());
    if (perRecording == 0) perRecording = Json(&scratch, recording.Get()).size();
  }
  body->jsonM = Json(&scratch, list);
  for (size_t at = body->jsonM.find("\"type\": "); at != std::string::npos; at = body->jsonM.find("\"type\": ", at + 1)) {
    ++body->nObjectM;
  }
  body->objectBytesM = pool->GetUsedBytes();
  return *body;
}

}  // namespace benchbody
