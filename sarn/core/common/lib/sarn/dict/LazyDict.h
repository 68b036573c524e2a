// LazyDict: one payload (typically a message body) held in whichever form it arrived, and
// converted only when somebody asks for another form. A payload that is merely passed on is
// never parsed: compact JSON output of stored JSON copies the stored bytes.
//
// Forms (repM): a Dict, JSON text, protocol-buffer bytes, a schema object, a Dictionary, or an
// unread byte source. Conversions hand their result to the caller and keep nothing, so asking
// twice converts twice. The Dict, JSON and Dictionary forms convert to one another. The object,
// protocol-buffer and byte-source forms are held (the source is deleted with the payload) but
// not converted: they are answered like an unknown form, with a null Dictionary and
// "LazyDict to Dictionary: unknown representation in LazyDict", an "error" Dict with the code
// "internalError" and the text "bad rep in LazyDict", no JSON output, false from type queries.
//
// Ownership: the payload holds references to its Dict, bytes, object and Dictionary, and owns
// its byte source (deleted with the payload). Results are new objects in the payload's pool (or
// shared members where said) owned by the caller.
//
// Thread safety: none is taken. A payload may be shared between threads while nobody changes it.
#pragma once

#include <cstdint>

#include "sarn/values/ByteBuffer.h"
#include "sarn/dict/Dict.h"
#include "sarn/dict/Dictionary.h"
#include "sarn/base/Export.h"
#include "sarn/model/SarnObject.h"
#include "sarn/model/Schema.h"
#include "vek/VekByteString.h"
#include "vek/VekCore.h"
#include "wynbaselib/Bytestream.h"

namespace sarn {

class SARN_EXPORT LazyDict : public VekCore {
 public:
  // Which member holds the payload. Any other value is a bad representation.
  enum Rep : uint32_t {
    REP_DICT = 0,        // dictM
    REP_JSON = 1,        // bytesM, JSON text
    REP_PROTOBUF = 2,    // bytesM, protocol-buffer bytes
    REP_OBJECT = 3,      // objectM
    REP_DICTIONARY = 4,  // dictionaryM
    REP_BYTESOURCE = 5,  // pBytesourceM, JSON text still to be read
  };

  // Stores the arguments (taking ownership of `bytesource`); dictionaryM starts null. Every
  // factory below returns null when memory runs out (New then deletes `bytesource`).
  LazyDict(Rep rep, const ref<Dict>& dict, const ref<vek::ByteBuffer>& bytes, const ref<SarnObject>& object,
           wynbaselib::Bytesource* bytesource, KernoVersion version);
  ~LazyDict() override;
  LazyDict(const LazyDict&) = delete;
  LazyDict& operator=(const LazyDict&) = delete;

  static ref<LazyDict> New(VekMempool* pool, Rep rep, const ref<Dict>& dict, const ref<vek::ByteBuffer>& bytes,
                           const ref<SarnObject>& object, wynbaselib::Bytesource* bytesource, KernoVersion version);
  static ref<LazyDict> FromDict(VekMempool* pool, const ref<Dict>& dict, unsigned short version);
  // Null for a null or empty buffer or a first byte 0; REP_JSON when the first byte is a space
  // or '{', REP_PROTOBUF for any other first byte. The buffer is shared, not copied.
  static ref<LazyDict> FromBytestring(VekMempool* pool, const ref<vek::ByteBuffer>& bytes, KernoVersion version);
  // FromBytestring over a copy of the string's bytes.
  static ref<LazyDict> FromJsonString(VekMempool* pool, const VekString& json, KernoVersion version);
  static ref<LazyDict> FromSarnObject(VekMempool* pool, const ref<SarnObject>& object, KernoVersion version);
  // Takes ownership of `source`.
  static ref<LazyDict> FromBytesource(VekMempool* pool, wynbaselib::Bytesource* source, KernoVersion version);
  static ref<LazyDict> FromDictionary(VekMempool* pool, const ref<Dictionary>& dictionary, KernoVersion version);

  // The payload's schema type id: every form answers false and leaves `typeId` alone, since this
  // layer does not look types up by name.
  bool GetType(unsigned int* typeId);
  // The text of the payload's "type" (empty when it is not a string); false when there is none.
  // Stored JSON is parsed again on every call.
  bool GetTypeName(VekString* name);
  // Replaces dictionaryM; the representation is not changed.
  void SetDictionary(const ref<Dictionary>& dictionary);

  // Null with the reader's message when stored JSON does not parse. Dict and Dictionary forms
  // return their own dictionary (shared).
  ref<Dictionary> ToDictionary(VekString& error) const;
  // Stored JSON that does not parse gives an "error" dictionary (code "badArgument", the
  // reader's message as text); null only when memory runs out. The Dict form returns dictM.
  ref<Dict> ToDict() const;
  // Compact output of stored JSON is the stored bytes, unchecked. Pretty output parses them; when
  // they do not parse, the stored bytes are written unchanged rather than nothing.
  void ToJsonByteBuffer(ByteBuffer& out, bool pretty) const;
  void ToJsonBytesink(wynbaselib::Bytesink& out, bool pretty) const;
  // Compact output of stored JSON returns bytesM itself (shared). Null (ToJson: empty) when
  // memory runs out.
  ref<vek::ByteBuffer> ToJsonBytestring(bool pretty) const;
  VekString ToJson(bool pretty) const;

  // The payload as an object. The object form gives objectM itself (shared, not copied); on
  // failure the result is null with the reason in `error`.
  ref<SarnObject> ToSarnObjectOrErrorString(VekString& error) const;
  // An `error` object (code badArgument) with the reason when there is no object; null only
  // when memory runs out.
  ref<SarnObject> ToSarnObjectOrError() const;
  // The object or null, the reason discarded; true when there is one.
  bool ToSarnObject(ref<SarnObject>& out) const;

  // Equal compact JSON texts of the two payloads' ToDict(); false when either cannot be made.
  bool operator==(const LazyDict& other) const;
  bool operator!=(const LazyDict& other) const { return !(*this == other); }

  Rep repM;
  ref<Dict> dictM;
  ref<Dictionary> dictionaryM;
  ref<vek::ByteBuffer> bytesM;
  ref<SarnObject> objectM;
  KernoVersion versionM;
  wynbaselib::Bytesource* pBytesourceM;

 private:
  template <class Out>
  void WriteJson(Out& out, bool pretty) const;
  // The Dictionary behind the Dict, JSON and Dictionary forms; null (with `error`) otherwise.
  ref<Dictionary> DictionaryOf(VekString& error) const;
};

// The "error" dictionary of a failed conversion: type "error", code "badArgument", the text.
SARN_EXPORT ref<Dictionary> MakeErrorDictionary(VekMempool* pool, const VekString& text);

}  // namespace sarn
