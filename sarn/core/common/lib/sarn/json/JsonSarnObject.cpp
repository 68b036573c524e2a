// The object-to-JSON writer: the JSON side of the shared object walk. The walk decides which
// fields and values there are; this file writes members, brackets, commas, the pseudo-field
// "type" and the values. Lazy payloads that hold an object are walked like nested objects (under
// the payload's own version), which writes the bytes the payload's own compact writer would.
//
// Value texts come from the shared FormatFieldText; texts that need no escaping are quoted
// directly, everything else goes through the shared JSON string escaper.
#include "sarn/json/JsonSarnObject.h"

#include <cstring>

#include "sarn/dict/Dict.h"
#include "sarn/dict/Dictionary.h"
#include "sarn/dict/LazyDict.h"
#include "sarn/model/FieldAccess.h"
#include "sarn/model/internal/ObjectWalk.h"
#include "sarn/objects/internal/ObjectText.h"
#include "sarn/values/Json.h"
#include "sarn/values/internal/TextOut.h"

namespace sarn {

using internal::AppendText;

namespace {

void AppendLiteral(ByteBuffer& out, const char* text) { AppendText(out, text, std::strlen(text)); }

// The lead-in of one member (called directly rather than through the exported member).
inline void WriteMemberName(const char* name, ByteBuffer& out, bool& fFirst) {
  if (fFirst) {
    fFirst = false;
    out.AppendByte('"');
  } else {
    AppendText(out, ", \"", 3);
  }
  AppendLiteral(out, name);
  AppendText(out, "\": ", 3);
}

// The anchor of the pseudo-field "type": the last field written at `version` whose name sorts
// below "type", or -1.
int FindTypeAnchor(const StructInfo* info, KernoVersion version) {
  for (int n = static_cast<int>(info->nFieldInfo) - 1; n >= 0; --n) {
    const FieldInfo& field = info->vFieldInfo[n];
    if (FieldTakesPart(field, version) && std::strcmp(FieldName(info, field), "type") < 0) return n;
  }
  return -1;
}

// Per object: where "type" goes and whether it is written yet; whether a member (and, in an
// array, an element) has been written.
struct JsonFrameData {
  int anchorM;
  bool isTypeDoneM;
  bool isFirstM;
  bool isFirstElementM;
};

}  // namespace

class JsonSarnObject::Writer {
 public:
  using FrameData = JsonFrameData;
  using Walk = internal::ObjectWalk<Writer, internal::WalkVersions::CURRENT_RECORDS>;
  using Frame = Walk::Frame;
  using Child = Walk::Child;

  Writer(JsonSarnObject& json, ByteBuffer& out)
      : jsonM(json),
        outM(out),
        walkM(json.pMempoolM, json.pStructDefsM, json.nStructDefsM) {}

  Walk& GetWalk() { return walkM; }

  void BeginObject(Frame& frame, Frame*) {
    outM.AppendByte('{');
    frame.dataM.isFirstM = true;
    // An object without metadata says nothing, not even its type: an empty JSON object.
    frame.dataM.isTypeDoneM = frame.pInfoM == nullptr;
    frame.dataM.anchorM = frame.pInfoM != nullptr ? FindTypeAnchor(frame.pInfoM, frame.versionM) : -1;
  }

  void BeginField(Frame& frame) {
    // "type" stands just before its anchor, whether or not the anchor itself is written.
    JsonFrameData& data = frame.dataM;
    if (!data.isTypeDoneM && data.anchorM >= 0 && frame.nFieldM >= static_cast<unsigned>(data.anchorM)) {
      WriteTypeMember(frame);
    }
    WriteMemberName(frame.pNameM, outM, data.isFirstM);
    if (frame.pFieldM->arity == SARN_ARITY_MULTI) {
      outM.AppendByte('[');
      data.isFirstElementM = true;
    }
  }

  bool Value(Frame& frame, unsigned i, Child& child) {
    const FieldInfo& field = *frame.pFieldM;
    if (field.arity == SARN_ARITY_MULTI) {
      if (!frame.dataM.isFirstElementM) outM.AppendByte(',');
      frame.dataM.isFirstElementM = false;
    }
    switch (field.dataType) {
      case SARN_DATA_TYPE_KNOWN_DICT:
      case SARN_DATA_TYPE_SUBDICT:
        child.pObjectM = static_cast<const SarnObject*>(FieldAccess::ReferenceAt(frame.pObjectM, field, i));
        child.versionM = frame.versionM;
        return true;
      case SARN_DATA_TYPE_KNOWN_DICT_AS_LAZY: {
        const LazyDict* lazy = static_cast<const LazyDict*>(FieldAccess::ReferenceAt(frame.pObjectM, field, i));
        if (lazy->repM == LazyDict::REP_OBJECT && lazy->objectM != nullptr) {
          child.pObjectM = lazy->objectM.Get();
          child.versionM = lazy->versionM;
        } else {
          jsonM.LazyToJson(lazy, outM);
        }
        return true;
      }
      case SARN_DATA_TYPE_ANY_DICT: {
        const Dict* dict = static_cast<const Dict*>(FieldAccess::ReferenceAt(frame.pObjectM, field, i));
        dict->GetDictionary()->ToJson(outM, JsonFormat(false));
        return true;
      }
      default:
        return WriteText(field, frame.pObjectM, i);
    }
  }

  void EndField(Frame& frame) {
    if (frame.pFieldM->arity == SARN_ARITY_MULTI) outM.AppendByte(']');
  }

  void EndObject(Frame& frame) {
    if (!frame.dataM.isTypeDoneM) WriteTypeMember(frame);
    outM.AppendByte('}');
  }

 private:
  void WriteTypeMember(Frame& frame) {
    frame.dataM.isTypeDoneM = true;
    WriteMemberName("type", outM, frame.dataM.isFirstM);
    outM.AppendByte('"');
    AppendLiteral(outM, frame.pInfoM->pName);
    outM.AppendByte('"');
  }

  // False when a text could not be made (memory ran out): the value is not written empty.
  bool WriteText(const FieldInfo& field, const SarnObject* object, unsigned i) {
    internal::FieldText text;
    internal::FormatFieldText(jsonM.pMempoolM, jsonM.pStructDefsM, jsonM.nStructDefsM, field, object, i, text);
    if (text.isFailedM) return false;
    if (!TraitsOf(field.dataType).isQuotedInJson) {
      AppendText(outM, text.pBytesM, text.nLengthM);
    } else if (text.pStringM != nullptr) {
      Json::StringToJson(*text.pStringM, false, outM);
    } else if (text.isPlainM || internal::IsPlainText(text.pBytesM, text.nLengthM)) {
      outM.AppendByte('"');
      AppendText(outM, text.pBytesM, text.nLengthM);
      outM.AppendByte('"');
    } else {
      VekString copy = VekString::FromUtf8Bytes(jsonM.pMempoolM, text.nLengthM, text.pBytesM);
      if (copy.FEmpty() && text.nLengthM != 0) return false;
      Json::StringToJson(copy, false, outM);
    }
    return true;
  }

  JsonSarnObject& jsonM;
  ByteBuffer& outM;
  Walk walkM;
};

JsonSarnObject::JsonSarnObject(VekMempool* mempool)
    : pMempoolM(mempool),
      pStructDefsM(Schema::vStructDefG),
      nStructDefsM(static_cast<uint32_t>(Schema::nStructDefG)),
      nObjectIndexM(0),
      vObjectTypesM(8, nullptr, 3),
      pReadStateM(nullptr) {}

JsonSarnObject::~JsonSarnObject() {
  ReleaseReadState();
  vObjectTypesM.Destroy();
}

VekString JsonSarnObject::SarnObjectToJson(const SarnObject* object, KernoVersion version) {
  ByteBuffer out(pMempoolM);
  if (!SarnObjectToJson(object, version, out)) return VekString();
  return VekString::FromUtf8Bytes(pMempoolM, out.GetLength(), out.GetData());
}

bool JsonSarnObject::SarnObjectToJson(const SarnObject* object, KernoVersion version, ByteBuffer& out) {
  Writer writer(*this, out);
  if (!writer.GetWalk().Run(writer, object, version, JsonFrameData())) out.Fail();
  return !out.HasFailed();
}

void JsonSarnObject::WriteFieldName(const char* name, ByteBuffer& out, bool& fFirst) {
  WriteMemberName(name, out, fFirst);
}

void JsonSarnObject::LazyToJson(const LazyDict* lazy, ByteBuffer& out) { lazy->ToJsonByteBuffer(out, false); }

// Both run the walk over the one field, as a member of an object whose other members the caller
// writes: "type" is not this walk's to place.
void JsonSarnObject::SingleFieldToJson(const char* name, const FieldInfo* field, const SarnObject* object,
                                       ByteBuffer& out, bool& fFirst, KernoVersion version) {
  Writer writer(*this, out);
  JsonFrameData data = {-1, true, fFirst, true};
  writer.GetWalk().RunField(writer, object, *field, name, version, data);
  fFirst = data.isFirstM;
}

void JsonSarnObject::MultiFieldToJson(const char* name, const FieldInfo* field, const SarnObject* object,
                                      ByteBuffer& out, bool& fFirst, KernoVersion version) {
  SingleFieldToJson(name, field, object, out, fFirst, version);
}

}  // namespace sarn
