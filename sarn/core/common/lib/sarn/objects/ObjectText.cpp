// The text of a field value for both object writers. Numbers, dates, times and id texts are built
// by hand into the caller's room rather than with printf (same bytes: "%s%s" of an id into 100
// bytes, "INVALID_VALUE:%u"); the other scalar types and byte strings have their own formatters.
#include "sarn/objects/internal/ObjectText.h"

#include <cstdio>
#include <cstring>

#include "sarn/dict/Dict.h"
#include "sarn/model/FieldAccess.h"
#include "sarn/values/ScalarTypes.h"
#include "sarn/values/internal/LongIdText.h"
#include "sarn/values/internal/TimeText.h"
#include "sarn/base/internal/NumberText.h"

namespace sarn {
namespace internal {

static_assert(sizeof(ChannelNumber) == TraitsOf(SARN_DATA_TYPE_CHANNEL_NUMBER).width &&
                  sizeof(Currency) == TraitsOf(SARN_DATA_TYPE_CURRENCY).width &&
                  sizeof(DateTime) == TraitsOf(SARN_DATA_TYPE_DATETIME).width &&
                  sizeof(Date) == TraitsOf(SARN_DATA_TYPE_DATE).width &&
                  sizeof(Time) == TraitsOf(SARN_DATA_TYPE_TIME).width,
              "scalar value types have the widths the object layout gives them");

namespace {

void Set(FieldText& text, const char* bytes, size_t length) {
  text.pBytesM = bytes;
  text.nLengthM = length;
}

void SetString(FieldText& text, const VekString& string) {
  text.pStringM = &string;
  Set(text, string.Utf8(), string.NByte());
}

// Only a byte string's text may be empty (`isEmptyAllowed`); any other made text is empty only when
// it could not be had.
void SetMade(FieldText& text, VekString&& string, bool isEmptyAllowed = false) {
  if (string.FEmpty() && !isEmptyAllowed) text.isFailedM = true;
  text.madeM = static_cast<VekString&&>(string);
  SetString(text, text.madeM);
}

// Appends up to the room left (one byte is kept for the NUL).
void Put(char (&room)[kIdTextRoom], size_t& length, const char* bytes, size_t n) {
  size_t left = sizeof room - 1 - length;
  if (n > left) n = left;
  std::memcpy(room + length, bytes, n);
  length += n;
}

size_t FormatIdText(const StructInfo* const* structDefs, uint32_t nStructDefs, const FieldInfo& field,
                    const SarnObject* object, unsigned i, char (&room)[kIdTextRoom]) {
  size_t length = 0;
  const StructInfo* target = field.refIndex != 0 && field.refIndex < nStructDefs ? structDefs[field.refIndex] : nullptr;
  if (target == nullptr) {
    Put(room, length, "XXX", 3);
  } else {
    if (target->pIdPrefix != nullptr) Put(room, length, target->pIdPrefix, std::strlen(target->pIdPrefix));
    if (field.dataType == SARN_DATA_TYPE_STRING_ID) {
      const char* rest = FieldAccess::StringAt(object, field, i).Utf8();
      Put(room, length, rest, std::strlen(rest));
    } else {
      char digits[kLongIdTextRoom];
      uint64_t id = field.dataType == SARN_DATA_TYPE_INT_ID ? FieldAccess::ScalarValue<uint32_t>(object, field, i)
                                                            : FieldAccess::ScalarValue<uint64_t>(object, field, i);
      Put(room, length, digits, FormatLongIdInto(digits, id));
    }
  }
  room[length] = '\0';
  return length;
}

}  // namespace

void FormatFieldText(VekMempool* pool, const StructInfo* const* structDefs, uint32_t nStructDefs,
                     const FieldInfo& field, const SarnObject* object, unsigned i, FieldText& text) {
  char* room = text.roomM;
  switch (field.dataType) {
    case SARN_DATA_TYPE_BOOL:
      if (FieldAccess::ScalarValue<uint8_t>(object, field, i) != 0) {
        Set(text, "true", 4);
      } else {
        Set(text, "false", 5);
      }
      return;
    case SARN_DATA_TYPE_BYTESTRING: {
      // A missing byte string reads as an empty one.
      ref<vek::ByteBuffer> bytes = static_cast<vek::ByteBuffer*>(FieldAccess::ReferenceAt(object, field, i));
      if (bytes == nullptr) {
        Set(text, "", 0);
      } else {
        SetMade(text, Dict::FormatBytestring(pool, bytes), bytes->GetLength() == 0);
      }
      return;
    }
    case SARN_DATA_TYPE_CHANNEL_NUMBER:
      SetMade(text, FieldAccess::ScalarValue<ChannelNumber>(object, field, i).ToString());
      return;
    case SARN_DATA_TYPE_CURRENCY:
      SetMade(text, FieldAccess::ScalarValue<Currency>(object, field, i).ToString());
      return;
    case SARN_DATA_TYPE_DATE: {
      Date date = FieldAccess::ScalarValue<Date>(object, field, i);
      if (FormatDateText(date.daysM, room)) {
        Set(text, room, 10);
      } else {
        SetMade(text, date.ToString());
      }
      return;
    }
    case SARN_DATA_TYPE_DATETIME: {
      // Milliseconds are dropped by truncation, as a division of the signed count does.
      DateTime dateTime = FieldAccess::ScalarValue<DateTime>(object, field, i);
      if (FormatDateTimeText(dateTime.millisecondsM / 1000, room)) {
        Set(text, room, 19);
      } else {
        SetMade(text, dateTime.ToString());
      }
      return;
    }
    case SARN_DATA_TYPE_TIME: {
      int64_t seconds = FieldAccess::ScalarValue<Time>(object, field, i).millisecondsM / 1000;
      FormatTimeOfDayText(seconds - FloorDiv(seconds, 86400) * 86400, room);
      Set(text, room, 8);
      return;
    }
    case SARN_DATA_TYPE_ENUM: {
      uint32_t value = FieldAccess::ScalarValue<uint32_t>(object, field, i);
      const char* name = EnumNumberName(field.refIndex, value);
      if (name != nullptr) {
        Set(text, name, std::strlen(name));
        text.isNameM = true;
      } else {
        Set(text, room, static_cast<size_t>(std::snprintf(room, kIdTextRoom, "INVALID_VALUE:%u", value)));
      }
      return;
    }
    case SARN_DATA_TYPE_FLOAT:
      SetMade(text, Dict::FormatFloat(pool, FieldAccess::ScalarValue<double>(object, field, i)));
      return;
    case SARN_DATA_TYPE_INT_ID:
    case SARN_DATA_TYPE_LONG_ID:
    case SARN_DATA_TYPE_STRING_ID:
      Set(text, room, FormatIdText(structDefs, nStructDefs, field, object, i, text.roomM));
      return;
    case SARN_DATA_TYPE_S64:
      Set(text, room, FormatS64Into(room, FieldAccess::ScalarValue<int64_t>(object, field, i)));
      return;
    case SARN_DATA_TYPE_S32:
      Set(text, room, FormatS64Into(room, FieldAccess::ScalarValue<int32_t>(object, field, i)));
      return;
    case SARN_DATA_TYPE_U32:
      Set(text, room, FormatU64Into(room, FieldAccess::ScalarValue<uint32_t>(object, field, i)));
      return;
    case SARN_DATA_TYPE_U64:
      Set(text, room, FormatU64Into(room, FieldAccess::ScalarValue<uint64_t>(object, field, i)));
      return;
    case SARN_DATA_TYPE_STRING:
      SetString(text, FieldAccess::StringAt(object, field, i));
      return;
    default:
      Set(text, "", 0);
      return;
  }
}

}  // namespace internal
}  // namespace sarn
