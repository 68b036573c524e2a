// The protocol's header keys as shared strings, made once per process, so that looking a header
// up or adding one allocates nothing for its name.
#pragma once

#include "vek/VekString.h"

namespace sarn {
namespace internal {

struct HeaderNames {
  VekString rpcIdM;
  VekString schemaVersionM;
  VekString typeM;
  VekString requestTypeM;
  VekString responseCountM;
  VekString contentTypeM;
  VekString isFinalM;
  VekString lowerTypeM;  // "type"

  // Made on first use (thread-safe); the strings live in the default pool for the process.
  static const HeaderNames& Get();
};

}  // namespace internal
}  // namespace sarn
