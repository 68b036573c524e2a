#include "sarn/rpc/RpcV2Parser.h"

#include <cstring>

#include "vek/VekServices.h"

namespace sarn {

const char RpcV2Parser::HeaderKeys::RpcId[] = "RpcId";
const char RpcV2Parser::HeaderKeys::SchemaVersion[] = "SchemaVersion";
const char RpcV2Parser::HeaderKeys::Type[] = "Type";
const char RpcV2Parser::HeaderKeys::RequestType[] = "RequestType";
const char RpcV2Parser::HeaderKeys::ResponseCount[] = "ResponseCount";
const char RpcV2Parser::HeaderKeys::ContentType[] = "Content-Type";
const char RpcV2Parser::HeaderKeys::IsFinal[] = "IsFinal";

const char RpcV2Parser::TypeValues::Request[] = "request";
const char RpcV2Parser::TypeValues::Response[] = "response";
const char RpcV2Parser::TypeValues::Cancel[] = "cancel";
const char RpcV2Parser::TypeValues::RequestUpdate[] = "requestUpdate";

const char RpcV2Parser::ResponseCountValues::Single[] = "single";
const char RpcV2Parser::ResponseCountValues::Multiple[] = "multiple";
const char RpcV2Parser::ResponseCountValues::None[] = "none";

const char RpcV2Parser::ContentTypeValues::ApplicationJson[] = "application/json";

const char RpcV2Parser::ErrorMessages::InvalidFirstLine[] = "RpcV2Parser: The first line of the message is invalid";
const char RpcV2Parser::ErrorMessages::InvalidFirstLineSize[] =
    "RpcV2Parser: The length of the first line exceeds the 25 characters limit";
const char RpcV2Parser::ErrorMessages::InvalidHeaderSize[] = "RpcV2Parser: The declared header length is invalid";
const char RpcV2Parser::ErrorMessages::InvalidBodySize[] = "RpcV2Parser: The declared body length is invalid";
const char RpcV2Parser::ErrorMessages::InvalidHeaderLine[] = "RpcV2Parser: Invalid header line";
const char RpcV2Parser::ErrorMessages::OutOfMemory[] = "RpcV2Parser: Out of memory (header line too long)";
const char RpcV2Parser::ErrorMessages::InvalidRpcIdValue[] = "RpcV2Parser: Invalid RpcId value";
const char RpcV2Parser::ErrorMessages::InvalidContentType[] = "RpcV2Parser: Invalid Content-Type value";
const char RpcV2Parser::ErrorMessages::InvalidResponseCountValue[] = "RpcV2Parser: Invalid ResponseCount value";
const char RpcV2Parser::ErrorMessages::InvalidTypeValue[] = "RpcV2Parser: Invalid Type value";
const char RpcV2Parser::ErrorMessages::MissingRpcId[] = "RpcV2Parser: Missing RpcId value";
const char RpcV2Parser::ErrorMessages::MissingType[] = "RpcV2Parser: Missing Type value";
const char RpcV2Parser::ErrorMessages::MissingResponseCount[] = "RpcV2Parser: Missing ResponseCount value";
const char RpcV2Parser::ErrorMessages::MissingRequestType[] = "RpcV2Parser: Missing RequestType value";
const char RpcV2Parser::ErrorMessages::MissingBody[] =
    "RpcV2Parser: The declared body length is zero for non-cancel message type";
const char RpcV2Parser::ErrorMessages::UnexpectedBody[] = "RpcV2Parser: 'cancel' should not have a body";
const char RpcV2Parser::ErrorMessages::UnexpectedData[] =
    "RpcV2Parser: Unexpected data after the end of the RPC packet";
const char RpcV2Parser::ErrorMessages::UnexpectedEndOfFirstLine[] = "RpcV2Parser: Unexpected end of first line";
const char RpcV2Parser::ErrorMessages::UnexpectedEndOfHeader[] = "RpcV2Parser: Unexpected end of header";
const char RpcV2Parser::ErrorMessages::UnexpectedEndOfBody[] = "RpcV2Parser: Unexpected end of body";
const char RpcV2Parser::ErrorMessages::BodySizeMismatch[] =
    "RpcV2Parser: The received body data size does not match the declared length";

RpcV2Parser::Callbacks::~Callbacks() {}

namespace {

// White space as the C locale defines it. A fixed set rather than isspace(): what a frame means
// must not depend on the locale the host program happens to have set.
inline bool IsSpace(char c) { return c == ' ' || (c >= '\t' && c <= '\r'); }

inline bool IsDigit(char c) { return c >= '0' && c <= '9'; }

// One "%zd" conversion of the C scanning functions: optional white space, an optional sign and
// at least one digit. The first line holds at most 23 bytes before its CR LF, so a number has at
// most 17 digits and cannot overflow; the clamp only keeps that true should the limit grow.
bool ScanNumber(const char*& p, const char* end, long long& number) {
  while (p < end && IsSpace(*p)) ++p;
  bool isNegative = false;
  if (p < end && (*p == '+' || *p == '-')) {
    isNegative = *p == '-';
    ++p;
  }
  if (p == end || !IsDigit(*p)) return false;
  long long value = 0;
  for (; p < end && IsDigit(*p); ++p) {
    if (value < 1000000000000000000LL) value = value * 10 + (*p - '0');
  }
  number = isNegative ? -value : value;
  return true;
}

// The first line without its CR LF must be exactly "MRPC/2 %zd %zd" in the C scanning sense: the
// blanks match any run of white space, none included, and nothing may follow the second number.
bool ScanFirstLine(const char* text, size_t length, long long& headerLength, long long& bodyLength) {
  static const char kMagic[] = "MRPC/2";
  const size_t magicLength = sizeof kMagic - 1;
  if (length < magicLength || std::memcmp(text, kMagic, magicLength) != 0) return false;
  const char* p = text + magicLength;
  const char* end = text + length;
  return ScanNumber(p, end, headerLength) && ScanNumber(p, end, bodyLength) && p == end;
}

inline bool Equal(const char* text, size_t length, const char* constant, size_t constantLength) {
  return length == constantLength && std::memcmp(text, constant, length) == 0;
}

template <size_t N>
inline bool Equal(const char* text, size_t length, const char (&constant)[N]) {
  return Equal(text, length, constant, N - 1);
}

}  // namespace

RpcV2Parser::RpcV2Parser(Callbacks& callbacks)
    : pCallbacksM(&callbacks),
      stateM(StateFirstLine),
      lineLengthM(0),
      headerLengthM(0),
      bodyLengthM(0),
      headerBytesReadM(0),
      bodyBytesReadM(0),
      rpcIdCountM(0),
      messageTypeM(MessageTypeNone),
      requestTypeCountM(0),
      responseCountCountM(0) {}

RpcV2Parser::~RpcV2Parser() { EndParse(); }

bool RpcV2Parser::ParseChunk(const char* data, size_t length) {
  const char* cursor = data;
  const char* end = data + length;
  while (cursor < end) {
    State next = stateM;
    switch (stateM) {
      case StateFirstLine:
        next = DoProcessFirstLine(cursor, end);
        break;
      case StateHeader:
        next = DoProcessHeaderLine(cursor, end);
        break;
      case StateHeaderDone:
        next = DoValidateHeaderData();
        break;
      case StateBody:
        next = DoProcessBodyChunk(cursor, end);
        break;
      case StateError:
        return false;
      case StateDone:
        // The state stays Done: each further chunk is refused with the same message.
        pCallbacksM->OnError(ErrorMessages::UnexpectedData);
        return false;
    }
    if (next != stateM) {
      stateM = next;
      lineLengthM = 0;
    }
  }
  // A header block that ends the input is judged at once, so that a cancel is complete and a
  // bad block is reported without waiting for bytes that may never come.
  if (stateM == StateHeaderDone) {
    State next = DoValidateHeaderData();
    if (next != stateM) {
      stateM = next;
      lineLengthM = 0;
    }
  }
  return stateM != StateError;
}

bool RpcV2Parser::EndParse() {
  switch (stateM) {
    case StateFirstLine:
      pCallbacksM->OnError(ErrorMessages::UnexpectedEndOfFirstLine);
      return false;
    case StateHeader:
      pCallbacksM->OnError(ErrorMessages::UnexpectedEndOfHeader);
      return false;
    case StateBody:
      pCallbacksM->OnError(ErrorMessages::UnexpectedEndOfBody);
      return false;
    case StateHeaderDone:
    case StateError:
    case StateDone:
      break;
  }
  return true;
}

// The exported steps forward to hidden twins: inside a shared library a call to an exported
// function goes through the symbol table (it could be interposed) and is never inlined, a cost
// a caller feeding one byte at a time pays on every byte.
RpcV2Parser::State RpcV2Parser::ProcessFirstLine(const char*& cursor, const char* end) {
  return DoProcessFirstLine(cursor, end);
}
RpcV2Parser::State RpcV2Parser::ProcessHeaderLine(const char*& cursor, const char* end) {
  return DoProcessHeaderLine(cursor, end);
}
RpcV2Parser::State RpcV2Parser::ValidateHeaderData() { return DoValidateHeaderData(); }
RpcV2Parser::State RpcV2Parser::ProcessBodyChunk(const char*& cursor, const char* end) {
  return DoProcessBodyChunk(cursor, end);
}
bool RpcV2Parser::ValidateHeaderPair(const char* key, const char* value) { return DoValidateHeaderPair(key, value); }
void RpcV2Parser::CacheUntilCrLfOrMax(const char*& cursor, const char* end, size_t max) {
  DoCacheUntilCrLfOrMax(cursor, end, max);
}

bool RpcV2Parser::CacheEndsInCrLf() const {
  return lineLengthM >= 2 && lineBufferM[lineLengthM - 2] == '\r' && lineBufferM[lineLengthM - 1] == '\n';
}

RpcV2Parser::State RpcV2Parser::Fail(const char* message) {
  pCallbacksM->OnError(message);
  return StateError;
}

void RpcV2Parser::DoCacheUntilCrLfOrMax(const char*& cursor, const char* end, size_t max) {
  if (cursor >= end || lineLengthM >= LINE_LIMIT) return;
  size_t count = static_cast<size_t>(end - cursor);
  if (count > max) count = max;
  if (count > LINE_LIMIT - lineLengthM) count = LINE_LIMIT - lineLengthM;
  // Look for the first LF that completes a CR LF. Its CR may be the last byte cached by an
  // earlier chunk; a lone LF (or CR) is an ordinary byte of the line.
  if (count < 16) {
    // Tiny chunks (a reader fed byte by byte): two library calls would cost more than the copy.
    char* line = lineBufferM;
    size_t length = lineLengthM;
    const char* stop = cursor + count;
    while (cursor < stop) {
      const char c = *cursor++;
      line[length++] = c;
      if (c == '\n' && length >= 2 && line[length - 2] == '\r') break;
    }
    lineLengthM = length;
    return;
  }
  const char* stop = cursor + count;
  for (const char* scan = cursor; scan < stop;) {
    const char* lf = static_cast<const char*>(std::memchr(scan, '\n', static_cast<size_t>(stop - scan)));
    if (lf == nullptr) break;
    char before = lf > cursor ? lf[-1] : (lineLengthM > 0 ? lineBufferM[lineLengthM - 1] : '\0');
    if (before == '\r') {
      count = static_cast<size_t>(lf + 1 - cursor);
      break;
    }
    scan = lf + 1;
  }
  std::memcpy(lineBufferM + lineLengthM, cursor, count);
  lineLengthM += count;
  cursor += count;
}

RpcV2Parser::State RpcV2Parser::DoProcessFirstLine(const char*& cursor, const char* end) {
  // The max keeps the cache at 25 bytes of first line, however the input is split.
  DoCacheUntilCrLfOrMax(cursor, end, FIRST_LINE_LIMIT - lineLengthM);
  if (!CacheEndsInCrLf()) {
    return lineLengthM >= FIRST_LINE_LIMIT ? Fail(ErrorMessages::InvalidFirstLineSize) : StateFirstLine;
  }
  long long headerLength = 0;
  long long bodyLength = 0;
  if (!ScanFirstLine(lineBufferM, lineLengthM - 2, headerLength, bodyLength)) {
    return Fail(ErrorMessages::InvalidFirstLine);
  }
  // A negative length is as bad as a huge one.
  if (headerLength < 1 || static_cast<unsigned long long>(headerLength) > HEADER_LENGTH_LIMIT) {
    return Fail(ErrorMessages::InvalidHeaderSize);
  }
  headerLengthM = static_cast<size_t>(headerLength);
  pCallbacksM->OnHeaderSize(headerLengthM);
  if (bodyLength < 0 || static_cast<unsigned long long>(bodyLength) > BODY_LENGTH_LIMIT) {
    return Fail(ErrorMessages::InvalidBodySize);
  }
  bodyLengthM = static_cast<size_t>(bodyLength);
  pCallbacksM->OnBodySize(bodyLengthM);
  return StateHeader;
}

RpcV2Parser::State RpcV2Parser::DoProcessHeaderLine(const char*& cursor, const char* end) {
  // Never take in bytes beyond the declared header block: they belong to the body.
  const size_t remaining = headerLengthM - headerBytesReadM;
  VekAssert(lineLengthM < remaining);
  DoCacheUntilCrLfOrMax(cursor, end, remaining - lineLengthM);
  // The block's last line may lack its CR LF; it ends where the block ends.
  if (!CacheEndsInCrLf() && lineLengthM != remaining) {
    return lineLengthM >= LINE_LIMIT ? Fail(ErrorMessages::OutOfMemory) : StateHeader;
  }
  headerBytesReadM += lineLengthM;
  const State next = headerBytesReadM < headerLengthM ? StateHeader : StateHeaderDone;
  const size_t lineLength = lineLengthM;
  lineLengthM = 0;
  // Two bytes or fewer: the empty line that closes the block (or a scrap too short to be a pair).
  if (lineLength <= 2) return next;

  // Key and value are handed on as C strings, so a NUL byte ends the line for every purpose.
  char* line = lineBufferM;
  line[lineLength] = '\0';
  const char* nul = static_cast<const char*>(std::memchr(line, '\0', lineLength));
  const size_t textLength = nul != nullptr ? static_cast<size_t>(nul - line) : lineLength;
  char* colon = static_cast<char*>(std::memchr(line, ':', textLength));
  if (colon == nullptr) return Fail(ErrorMessages::InvalidHeaderLine);

  char* key = line;
  char* keyEnd = colon;
  while (key < keyEnd && IsSpace(*key)) ++key;
  while (keyEnd > key && IsSpace(keyEnd[-1])) --keyEnd;
  *keyEnd = '\0';

  // An empty or all-white-space value is delivered as the empty string, whether the line ends in
  // CR LF or is the unterminated last line of the block: the trim runs over the whole value, CR
  // LF included, and never leaves a stray line-end byte behind as the value.
  char* value = colon + 1;
  char* valueEnd = line + textLength;
  while (value < valueEnd && IsSpace(*value)) ++value;
  while (valueEnd > value && IsSpace(valueEnd[-1])) --valueEnd;
  *valueEnd = '\0';

  if (!DoValidateHeaderPair(key, value)) return StateError;
  pCallbacksM->OnHeaderPair(key, value);
  return next;
}

bool RpcV2Parser::DoValidateHeaderPair(const char* key, const char* value) {
  const size_t keyLength = std::strlen(key);
  const size_t valueLength = std::strlen(value);
  // Each counter is raised before its value is judged; repeats are allowed and a later Type
  // overrides an earlier one.
  if (Equal(key, keyLength, HeaderKeys::RpcId)) {
    ++rpcIdCountM;
    for (size_t i = 0; i < valueLength; ++i) {
      if (!IsDigit(value[i])) {
        pCallbacksM->OnError(ErrorMessages::InvalidRpcIdValue);
        return false;
      }
    }
  } else if (Equal(key, keyLength, HeaderKeys::ContentType)) {
    if (!Equal(value, valueLength, ContentTypeValues::ApplicationJson)) {
      pCallbacksM->OnError(ErrorMessages::InvalidContentType);
      return false;
    }
  } else if (Equal(key, keyLength, HeaderKeys::ResponseCount)) {
    ++responseCountCountM;
    if (!Equal(value, valueLength, ResponseCountValues::Multiple) &&
        !Equal(value, valueLength, ResponseCountValues::None) &&
        !Equal(value, valueLength, ResponseCountValues::Single)) {
      pCallbacksM->OnError(ErrorMessages::InvalidResponseCountValue);
      return false;
    }
  } else if (Equal(key, keyLength, HeaderKeys::Type)) {
    if (Equal(value, valueLength, TypeValues::Cancel)) {
      messageTypeM = MessageTypeCancel;
    } else if (Equal(value, valueLength, TypeValues::Request)) {
      messageTypeM = MessageTypeRequest;
    } else if (Equal(value, valueLength, TypeValues::RequestUpdate)) {
      messageTypeM = MessageTypeRequestUpdate;
    } else if (Equal(value, valueLength, TypeValues::Response)) {
      messageTypeM = MessageTypeResponse;
    } else {
      pCallbacksM->OnError(ErrorMessages::InvalidTypeValue);
      return false;
    }
  } else if (Equal(key, keyLength, HeaderKeys::RequestType)) {
    ++requestTypeCountM;
  }
  return true;
}

RpcV2Parser::State RpcV2Parser::DoValidateHeaderData() {
  if (rpcIdCountM == 0) return Fail(ErrorMessages::MissingRpcId);
  if (messageTypeM == MessageTypeNone) return Fail(ErrorMessages::MissingType);
  if (messageTypeM == MessageTypeCancel) {
    if (bodyLengthM != 0) return Fail(ErrorMessages::UnexpectedBody);
  } else {
    if (bodyLengthM == 0) return Fail(ErrorMessages::MissingBody);
    if (messageTypeM == MessageTypeRequest) {
      if (responseCountCountM == 0) return Fail(ErrorMessages::MissingResponseCount);
      if (requestTypeCountM == 0) return Fail(ErrorMessages::MissingRequestType);
    } else if (messageTypeM == MessageTypeRequestUpdate) {
      if (requestTypeCountM == 0) return Fail(ErrorMessages::MissingRequestType);
    }
  }
  // OnParsingComplete belongs to the body; a frame without one ends here silently.
  return bodyBytesReadM < bodyLengthM ? StateBody : StateDone;
}

RpcV2Parser::State RpcV2Parser::DoProcessBodyChunk(const char*& cursor, const char* end) {
  const size_t missing = bodyLengthM - bodyBytesReadM;
  const size_t available = static_cast<size_t>(end - cursor);
  if (available < missing) {
    pCallbacksM->OnBodyChunk(cursor, available);
    bodyBytesReadM += available;
    cursor = end;
    return StateBody;
  }
  pCallbacksM->OnBodyChunk(cursor, missing);
  bodyBytesReadM += missing;
  cursor += missing;
  pCallbacksM->OnParsingComplete();
  return StateDone;
}

}  // namespace sarn
