// The streaming JSON parser: yajl's events turned into a Dictionary tree.
//
// yajl keeps its own parse stack in memory (through our pool) and has no nesting limit, so the
// callbacks count the depth and stop the parse when a container would open past the limit.
// yajl reports any stop by a callback as a client cancel; ErrorToString then reports the reason
// the callback recorded (the limit's message) where it would otherwise treat the cancel as the
// one case it expects, a top-level value that is not an object.
#include "sarn/json/JsonParser.h"

#include <cstdio>
#include <cstring>
#include <new>

#include "sarn/dict/internal/TextValue.h"
#include "sarn/json/internal/JsonReadSupport.h"
#include "vek/VekServices.h"

namespace sarn {

using internal::JsonReadSupport;

namespace {

const char kSourcePathG[] = "sarn/core/common/lib/sarn/JsonParser";

inline void Check(bool condition, const char* text) {
  if (!condition) VekAssertFail(text, kSourcePathG);
}

inline JsonParser* ParserOf(void* context) {
  Check(context != nullptr, "NULL != context");
  return static_cast<JsonParser*>(context);
}

}  // namespace

const char JsonParser::ErrorMessageJsonIsNotAMap[] = "The JSON must start with a '{' character";

const yajl_callbacks JsonParser::CALLBACKS = {
    JsonParser::OnNull,     JsonParser::OnBoolean,  nullptr,  // integers and doubles arrive as text
    nullptr,                JsonParser::OnNumber,   JsonParser::OnString,   JsonParser::OnStartMap,
    JsonParser::OnMapKey,   JsonParser::OnEndMap,   JsonParser::OnStartArray, JsonParser::OnEndArray,
};

const yajl_callbacks JsonParser::DEPTH_CALLBACKS = {
    nullptr, nullptr, nullptr, nullptr, nullptr, nullptr, JsonParser::OnSyntaxOpen,
    nullptr, JsonParser::OnSyntaxClose, JsonParser::OnSyntaxOpen, JsonParser::OnSyntaxClose,
};

// ---------------------------------------------------------------------------------------------
// DictStack

JsonParser::DictStack::~DictStack() {
  for (Node* list : {pTopM, pSpareM}) {
    while (list != nullptr) {
      Node* next = list->pNextM;
      delete list;
      list = next;
    }
  }
}

bool JsonParser::DictStack::Push(nonRef<DictValue> value, State state) {
  if (value == nullptr) return false;
  Node* node = pSpareM;
  if (node != nullptr) {
    pSpareM = node->pNextM;
  } else {
    node = new (std::nothrow) Node;
    if (node == nullptr) return false;
  }
  node->stateM = state;
  node->pValueM = value;
  node->pNextM = pTopM;
  pTopM = node;
  return true;
}

bool JsonParser::DictStack::Peek(nonRef<DictValue>& value, State& state) const {
  if (pTopM == nullptr) return false;
  value = pTopM->pValueM;
  state = pTopM->stateM;
  return true;
}

bool JsonParser::DictStack::PeekDictValue(nonRef<DictValue>& value) const {
  State state;
  return Peek(value, state);
}

bool JsonParser::DictStack::PeekState(State& state) const {
  if (pTopM == nullptr) return false;
  state = pTopM->stateM;
  return true;
}

bool JsonParser::DictStack::Pop(nonRef<DictValue>& value, State& state) {
  Node* node = pTopM;
  if (node == nullptr) return false;
  value = node->pValueM;
  state = node->stateM;
  pTopM = node->pNextM;
  node->pNextM = pSpareM;
  pSpareM = node;
  return true;
}

// ---------------------------------------------------------------------------------------------
// Life cycle

JsonParser::JsonParser(VekMempool* mempool) : JsonParser(mempool, JsonLimits()) {}

JsonParser::JsonParser(VekMempool* mempool, const JsonLimits& limits)
    : allocFuncsM{JsonParser::Malloc, JsonParser::Realloc, JsonParser::Free, this},
      pYajlHandleM(nullptr),
      statusM(yajl_status_error),
      pErrorTextM(nullptr),
      isParseEndedM(false),
      pMempoolM(mempool),
      pResultM(nullptr),
      pCurrentMapM(nullptr),
      pCurrentArrayM(nullptr),
      isJsonAMapM(true),
      depthM(0),
      maxDepthM(limits.maxDepthM),
      wasChunkRefusedM(false),
      pCancelTextM(nullptr),
      pSupportM(nullptr) {
  Check(pMempoolM != nullptr, "NULL != pMempoolM");
  std::snprintf(depthTextM, sizeof depthTextM, kJsonDepthLimitFormat, maxDepthM);
}

JsonParser::~JsonParser() {
  if (pYajlHandleM != nullptr) {
    if (!isParseEndedM) EndParse();
    ReleaseErrorText();
    yajl_free(pYajlHandleM);
  }
  if (pSupportM != nullptr) {
    pSupportM->~JsonReadSupport();
    pMempoolM->Free(pSupportM);
  }
}

void JsonParser::BeginParse() {
  Check(pYajlHandleM == nullptr, "!wasBeginParseCalled");
  // Not quite "no callbacks": the syntax check keeps the same depth bound as a real parse, so
  // that a body it accepts is not refused later when it is read into a tree.
  pYajlHandleM = yajl_alloc(&DEPTH_CALLBACKS, &allocFuncsM, this);
}

void JsonParser::BeginParse(PDictionary& result) {
  Check(pYajlHandleM == nullptr, "!wasBeginParseCalled");
  pResultM = &result;
  void* memory = pMempoolM->Malloc(sizeof(JsonReadSupport));
  if (memory != nullptr) pSupportM = new (memory) JsonReadSupport(pMempoolM);
  pYajlHandleM = yajl_alloc(&CALLBACKS, &allocFuncsM, this);
}

bool JsonParser::ParseChunk(const char* data, size_t length) {
  Check(pYajlHandleM != nullptr, "wasParsingStarted");
  TakeStatus(yajl_parse(pYajlHandleM, reinterpret_cast<const unsigned char*>(data), length));
  if (statusM != yajl_status_ok) wasChunkRefusedM = true;
  return statusM == yajl_status_ok;
}

bool JsonParser::EndParse() {
  if (!isParseEndedM) {
    Check(pYajlHandleM != nullptr, "wasBeginParseCalled");
    // After a refused chunk yajl would only add a second opinion ("premature EOF") over the
    // reason already given; the first failure is the answer.
    if (!wasChunkRefusedM) TakeStatus(yajl_complete_parse(pYajlHandleM));
    isParseEndedM = true;
  }
  return statusM == yajl_status_ok;
}

JsonParser::State JsonParser::GetState() const {
  State state;
  return dictionaryStackM.PeekState(state) ? state : StateNone;
}

// ---------------------------------------------------------------------------------------------
// Errors

void JsonParser::TakeStatus(yajl_status status) {
  // A callback's stop is always yajl's client cancel; only the allocator records a reason
  // without one, and yajl may have carried on to the end of the chunk after it.
  statusM = pCancelTextM == kOutOfMemoryMessage ? yajl_status_client_canceled : status;
  ErrorToString(statusM);
}

void JsonParser::ReleaseErrorText() {
  if (pErrorTextM != nullptr && pErrorTextM != ErrorMessageJsonIsNotAMap && pErrorTextM != pCancelTextM) {
    yajl_free_error(pYajlHandleM, reinterpret_cast<unsigned char*>(const_cast<char*>(pErrorTextM)));
  }
  pErrorTextM = nullptr;
}

void JsonParser::ErrorToString(yajl_status status) {
  ReleaseErrorText();
  switch (status) {
    case yajl_status_ok:
      break;
    case yajl_status_client_canceled:
      // A limit stops the parse from a callback too; its reason takes precedence over the
      // not-an-object case, which is the only other way a callback stops yajl.
      if (pCancelTextM != nullptr) {
        pErrorTextM = pCancelTextM;
      } else {
        Check(!isJsonAMapM, "!isJsonAMapM");
        pErrorTextM = ErrorMessageJsonIsNotAMap;
      }
      break;
    case yajl_status_error:
      pErrorTextM = reinterpret_cast<const char*>(yajl_get_error(pYajlHandleM, 0, nullptr, 0));
      break;
  }
}

VekString JsonParser::KeyText(const char* text, size_t length) {
  if (pSupportM != nullptr) return pSupportM->Key(text, length);
  return VekString::FromUtf8Bytes(pMempoolM, length, text);
}

int JsonParser::Cancel(const char* text) {
  pCancelTextM = text;
  return 0;
}

bool JsonParser::EnterContainer() {
  if (depthM >= maxDepthM) return Cancel(depthTextM) != 0;
  ++depthM;
  return true;
}

// ---------------------------------------------------------------------------------------------
// Allocation

void* JsonParser::Malloc(void* context, size_t size) {
  JsonParser* parser = ParserOf(context);
  void* memory = parser->pMempoolM->Malloc(size);
  if (memory != nullptr) return memory;
  // The loan: yajl would write through a null. Its blocks are freed through the pool that
  // each one records, so a loaned block goes back to the default pool.
  parser->OutOfMemory();
  return VekMempool::Default()->Malloc(size);
}

void* JsonParser::Realloc(void* context, void* pointer, size_t size) {
  if (pointer == nullptr) return Malloc(context, size);
  VekMempool* pool = VekMempool::PoolOf(pointer);
  if (size == 0) {
    pool->Free(pointer);
    return nullptr;
  }
  void* memory = pool->Realloc(pointer, size);
  if (memory != nullptr) return memory;
  ParserOf(context)->OutOfMemory();
  memory = VekMempool::Default()->Malloc(size);
  if (memory == nullptr) return nullptr;
  size_t nKeep = VekMempool::SizeOf(pointer);
  std::memcpy(memory, pointer, nKeep < size ? nKeep : size);
  pool->Free(pointer);
  return memory;
}

void JsonParser::Free(void*, void* pointer) {
  if (pointer != nullptr) VekMempool::PoolOf(pointer)->Free(pointer);
}

// ---------------------------------------------------------------------------------------------
// Tree building

bool JsonParser::AddNode(DictValue* value) {
  switch (GetState()) {
    case StateMap:
      return AddToMap(value);
    case StateArray:
      return AddToArray(value);
    case StateNone:
      break;
  }
  return SetScalar();
}

int JsonParser::AddFresh(DictValue* value) {
  if (value == nullptr) return OutOfMemory();
  if (AddNode(value)) return 1;
  delete value;
  return 0;
}

int JsonParser::AddText(VekString&& text, size_t length, bool needQuotes) {
  if (text.FEmpty() && length != 0) return OutOfMemory();
  StringValue* value = new (pMempoolM) StringValue(static_cast<VekString&&>(text));
  if (value != nullptr) value->needQuotesM = needQuotes;
  return AddFresh(value);
}

// An append fails at the container's limit or for lack of memory; the count tells which.
bool JsonParser::AddToMap(DictValue* value) {
  Check(!dictionaryStackM.IsEmpty(), "!dictionaryStackM.IsEmpty()");
  Check(pCurrentMapM != nullptr, "NULL != pCurrentMapM");
  if (JsonReadSupport::Add(*pCurrentMapM, static_cast<VekString&&>(currentKeyM), value)) return true;
  bool isFull = pCurrentMapM->CountValues(currentKeyM) >= kMaxValuesPerContainer;
  return Cancel(isFull ? kJsonRepeatedKeyLimitMessage : kOutOfMemoryMessage) != 0;
}

bool JsonParser::AddToArray(DictValue* value) {
  Check(!dictionaryStackM.IsEmpty(), "!dictionaryStackM.IsEmpty()");
  Check(pCurrentArrayM != nullptr, "NULL != pCurrentArrayM");
  if (pCurrentArrayM->valuesM.AddUnshared(value)) return true;
  bool isFull = pCurrentArrayM->valuesM.Count() >= kMaxValuesPerContainer;
  return Cancel(isFull ? kJsonArrayLimitMessage : kOutOfMemoryMessage) != 0;
}

bool JsonParser::SetScalar() {
  isJsonAMapM = false;
  return false;
}

bool JsonParser::SetMap(PDictionary& map) {
  if (!map) return OutOfMemory() != 0;
  if (dictionaryStackM.IsEmpty()) {
    *pResultM = map;
  } else if (!AddNode(map.Get())) {
    return false;
  }
  pCurrentMapM = map.Get();
  pCurrentArrayM = nullptr;
  return dictionaryStackM.Push(map.Get(), StateMap) || OutOfMemory() != 0;
}

bool JsonParser::SetArray(ref<ArrayValue>& array) {
  if (dictionaryStackM.IsEmpty()) {
    isJsonAMapM = false;
    return false;
  }
  if (!array) return OutOfMemory() != 0;
  if (!AddNode(array.Get())) return false;
  pCurrentMapM = nullptr;
  pCurrentArrayM = array.Get();
  return dictionaryStackM.Push(array.Get(), StateArray) || OutOfMemory() != 0;
}

bool JsonParser::RestorePreviousState() {
  nonRef<DictValue> value;
  State state;
  if (!dictionaryStackM.Pop(value, state)) return false;
  pCurrentMapM = nullptr;
  pCurrentArrayM = nullptr;
  if (!dictionaryStackM.Peek(value, state)) return true;
  switch (state) {
    case StateMap:
      pCurrentMapM = static_cast<Dictionary*>(value.Get());
      break;
    case StateArray:
      pCurrentArrayM = static_cast<ArrayValue*>(value.Get());
      break;
    default:
      Check(false, "0");
  }
  return true;
}

// ---------------------------------------------------------------------------------------------
// Callbacks

int JsonParser::OnNull(void* context) {
  JsonParser* parser = ParserOf(context);
  return parser->AddFresh(new (parser->pMempoolM) NullValue());
}

int JsonParser::OnBoolean(void* context, int value) {
  JsonParser* parser = ParserOf(context);
  size_t length = value ? 4 : 5;
  return parser->AddText(parser->KeyText(value ? "true" : "false", length), length, false);
}

int JsonParser::OnNumber(void* context, const char* text, size_t length) {
  JsonParser* parser = ParserOf(context);
  return parser->AddFresh(internal::NewTextValue(parser->pMempoolM, text, length, false));
}

int JsonParser::OnString(void* context, const unsigned char* text, size_t length) {
  JsonParser* parser = ParserOf(context);
  return parser->AddFresh(internal::NewTextValue(parser->pMempoolM, text, length, true));
}

int JsonParser::OnMapKey(void* context, const unsigned char* text, size_t length) {
  JsonParser* parser = ParserOf(context);
  parser->currentKeyM = parser->KeyText(reinterpret_cast<const char*>(text), length);
  return !parser->currentKeyM.FEmpty() || length == 0 || parser->OutOfMemory() != 0;
}

int JsonParser::OnStartMap(void* context) {
  JsonParser* parser = ParserOf(context);
  if (!parser->EnterContainer()) return 0;
  PDictionary map = new (parser->pMempoolM) Dictionary();
  return parser->SetMap(map);
}

int JsonParser::OnStartArray(void* context) {
  JsonParser* parser = ParserOf(context);
  if (!parser->EnterContainer()) return 0;
  ref<ArrayValue> array = new (parser->pMempoolM) ArrayValue();
  return parser->SetArray(array);
}

int JsonParser::OnEndMap(void* context) {
  JsonParser* parser = ParserOf(context);
  --parser->depthM;
  return parser->RestorePreviousState();
}

int JsonParser::OnEndArray(void* context) {
  JsonParser* parser = ParserOf(context);
  --parser->depthM;
  return parser->RestorePreviousState();
}

int JsonParser::OnSyntaxOpen(void* context) { return ParserOf(context)->EnterContainer(); }

int JsonParser::OnSyntaxClose(void* context) {
  --ParserOf(context)->depthM;
  return 1;
}

// ---------------------------------------------------------------------------------------------
// Whole byte sources

ref<Dictionary> Dictionary::FromJsonBytesource(wynbaselib::Bytesource* source, VekString& error,
                                               VekMempool* mempool) {
  return FromJsonBytesource(source, error, mempool, JsonLimits());
}

ref<Dictionary> Dictionary::FromJsonBytesource(wynbaselib::Bytesource* source, VekString& error,
                                               VekMempool* mempool, const JsonLimits& limits) {
  PDictionary result;
  {
    JsonParser parser(mempool, limits);
    parser.BeginParse(result);
    char block[512];
    for (;;) {
      size_t n = source != nullptr ? source->Read(block, sizeof block) : 0;
      if (n == 0) {
        // A source that stopped on an error (a corrupt compressed stream, say) must not pass
        // for a complete document just because the bytes before the error parse.
        if (source != nullptr && source->FError()) {
          error = VekString::Format(mempool, "Byte source error: %s", source->GetErrorText());
        } else if (!parser.EndParse()) {
          error = VekString::Format(mempool, "%s", parser.pErrorTextM != nullptr ? parser.pErrorTextM : "");
        }
        break;
      }
      if (!parser.ParseChunk(block, n)) {
        error = VekString::Format(mempool, "%s", parser.pErrorTextM != nullptr ? parser.pErrorTextM : "");
        break;
      }
    }
  }
  delete source;
  return result;
}

}  // namespace sarn
