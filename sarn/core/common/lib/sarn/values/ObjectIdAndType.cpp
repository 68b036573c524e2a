#include "sarn/values/ObjectIdAndType.h"

#include "sarn/values/ByteBuffer.h"
#include "sarn/model/Schema.h"
#include "sarn/base/internal/NumberText.h"

namespace sarn {

const ObjectIdAndType ObjectIdAndType::nil;

VekString ObjectIdAndType::ToString() const {
  const StructInfo* type = StructInfoForId(typeIdM);
  if (type == nullptr) return VekString();
  ByteBuffer text(nullptr);
  text.AppendString(type->pIdPrefix);
  char digits[24];
  text.AppendBytes(reinterpret_cast<const unsigned char*>(digits), internal::FormatU64Into(digits, objectIdM));
  text.AppendString(" - ");
  text.AppendString(type->pName);
  return VekString::FromUtf8Bytes(nullptr, text.GetLength(), text.GetData());
}

}  // namespace sarn
