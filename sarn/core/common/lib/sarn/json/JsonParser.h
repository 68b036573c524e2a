// JsonParser: the streaming JSON reader. Text arrives in chunks of any size; yajl tokenizes it
// and the parser's callbacks build a Dictionary tree (or, in the syntax-only mode, nothing).
//
// Differences from the hand-written reader (Dictionary::FromJson): strict JSON (no bare keys or
// words, no trailing commas), every escape decoded (\u sequences become UTF-8), strings checked
// as UTF-8, and a repeated key adds another value under that key instead of failing.
//
// Ownership: yajl's memory and every node come from the pool given to the constructor. The tree
// belongs to the caller's `result`, which survives the parser. The open-container stack
// (DictStack) lives on the global heap. The error text (pErrorTextM) is owned by the parser and
// valid until the next call or its destruction.
//
// Limits: the nesting depth is bounded (JsonLimits, Limits.h), also in the syntax-only mode; a
// deeper document stops the parse with the limit's own message.
//
// Thread safety: one parser per thread; the static callbacks record and texts are constant.
#pragma once

#include <yajl/yajl_parse.h>

#include <cstddef>

#include "sarn/dict/Dictionary.h"
#include "sarn/base/Limits.h"

namespace sarn {

namespace internal {
class JsonReadSupport;
}  // namespace internal

typedef ref<Dictionary> PDictionary;
typedef ref<DictValue> PDictValue;

class SARN_EXPORT JsonParser {
 public:
  enum State {
    StateNone = 0,   // no container open: the top level
    StateMap = 1,    // inside an object
    StateArray = 2,  // inside an array
  };

  // The open containers, top first. Nodes come from the global heap; popped nodes are kept for
  // the next push, so a document costs one allocation per level of its deepest nesting.
  class SARN_EXPORT DictStack {
   public:
    struct Node {
      State stateM;
      nonRef<DictValue> pValueM;  // the container, owned by the tree
      Node* pNextM;
    };

    DictStack() : pTopM(nullptr), pSpareM(nullptr) {}
    virtual ~DictStack();
    DictStack(const DictStack&) = delete;
    DictStack& operator=(const DictStack&) = delete;

    // False, pushing nothing, when `value` is null (or memory runs out).
    bool Push(nonRef<DictValue> value, State state);
    // The top entry; false when empty.
    bool Peek(nonRef<DictValue>& value, State& state) const;
    bool PeekDictValue(nonRef<DictValue>& value) const;
    bool PeekState(State& state) const;
    // Returns and removes the top entry; false when empty.
    bool Pop(nonRef<DictValue>& value, State& state);
    bool IsEmpty() const { return pTopM == nullptr; }

    Node* pTopM;

   private:
    Node* pSpareM;
  };

  explicit JsonParser(VekMempool* mempool);
  JsonParser(VekMempool* mempool, const JsonLimits& limits);
  // Ends a parse that was not ended, then frees yajl's handle. The tree survives.
  virtual ~JsonParser();
  JsonParser(const JsonParser&) = delete;
  JsonParser& operator=(const JsonParser&) = delete;

  // Syntax check only: builds nothing (any top-level value is accepted).
  void BeginParse();
  // Builds a tree; the top-level object is stored in `result` (which the caller sets to null and
  // keeps alive until the parser is gone).
  void BeginParse(PDictionary& result);
  // Feeds one chunk; false on a syntax error, a refused document or a lack of memory
  // (pErrorTextM says why: kOutOfMemoryMessage for the last).
  // After a failure the parser is not fed again.
  bool ParseChunk(const char* data, size_t length);
  // Ends the document (yajl then checks that it is complete). A second call repeats the answer.
  bool EndParse();
  // The kind of the innermost open container, StateNone at the top level.
  State GetState() const;

  // yajl's allocation functions; their context is the parser. yajl writes through what its
  // allocator returns without a check, so these never return null: when the parser's pool runs
  // out they lend a block of the default pool and stop the parse with kOutOfMemoryMessage at
  // the next callback or at the end of the chunk, whichever comes first.
  static void* Malloc(void* context, size_t size);
  static void* Realloc(void* context, void* pointer, size_t size);
  static void Free(void* context, void* pointer);
  // yajl's event callbacks; their context is the parser. Non-zero goes on, 0 stops the parse.
  static int OnNull(void* context);
  static int OnBoolean(void* context, int value);
  static int OnNumber(void* context, const char* text, size_t length);
  static int OnString(void* context, const unsigned char* text, size_t length);
  static int OnStartMap(void* context);
  static int OnMapKey(void* context, const unsigned char* text, size_t length);
  static int OnEndMap(void* context);
  static int OnStartArray(void* context);
  static int OnEndArray(void* context);

  static const yajl_callbacks CALLBACKS;
  static const char ErrorMessageJsonIsNotAMap[];  // "The JSON must start with a '{' character"

  // Parser state, in order.
  yajl_alloc_funcs allocFuncsM;
  yajl_handle pYajlHandleM;
  yajl_status statusM;
  const char* pErrorTextM;
  bool isParseEndedM;
  VekMempool* pMempoolM;
  PDictionary* pResultM;
  DictStack dictionaryStackM;
  Dictionary* pCurrentMapM;
  ArrayValue* pCurrentArrayM;
  VekString currentKeyM;
  bool isJsonAMapM;

 private:
  // Callbacks of the syntax-only mode: they only count the depth.
  static const yajl_callbacks DEPTH_CALLBACKS;
  static int OnSyntaxOpen(void* context);
  static int OnSyntaxClose(void* context);

  // Adds `value`, a node this parse made, to the open container, which takes a reference on
  // success (with a plain store: nobody else can reach the node yet).
  bool AddNode(DictValue* value);
  // AddNode for a node nobody references yet: destroyed on failure. Returns the callback answer.
  int AddFresh(DictValue* value);
  // Stops the parse because the pool ran out. Returns the callback answer (0).
  int OutOfMemory() { return Cancel(kOutOfMemoryMessage); }
  // A new StringValue of `text` (which came from `length` bytes) added to the open container.
  int AddText(VekString&& text, size_t length, bool needQuotes);
  // After yajl returns: a stop for lack of memory overrides what yajl said.
  void TakeStatus(yajl_status status);
  // A key or literal text, shared through the key cache; empty when memory runs out.
  VekString KeyText(const char* text, size_t length);
  bool AddToMap(DictValue* value);
  bool AddToArray(DictValue* value);
  bool SetScalar();
  bool SetMap(PDictionary& map);
  bool SetArray(ref<ArrayValue>& array);
  bool RestorePreviousState();
  // True when one more container may open; otherwise records the limit as the reason to stop.
  bool EnterContainer();
  // Stops the parse for a reason of ours (a limit); the text becomes the error text.
  int Cancel(const char* text);
  void ErrorToString(yajl_status status);
  void ReleaseErrorText();

  int depthM;
  int maxDepthM;
  bool wasChunkRefusedM;    // a chunk failed: EndParse keeps that answer
  const char* pCancelTextM;  // why our callbacks stopped the parse, or null
  internal::JsonReadSupport* pSupportM;
  char depthTextM[80];
};

}  // namespace sarn
