// LazyDict: one payload (typically a message body) held in whichever form it arrived, and
// converted only when somebody asks for another form. A payload that is merely passed on is
// never parsed: compact JSON output of stored JSON copies the stored bytes.
//
// Forms (repM): a Dict, JSON text, protocol-buffer bytes (a known dict), a schema object, a
// Dictionary, or an unread byte source. Conversions hand their result to the caller and keep
// nothing, so asking twice converts twice; the one exception is a type query on a byte source,
// which keeps the dictionary it read and switches the payload to REP_DICTIONARY.
//
// Decisions where the forms leave a choice:
// - A form whose member is null (a caller may set repM and the members freely) is answered like
//   a representation outside the enum: a null Dictionary with "LazyDict to Dictionary: unknown
//   representation in LazyDict", an "error" Dict with the code "internalError" and the text
//   "bad rep in LazyDict", "unknown rep in LazyDict" as an object, no JSON output, an empty
//   protocol-buffer buffer, false from type queries.
// - Stored JSON that does not parse is written unchanged, pretty or compact: what came in goes
//   out, and nothing is lost.
// - A byte source that yields no dictionary answers like stored JSON that does not parse: ToDict
//   gives the "error" dictionary with the reader's message, ToProtobuf the "error" object made
//   from it, the JSON writers copy the source's bytes unchanged, and the object conversion through
//   a Dictionary fails with the reader's message. A source whose Duplicate() gives null is such a
//   source, with kLazyDictNoDuplicateMessage.
// - Feature 548 (read on every call, so that a program may switch it at run time) selects the
//   direct JSON-to-object reader for stored JSON and byte sources, and the direct writer for a
//   compact object into a sink (handed over in pieces of at most kSinkPieceBytes, stopping at the
//   first Write that fails). Nothing else depends on it.
// - Conversions to objects along the four measured paths log one line (facility 0, priority 6,
//   tag "LazyDict") for a result of type "channelMapConfigInstructions" only: the label, the type
//   name, the input size, the pool's GetName(), its GetUsedBytes() and GetUsedBytesHighWater()
//   before and after (in thousands, rounded down) and the elapsed monotonic time.
// - Nesting: readers never parse a lazy field, so payloads can nest inside one another past every
//   reader's limit, and converting one converts those inside it. Each conversion that starts while
//   others are running on the same thread counts one level; past Limits::kDefaultMaxDepth levels,
//   or once those conversions have taken kLazyNestingStackBytes of native stack (a level may hold
//   a whole tree written recursively, so levels alone do not bound the stack), the payload is
//   taken as the "error" object carrying kLazyDictDepthLimitFormat. So no input exhausts the
//   stack; in an optimised build the stack bound falls first, after about 46 levels of compact
//   and 94 of pretty JSON. The binary writer converts nested payloads one after another and
//   passes their levels on, so it stops at the level limit.
// - JSON output of a bad representation is nothing at all, also inside an object, whose member
//   then has a name and no value: such a payload cannot be passed on as JSON.
//
// Ownership: the payload holds references to its Dict, bytes, object and Dictionary, and owns
// its byte source (deleted with the payload, once). Results are new objects in the payload's
// pool (or shared members where said) owned by the caller; shared members are never copied.
//
// Thread safety: none is taken. A payload may be shared between threads while nobody changes it;
// a type query on a byte-source payload changes it.
#pragma once

#include <cstddef>
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

  // The payload's schema type id (its slot in Schema::vStructDefG) and name. Objects answer from
  // the object; protocol-buffer bytes are read (bytes that do not read answer with the `error`
  // type); trees answer from their "type" value (the name is empty when it is not a string; the id
  // needs a registered type); stored JSON is parsed again on every call. A byte source is read
  // once (BuildDictionaryFromBytesource). False, with the argument left alone, when there is none.
  bool GetType(unsigned int* typeId);
  bool GetTypeName(VekString* name);
  // Replaces dictionaryM; the representation is not changed.
  void SetDictionary(const ref<Dictionary>& dictionary);

  // Null with the reader's message when stored JSON or a byte source does not parse. Dict and
  // Dictionary forms return their own dictionary (shared); objects and protocol-buffer bytes are
  // converted under versionM.
  ref<Dictionary> ToDictionary(VekString& error) const;
  // Stored JSON or a byte source that does not parse gives an "error" dictionary (code
  // "badArgument", the reader's message as text); null only when memory runs out. The Dict form
  // returns dictM.
  ref<Dict> ToDict() const;
  // Compact output of stored JSON is the stored bytes, unchecked (to a sink in one Write). Trees
  // are written by their writer; objects compact by the direct writer, pretty through a
  // Dictionary.
  void ToJsonByteBuffer(ByteBuffer& out, bool pretty) const;
  void ToJsonBytesink(wynbaselib::Bytesink& out, bool pretty) const;
  // Compact output of stored JSON returns bytesM itself (shared). Null (ToJson: empty) when
  // memory runs out.
  ref<vek::ByteBuffer> ToJsonBytestring(bool pretty) const;
  VekString ToJson(bool pretty) const;

  // The protocol-buffer bytes of the payload as a known dict: REP_PROTOBUF gives bytesM itself;
  // a payload that does not convert gives the bytes of the `error` object saying why; a bad
  // representation an empty buffer. Null only when memory runs out.
  ref<vek::ByteBuffer> ToProtobuf() const;

  // The payload as an object. The object form gives objectM itself (shared, not copied); on
  // failure the result is null with the reason in `error` (replaced).
  ref<SarnObject> ToSarnObjectOrErrorString(VekString& error) const;
  // An `error` object (code badArgument) with the reason when there is no object; null only
  // when memory runs out.
  ref<SarnObject> ToSarnObjectOrError() const;
  // The object or null, the reason discarded; true when there is one.
  bool ToSarnObject(ref<SarnObject>& out) const;

  // Reads a duplicate of the byte source into `out` (whatever the reader returned, also a partial
  // tree); true when it is a whole dictionary. Only for REP_BYTESOURCE with a source: anything
  // else is a broken invariant (VekAssertFail).
  bool GetDictionaryFromBytesource(ref<Dictionary>& out) const;
  // Nothing when dictionaryM is set. Otherwise reads the source into dictionaryM; on success the
  // payload becomes REP_DICTIONARY and the source is deleted, on failure both stay.
  void BuildDictionaryFromBytesource();

  // Equal compact JSON texts of the two payloads' ToDict(), in which every payload inside is
  // written as its own ToDict() tree in the same way rather than by its form's writer (an
  // object's writer keeps field order, a tree's sorts names, stored JSON is as it came), so that
  // payloads holding the same object are equal whichever forms hold the payloads nested in
  // them; a bare number still differs from a quoted one. False when either cannot be made.
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
};

// What a compact object written to a sink is handed over in, at most.
constexpr size_t kSinkPieceBytes = 16384;

// The "error" dictionary of a failed conversion: type "error", code "badArgument", the text.
SARN_EXPORT ref<Dictionary> MakeErrorDictionary(VekMempool* pool, const VekString& text);

// The reader's message for a byte source whose Duplicate() gives null.
SARN_EXPORT extern const char kLazyDictNoDuplicateMessage[];  // "Byte source cannot be duplicated." (the direct reader's words)

}  // namespace sarn
