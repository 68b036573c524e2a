// Scaffolding shared by the message and frame parser fuzz targets and by the tests: messages' bodies
// and one-line descriptions, and the frame parser's callbacks as a log.
#pragma once

#include <cstring>
#include <string>
#include <utility>
#include <vector>

#include <memory>

#include "../tests/testutil/TestStreams.h"

namespace rpcfuzz {

using sarntest::Require;

using sarntest::Str;

// What a duplicate of `source` reads, so that the source itself is not moved.
inline std::string SourceBytes(wynbaselib::Bytesource* source) {
  std::unique_ptr<wynbaselib::Bytesource> copy(source->Duplicate());
  std::string all;
  char block[4096];
  for (size_t n; (n = copy->Read(block, sizeof block)) != 0;) all.append(block, n);
  return all;
}

// The body of a request or a response (null for other messages), and its content type in `*type`.
inline ref<sarn::LazyDict> Body(const ref<sarn::KernoRpcWrapper>& w, VekString* type = nullptr) {
  VekString none;
  VekString& out = type != nullptr ? *type : none;
  if (auto* r = dynamic_cast<sarn::RequestWrapper*>(w.Get())) {
    out = r->contentTypeM;
    return r->bodyM;
  }
  if (auto* r = dynamic_cast<sarn::ResponseWrapper*>(w.Get())) {
    out = r->contentTypeM;
    return r->bodyM;
  }
  return nullptr;
}

// A body's bytes: those of a byte source as they came (read from a copy, so the payload is not
// changed), otherwise its compact JSON; "null" for none.
inline std::string BodyText(const ref<sarn::LazyDict>& body) {
  if (!body) return "null";
  return body->repM == sarn::LazyDict::REP_BYTESOURCE ? SourceBytes(body->pBytesourceM) : Str(body->ToJson(false));
}

// A message as one line: its headers, schema version and type name, then content type and body.
inline std::string Describe(VekMempool* pool, const ref<sarn::KernoRpcWrapper>& w, bool isWithBody = true) {
  if (!w) return "null";
  VekString contentType = "-";
  ref<sarn::LazyDict> body = Body(w, &contentType);
  return Str(w->HeadersToDict(pool)->ToString(false)) + " v" + std::to_string(w->schemaVersionM) + " " +
         Str(w->GetTypeName()) + (contentType == "-" ? "" : " ct=" + Str(contentType)) +
         (contentType == "-" || !isWithBody ? "" : " body=" + BodyText(body));
}

// The wrappers' own operator== for two of one kind.
inline bool SameWrapper(const ref<sarn::KernoRpcWrapper>& a, const ref<sarn::KernoRpcWrapper>& b) {
  using namespace sarn;
  auto *ra = dynamic_cast<RequestWrapper*>(a.Get()), *rb = dynamic_cast<RequestWrapper*>(b.Get());
  auto *sa = dynamic_cast<ResponseWrapper*>(a.Get()), *sb = dynamic_cast<ResponseWrapper*>(b.Get());
  auto *ca = dynamic_cast<CancelWrapper*>(a.Get()), *cb = dynamic_cast<CancelWrapper*>(b.Get());
  return (ra && rb && *ra == *rb) || (sa && sb && *sa == *sb) || (ca && cb && *ca == *cb);
}

// The frame parser's callbacks as a log: one event per callback, body pieces joined into one
// event; a callback that breaks the parser's promises crashes the run (which libFuzzer, the replay
// and a test all report).
inline bool IsSpace(char c) { return c == ' ' || (c >= '\t' && c <= '\r'); }

struct Recorder : sarn::RpcV2Parser::Callbacks {
  // One error, then silence; a caller that goes on after it (or ends again) resets `errorsM`.
  void OnError(const char* message) override {
    Require(++errorsM == 1);
    Add(std::string("error ") + message);
  }
  void OnHeaderSize(size_t length) override { Add("headerSize " + std::to_string(length)); }
  void OnBodySize(size_t length) override {
    bodySizeM = length;
    Add("bodySize " + std::to_string(length));
  }
  // Trimmed, and a key never holds the colon that ended it.
  void OnHeaderPair(const char* key, const char* value) override {
    for (const char* text : {key, value}) {
      const size_t length = std::strlen(text);
      Require(length == 0 || (!IsSpace(text[0]) && !IsSpace(text[length - 1])));
    }
    Require(std::strchr(key, ':') == nullptr);
    Add(std::string("header [") + key + "] [" + value + "]");
  }
  void OnBodyChunk(const char* data, size_t length) override {
    Require(length != 0 && errorsM == 0 && (bodyBytesM += length) <= bodySizeM);
    lastBodyChunkM = data;
    ++piecesM;
    if (isInBodyM) return void(eventsM.back().append(data, length));
    Add("body " + std::string(data, length));
    isInBodyM = true;
  }
  void OnParsingComplete() override {
    Require(bodyBytesM == bodySizeM && bodySizeM != 0);
    Add("complete");
  }
  void Add(std::string event) {
    Require(errorsM == 0 || event.rfind("error", 0) == 0);
    Note(std::move(event));
  }
  // The caller's own lines (verdicts), which may follow an error.
  void Note(std::string event) {
    eventsM.push_back(std::move(event));
    isInBodyM = false;
  }
  std::string Text(size_t from = 0) const {
    std::string text;
    for (size_t i = from; i < eventsM.size(); ++i) text += (i > from ? " | " : "") + eventsM[i];
    return text;
  }

  std::vector<std::string> eventsM;
  size_t errorsM = 0, bodySizeM = 0, bodyBytesM = 0, piecesM = 0;
  bool isInBodyM = false;
  const char* lastBodyChunkM = nullptr;
};

// Feeds the chunks as a reader does (stopping at the first refusal), then ends the input; the log
// closes with the verdicts of ParseChunk and EndParse. Destroying the parser ends the input once
// more, so a frame cut short repeats its error.
inline Recorder Feed(const std::vector<std::string_view>& chunks) {
  Recorder log;
  {
    sarn::RpcV2Parser parser(log);
    bool isOk = true;
    for (size_t i = 0; isOk && i < chunks.size(); ++i) isOk = parser.ParseChunk(chunks[i].data(), chunks[i].size());
    log.Note(isOk ? "parse true" : "parse false");
    log.Note(parser.EndParse() ? "end true" : "end false");
    log.errorsM = 0;  // for the destructor's repeat
  }
  return log;
}

}  // namespace rpcfuzz
