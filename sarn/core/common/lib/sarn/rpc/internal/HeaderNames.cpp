#include "sarn/rpc/internal/HeaderNames.h"

#include "sarn/rpc/RpcV2Parser.h"

namespace sarn {
namespace internal {

const HeaderNames& HeaderNames::Get() {
  using Keys = RpcV2Parser::HeaderKeys;
  static const HeaderNames names{Keys::RpcId,       Keys::SchemaVersion, Keys::Type,    Keys::RequestType,
                                 Keys::ResponseCount, Keys::ContentType, Keys::IsFinal, "type"};
  return names;
}

}  // namespace internal
}  // namespace sarn
