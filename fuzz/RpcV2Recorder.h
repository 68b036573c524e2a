// The frame parser's callbacks as a log, shared by its fuzz target and its tests: one event per
// callback, body pieces joined into one event; a callback that breaks the parser's promises
// crashes the run (which libFuzzer, the replay and a test all report).
#pragma once

#include <cstring>
#include <string>
#include <utility>
#include <vector>

#include "sarn/rpc/RpcV2Parser.h"
#include "../tests/testutil/TestStreams.h"

namespace rpcfuzz {

using sarntest::Require;

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

}  // namespace rpcfuzz
