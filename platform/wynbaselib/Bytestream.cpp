#include "wynbaselib/Bytestream.h"

#include <errno.h>
#include <unistd.h>

#include <algorithm>
#include <cstring>
#include <new>
#include <stdexcept>

namespace wynbaselib {

namespace {
// The content lives on the C++ heap, whose failures are exceptions: they stop here. A stream
// whose content could not be made has none; it reads as empty and refuses writes.
std::shared_ptr<std::string> NewContent(const char* data, size_t size) {
  try {
    return std::make_shared<std::string>(data, size);
  } catch (const std::bad_alloc&) {
    return nullptr;
  } catch (const std::length_error&) {
    return nullptr;
  }
}

const std::string& NoContent() {
  static const std::string empty;
  return empty;
}
}  // namespace

InMemoryBytestream::InMemoryBytestream() : pContentM(NewContent("", 0)), positionM(0) {}

InMemoryBytestream::InMemoryBytestream(const void* data, size_t size)
    : pContentM(NewContent(static_cast<const char*>(data), size)), positionM(0) {}

InMemoryBytestream::InMemoryBytestream(const std::string& text)
    : pContentM(NewContent(text.data(), text.size())), positionM(0) {}

const std::string& InMemoryBytestream::GetContent() const { return pContentM ? *pContentM : NoContent(); }

size_t InMemoryBytestream::Read(void* buffer, size_t size) {
  if (!pContentM) return 0;
  size_t n = std::min(size, pContentM->size() - positionM);
  if (n != 0) std::memcpy(buffer, pContentM->data() + positionM, n);
  positionM += n;
  return n;
}

Bytesource* InMemoryBytestream::Duplicate() { return new (std::nothrow) InMemoryBytestream(*this); }

bool InMemoryBytestream::Write(const char* data, size_t size) {
  if (!pContentM) return false;
  try {
    pContentM->append(data, size);
  } catch (const std::bad_alloc&) {
    return false;
  } catch (const std::length_error&) {
    return false;
  }
  return true;
}

void InMemoryBytestream::Seek(size_t position) { positionM = std::min(position, GetContent().size()); }

bool ByteCountingBytesink::Write(const char* data, size_t size) {
  countM += size;
  return pNextM == nullptr || pNextM->Write(data, size);
}

size_t FdBytesource::Read(void* buffer, size_t size) {
  for (;;) {
    ssize_t n = ::read(fdM, buffer, size);
    if (n >= 0) return static_cast<size_t>(n);
    if (errno != EINTR) {
      isErrorM = true;
      return 0;
    }
  }
}

bool FdBytesink::Write(const char* data, size_t size) {
  while (size > 0) {
    ssize_t n = ::write(fdM, data, size);
    if (n < 0) {
      if (errno == EINTR) continue;
      return false;
    }
    data += n;
    size -= static_cast<size_t>(n);
  }
  return true;
}

}  // namespace wynbaselib
