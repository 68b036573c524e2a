#include "wynbaselib/Bytestream.h"

#include <errno.h>
#include <unistd.h>

#include <algorithm>
#include <cstring>

namespace wynbaselib {

InMemoryBytestream::InMemoryBytestream() : pContentM(std::make_shared<std::string>()), positionM(0) {}

InMemoryBytestream::InMemoryBytestream(const void* data, size_t size)
    : pContentM(std::make_shared<std::string>(static_cast<const char*>(data), size)), positionM(0) {}

InMemoryBytestream::InMemoryBytestream(const std::string& text)
    : pContentM(std::make_shared<std::string>(text)), positionM(0) {}

size_t InMemoryBytestream::Read(void* buffer, size_t size) {
  size_t n = std::min(size, pContentM->size() - positionM);
  if (n != 0) std::memcpy(buffer, pContentM->data() + positionM, n);
  positionM += n;
  return n;
}

Bytesource* InMemoryBytestream::Duplicate() { return new InMemoryBytestream(*this); }

bool InMemoryBytestream::Write(const char* data, size_t size) {
  pContentM->append(data, size);
  return true;
}

void InMemoryBytestream::Seek(size_t position) { positionM = std::min(position, pContentM->size()); }

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
