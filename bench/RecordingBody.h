// The recordingList bodies that the object benchmarks share: filled recordings (their nested
// objects one level deep) grown until the body's JSON reaches a target size, built once per size.
#pragma once

#include <map>
#include <memory>
#include <string>

#include "../tests/testutil/ObjectFill.h"
#include "sarn/Sarn.h"

namespace benchbody {

using namespace sarn;

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
    sarntest::FillObject(pool, recording.Get(), i, 1, 2, true);
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
