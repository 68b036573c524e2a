// KernoRpcV2: the frame writer shared by the four marshalling entries, and the string reader.
#include "sarn/rpc/KernoRpcV2.h"

#include <cctype>
#include <cstdio>
#include <cstring>
#include <string>

#include "sarn/base/Limits.h"
#include "sarn/rpc/KernoRpcV2Packetizer.h"
#include "sarn/rpc/RpcV2Parser.h"
#include "sarn/rpc/internal/HeaderNames.h"

namespace sarn {

const char KernoRpcV2::BodyTooLargeMessage[] = "Kerno Rpc message body is too large.";
const char KernoRpcV2::HeadersTooLargeMessage[] = "Kerno Rpc headers are too large";
const char KernoRpcV2::HeaderWriteFailedMessage[] = "Failed to write headers";
const char KernoRpcV2::MissingBodyMessage[] = "Missing message body";

namespace {

using Keys = RpcV2Parser::HeaderKeys;
inline const internal::HeaderNames& Names() { return internal::HeaderNames::Get(); }

void Append(VekMempool* pool, VekString& error, const char* text) {
  error = VekString::Format(pool, "%s%s", error.Utf8(), text);
}
void Replace(VekMempool* pool, VekString& error, const char* text) {
  error = VekString::FromUtf8Bytes(pool, std::strlen(text), text);
}

// ---- The frame writer -----------------------------------------------------------------------

// One message made ready to go out: its headers, its header block and the first line, all
// checked. Only then does any entry write a byte.
class FrameWriter {
 public:
  explicit FrameWriter(VekMempool* pool) : pMempoolM(pool), blockM(pool), firstLineLengthM(0) {}

  // The headers of `message`; false (with the message appended) when memory runs out.
  bool TakeHeaders(const ref<KernoRpcWrapper>& message, VekString& error) {
    headersM = message->HeadersToDict(pMempoolM);
    if (!headersM) Append(pMempoolM, error, kOutOfMemoryMessage);
    return static_cast<bool>(headersM);
  }

  // The body's size against its limit, then the header block against its limits.
  bool Check(size_t bodyLength, VekString& error) {
    if (bodyLength > RpcV2Parser::BODY_LENGTH_LIMIT) {
      Append(pMempoolM, error, KernoRpcV2::BodyTooLargeMessage);
      return false;
    }
    // A request, update or response without body bytes would be refused by every reader.
    if (bodyLength == 0 && !headersM->GetString(Names().typeM, 0).FEqual(RpcV2Parser::TypeValues::Cancel)) {
      Append(pMempoolM, error, KernoRpcV2::MissingBodyMessage);
      return false;
    }
    if (!BuildBlock(error)) return false;
    firstLineLengthM = static_cast<size_t>(std::snprintf(firstLineM, sizeof firstLineM, "MRPC/2 %lu %lu\r\n",
                                                         blockM.GetLength(), static_cast<unsigned long>(bodyLength)));
    return true;
  }

  const char* FirstLine() const { return firstLineM; }
  size_t FirstLineLength() const { return firstLineLengthM; }
  const ByteBuffer& Block() const { return blockM; }

 private:
  // Names in byte order, every value of a name in stored order, then the empty line. The
  // platform's arrays cannot list more than kMaxValuesPerContainer names, and no reader takes
  // more lines than that, so a larger header set is refused rather than cut short.
  bool BuildBlock(VekString& error) {
    if (headersM->CountNames() > kMaxValuesPerContainer) return TooLarge(error);
    VekStringArray names(pMempoolM);
    headersM->GetSortedNames(names);
    size_t lines = 0;
    for (int i = 0; i < names.Count(); ++i) {
      const VekString& name = names[i];
      const unsigned n = headersM->CountValues(name);
      lines += n;
      if (lines > kMaxValuesPerContainer) return TooLarge(error);
      for (unsigned j = 0; j < n; ++j) {
        const VekString value = headersM->GetString(name, static_cast<int>(j));
        blockM.AppendBytes(reinterpret_cast<const unsigned char*>(name.Utf8()), name.NByte());
        blockM.AppendBytes(reinterpret_cast<const unsigned char*>(": "), 2);
        blockM.AppendBytes(reinterpret_cast<const unsigned char*>(value.Utf8()), value.NByte());
        blockM.AppendBytes(reinterpret_cast<const unsigned char*>("\r\n"), 2);
      }
      if (blockM.GetLength() > RpcV2Parser::HEADER_LENGTH_LIMIT) return TooLarge(error);
    }
    blockM.AppendBytes(reinterpret_cast<const unsigned char*>("\r\n"), 2);
    if (blockM.HasFailed()) {
      Append(pMempoolM, error, kOutOfMemoryMessage);
      return false;
    }
    return blockM.GetLength() <= RpcV2Parser::HEADER_LENGTH_LIMIT || TooLarge(error);
  }

  bool TooLarge(VekString& error) {
    Append(pMempoolM, error, KernoRpcV2::HeadersTooLargeMessage);
    return false;
  }

  VekMempool* pMempoolM;
  ref<Dict> headersM;
  ByteBuffer blockM;
  char firstLineM[64];
  size_t firstLineLengthM;
};

// ---- The string reader ----------------------------------------------------------------------

inline bool IsSpace(char c) { return std::isspace(static_cast<unsigned char>(c)) != 0; }

// The bytes [begin, end) without surrounding white space.
void Trim(const char*& begin, const char*& end) {
  while (begin < end && IsSpace(*begin)) ++begin;
  while (end > begin && IsSpace(end[-1])) --end;
}

// A length field read as "%zd" reads it: leading white space, a sign, digits, and whatever
// follows ignored. False when there are no digits; a negative or overlarge value saturates to
// SIZE_MAX, which every limit refuses.
bool ScanLength(const char* begin, const char* end, size_t& value) {
  while (begin < end && IsSpace(*begin)) ++begin;
  bool isNegative = false;
  if (begin < end && (*begin == '+' || *begin == '-')) isNegative = *begin++ == '-';
  if (begin == end || *begin < '0' || *begin > '9') return false;
  size_t n = 0;
  for (; begin < end && *begin >= '0' && *begin <= '9'; ++begin) {
    n = n > (SIZE_MAX - 9) / 10 ? SIZE_MAX : n * 10 + static_cast<size_t>(*begin - '0');
  }
  value = isNegative && n != 0 ? SIZE_MAX : n;
  return true;
}

const char* FindCrLf(const char* begin, const char* end) {
  for (const char* at = begin; at + 1 < end; ++at) {
    at = static_cast<const char*>(std::memchr(at, '\r', static_cast<size_t>(end - 1 - at)));
    if (at == nullptr) return nullptr;
    if (at[1] == '\n') return at;
  }
  return nullptr;
}

// The header lines of a block: pieces between CR LFs, empty ones skipped. A line without ':'
// appends its message; more lines than the platform's arrays hold are refused with ours.
ref<Dict> ReadHeaderBlock(VekMempool* pool, const char* begin, const char* end, VekString& error) {
  ref<Dict> headers = MakeDict(pool);
  if (!headers) {
    Replace(pool, error, kOutOfMemoryMessage);
    return nullptr;
  }
  size_t lines = 0;
  while (begin < end) {
    const char* crlf = FindCrLf(begin, end);
    const char* lineEnd = crlf != nullptr ? crlf : end;
    if (lineEnd != begin) {
      const char* colon = static_cast<const char*>(std::memchr(begin, ':', static_cast<size_t>(lineEnd - begin)));
      if (colon == nullptr) {
        std::string text(error.Utf8(), error.NByte());
        text.append("Invalid header line: ").append(begin, lineEnd);
        error = VekString::FromUtf8Bytes(pool, text.size(), text.data());
        return nullptr;
      }
      if (++lines > kMaxValuesPerContainer) {
        Replace(pool, error, kRpcHeaderLineLimitMessage);
        return nullptr;
      }
      const char* valueBegin = colon + 1;
      const char* valueEnd = lineEnd;
      Trim(valueBegin, valueEnd);
      const VekString key = VekString::FromUtf8Bytes(pool, static_cast<size_t>(colon - begin), begin);
      const VekString value = VekString::FromUtf8Bytes(pool, static_cast<size_t>(valueEnd - valueBegin), valueBegin);
      // A string the pool could not make comes back empty.
      if (key.NByte() != static_cast<size_t>(colon - begin) ||
          value.NByte() != static_cast<size_t>(valueEnd - valueBegin) || !headers->AddString(key, value)) {
        Replace(pool, error, kOutOfMemoryMessage);
        return nullptr;
      }
    }
    begin = crlf != nullptr ? crlf + 2 : end;
  }
  return headers;
}

// The count a ResponseCount text names; false for any other text.
bool ResponseCountOf(const VekString& text, RequestWrapper::ResponseCount& count) {
  if (text.FEqual(RpcV2Parser::ResponseCountValues::None)) {
    count = RequestWrapper::ResponseCountNone;
  } else if (text.FEqual(RpcV2Parser::ResponseCountValues::Single)) {
    count = RequestWrapper::ResponseCountSingle;
  } else if (text.FEqual(RpcV2Parser::ResponseCountValues::Multiple)) {
    count = RequestWrapper::ResponseCountMultiple;
  } else {
    return false;
  }
  return true;
}

}  // namespace

// ---- Writers --------------------------------------------------------------------------------

bool KernoRpcV2::MarshalToString(const ref<KernoRpcWrapper>& message, ByteBuffer& out, VekString& error,
                                 VekMempool* pool, bool pretty) {
  FrameWriter frame(pool);
  if (!frame.TakeHeaders(message, error)) return false;
  ByteBuffer body(pool);
  message->BodyToJsonByteBuffer(body, pretty);
  if (body.HasFailed()) {
    Append(pool, error, kOutOfMemoryMessage);
    return false;
  }
  if (!frame.Check(body.GetLength(), error)) return false;
  const ByteBuffer& block = frame.Block();
  out.Reserve(frame.FirstLineLength() + block.GetLength() + body.GetLength());
  out.AppendBytes(reinterpret_cast<const unsigned char*>(frame.FirstLine()), frame.FirstLineLength());
  out.AppendBytes(block.GetData(), block.GetLength());
  out.AppendBytes(body.GetData(), body.GetLength());
  if (out.HasFailed()) {
    Append(pool, error, kOutOfMemoryMessage);
    return false;
  }
  return true;
}

bool KernoRpcV2::MarshalToString(const ref<KernoRpcWrapper>& message, VekString& out, VekString& error,
                                 VekMempool* pool, bool pretty) {
  ByteBuffer frame(pool);
  if (!MarshalToString(message, frame, error, pool, pretty)) return false;
  VekString text = VekString::FromUtf8Bytes(pool, frame.GetLength(), frame.GetData());
  if (text.NByte() != frame.GetLength()) {
    Append(pool, error, kOutOfMemoryMessage);
    return false;
  }
  out = text;
  return true;
}

VekString KernoRpcV2::MarshalToString(VekMempool* pool, const ref<KernoRpcWrapper>& message, bool pretty) {
  VekString out;
  VekString error;
  MarshalToString(message, out, error, pool, pretty);
  return out;
}

bool KernoRpcV2::MarshalToBytesink(const ref<KernoRpcWrapper>& message, wynbaselib::Bytesink& sink, VekString& error,
                                   VekMempool* pool, bool pretty) {
  FrameWriter frame(pool);
  if (!frame.TakeHeaders(message, error)) return false;
  wynbaselib::ByteCountingBytesink counter;
  message->BodyToJsonByteSink(counter, pretty);
  if (!frame.Check(counter.GetCount(), error)) return false;
  sink.Write(frame.FirstLine(), frame.FirstLineLength());
  const ByteBuffer& block = frame.Block();
  if (!sink.Write(reinterpret_cast<const char*>(block.GetData()), block.GetLength())) {
    Append(pool, error, HeaderWriteFailedMessage);
    return false;
  }
  message->BodyToJsonByteSink(sink, pretty);
  sink.Flush();
  return true;
}

// ---- String reader --------------------------------------------------------------------------

bool KernoRpcV2::ParseFirstLine(VekMempool* pool, const char* text, size_t size, size_t& headerLength,
                                size_t& bodyLength, size_t& firstLineLength, VekString& error) {
  const char* end = text + size;
  const char* crlf = FindCrLf(text, end);
  if (crlf == nullptr) {
    firstLineLength = size > RpcV2Parser::FIRST_LINE_LIMIT ? size : 0;
    if (firstLineLength != 0) Replace(pool, error, "First line too long");
    return false;
  }
  firstLineLength = static_cast<size_t>(crlf - text) + 2;
  const char* begin = text;
  const char* lineEnd = crlf;
  Trim(begin, lineEnd);
  // The fields are the pieces between single blanks: two blanks in a row make an empty field.
  const char* fields[3][2];
  size_t nField = 0;
  for (const char* at = begin;;) {
    const char* blank = static_cast<const char*>(std::memchr(at, ' ', static_cast<size_t>(lineEnd - at)));
    const char* fieldEnd = blank != nullptr ? blank : lineEnd;
    if (nField < 3) fields[nField][0] = at, fields[nField][1] = fieldEnd;
    ++nField;
    if (blank == nullptr) break;
    at = blank + 1;
  }
  if (nField != 3) {
    Replace(pool, error, "First line does not have expected number of fields (3)");
    return false;
  }
  if (fields[0][1] - fields[0][0] != 6 || std::memcmp(fields[0][0], "MRPC/2", 6) != 0) {
    Replace(pool, error, "First line of message does not start with 'MRPC/2'");
    return false;
  }
  if (!ScanLength(fields[1][0], fields[1][1], headerLength)) {
    Replace(pool, error, "Invalid header length - not a number");
    return false;
  }
  if (headerLength > RpcV2Parser::HEADER_LENGTH_LIMIT) {
    Replace(pool, error, "Declared header length too long");
    return false;
  }
  if (!ScanLength(fields[2][0], fields[2][1], bodyLength)) {
    Replace(pool, error, "Invalid body length - not a number");
    return false;
  }
  if (bodyLength > RpcV2Parser::BODY_LENGTH_LIMIT) {
    Replace(pool, error, "Declared body length too long");
    return false;
  }
  return true;
}

ref<KernoRpcWrapper> KernoRpcV2::UnmarshalFromString(VekMempool* pool, const VekString& text, bool parseBodyNow,
                                                     VekString& error) {
  size_t headerLength = 0, bodyLength = 0, firstLineLength = 0;
  if (!ParseFirstLine(pool, text.Utf8(), text.NByte(), headerLength, bodyLength, firstLineLength, error)) {
    return nullptr;
  }
  // The cut is by bytes: the block and the body are the next headerLength and bodyLength bytes,
  // even when that splits a multi-byte character; what follows is judged as it stands.
  const char* block = text.Utf8() + firstLineLength;
  size_t rest = text.NByte() - firstLineLength;
  const size_t blockSize = headerLength < rest ? headerLength : rest;
  if (blockSize != headerLength) {
    error = VekString::Format(pool, "Size of header (%zu) does not match expected (%zu)", blockSize, headerLength);
    return nullptr;
  }
  rest -= blockSize;
  const size_t bodySize = bodyLength < rest ? bodyLength : rest;
  if (bodySize != bodyLength) {
    error = VekString::Format(pool, "Size of body (%zu) does not match expected (%zu)", bodySize, bodyLength);
    return nullptr;
  }
  ref<Dict> headers = ReadHeaderBlock(pool, block, block + blockSize, error);
  if (!headers) return nullptr;
  return BuildWrapperFromHeaders(pool, headers, block + blockSize, bodySize, parseBodyNow, error);
}

ref<KernoRpcWrapper> KernoRpcV2::BuildWrapperFromHeaders(VekMempool* pool, ref<Dict>& headers, const char* body,
                                                         size_t bodyLength, bool parseBodyNow, VekString& error) {
  if (headers->CountValues(Names().rpcIdM) == 0) {
    Replace(pool, error, "Missing rpcId");
    return nullptr;
  }
  const VekString contentType = headers->GetString(Names().contentTypeM, 0);
  if (!contentType.FEmpty() && !contentType.FEqual(RpcV2Parser::ContentTypeValues::ApplicationJson)) {
    error = VekString::Format(pool, "Unsupported Content-Type: '%s'", contentType.Utf8());
    return nullptr;
  }
  const unsigned rpcId = Dict::ParseU32(pool, headers->GetString(Names().rpcIdM, 0).Utf8());
  const KernoVersion version =
      static_cast<KernoVersion>(Dict::ParseU32(pool, headers->GetString(Names().schemaVersionM, 0).Utf8()));
  const VekString type = headers->GetString(Names().typeM, 0);
  ref<LazyDict> payload;

  if (type.FEqual(RpcV2Parser::TypeValues::Request)) {
    RequestWrapper::ResponseCount count;
    if (headers->CountValues(Names().responseCountM) == 0) {
      Replace(pool, error, "Missing ResponseCount in request");
      return nullptr;
    }
    if (!ResponseCountOf(headers->GetString(Names().responseCountM, 0), count)) {
      Replace(pool, error, "Invalid value for ResponseCount header");
      return nullptr;
    }
    if (headers->CountValues(Names().requestTypeM) == 0) {
      Replace(pool, error, "Missing RequestType in request");
      return nullptr;
    }
    if (!BodyToLazyDict(pool, body, bodyLength, parseBodyNow, version, payload, error)) return nullptr;
    ref<RequestWrapper> request = RequestWrapper::New(pool, rpcId, headers->GetString(Names().requestTypeM, 0), count,
                                                      version, payload, nullptr);
    if (!request) return Replace(pool, error, kOutOfMemoryMessage), nullptr;
    request->contentTypeM = contentType;
    request->SetOptionalHeaders(headers);
    return request;
  }
  if (type.FEqual(RpcV2Parser::TypeValues::RequestUpdate)) {
    if (headers->CountValues(Names().requestTypeM) == 0) {
      Replace(pool, error, "Missing RequestType header.");
      return nullptr;
    }
    if (!BodyToLazyDict(pool, body, bodyLength, parseBodyNow, version, payload, error)) return nullptr;
    ref<RequestUpdateWrapper> update =
        RequestUpdateWrapper::New(pool, rpcId, headers->GetString(Names().requestTypeM, 0), payload, nullptr);
    if (!update) return Replace(pool, error, kOutOfMemoryMessage), nullptr;
    update->contentTypeM = contentType;
    update->SetOptionalHeaders(headers);
    return update;
  }
  if (type.FEqual(RpcV2Parser::TypeValues::Response)) {
    if (!BodyToLazyDict(pool, body, bodyLength, parseBodyNow, version, payload, error)) return nullptr;
    const bool isFinal = headers->GetString(Names().isFinalM, 0).FEqual("true");
    ref<ResponseWrapper> response = ResponseWrapper::New(pool, rpcId, isFinal, payload, nullptr);
    if (!response) return Replace(pool, error, kOutOfMemoryMessage), nullptr;
    response->contentTypeM = contentType;
    response->SetOptionalHeaders(headers);
    return response;
  }
  if (type.FEqual(RpcV2Parser::TypeValues::Cancel)) {
    if (bodyLength != 0) {
      Replace(pool, error, "'cancel' should not have a body");
      return nullptr;
    }
    ref<CancelWrapper> cancel = CancelWrapper::New(pool, rpcId, nullptr);
    if (!cancel) Replace(pool, error, kOutOfMemoryMessage);
    return cancel;
  }
  if (!type.FEmpty()) {
    error = VekString::Format(pool, "Error in unmarshalling : Unknown Type: %s", type.Utf8());
  } else {
    Replace(pool, error, "Missing 'Type' header");
  }
  return nullptr;
}

bool KernoRpcV2::BodyToLazyDict(VekMempool* pool, const char* body, size_t bodyLength, bool parseBodyNow,
                                KernoVersion version, ref<LazyDict>& out, VekString& error) {
  if (bodyLength == 0 || body[0] == '\0') {
    Replace(pool, error, MissingBodyMessage);
    return false;
  }
  if (!parseBodyNow) {
    out = LazyDict::FromBytestring(pool, vek::ByteBuffer::New(pool, body, bodyLength), version);
  } else {
    VekString jsonError;
    ref<Dictionary> dictionary =
        Dictionary::FromJson(reinterpret_cast<const unsigned char*>(body), bodyLength, jsonError, pool);
    if (!dictionary) {
      error = VekString::Format(pool, "Cannot convert JSON to Dict: %s", jsonError.Utf8());
      return false;
    }
    out = LazyDict::FromDictionary(pool, dictionary, version);
  }
  if (!out) Replace(pool, error, kOutOfMemoryMessage);
  return static_cast<bool>(out);
}

bool KernoRpcV2::IsCompleteString(VekMempool* pool, const VekString& text, size_t& length, VekString& error) {
  KernoRpcV2Packetizer packetizer(pool);
  packetizer.UpdateInput(text);
  if (!packetizer.completeM) return false;
  length = packetizer.GetPacketLength();
  error = packetizer.errorStringM;
  return true;
}

}  // namespace sarn
