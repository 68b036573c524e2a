// Byte sources and sinks: how bytes enter and leave the library.
//
// A Bytesource is read until Read returns 0. A Bytesink takes bytes and a final Flush. The two
// pure virtual functions of each are all a subclass (a caller's own source or sink) needs;
// the error queries have defaults that report no error. Sources and sinks are plain objects
// owned by whoever made them (Duplicate returns a new object that its caller deletes).
// None is locked: each is used by one thread at a time.
#pragma once

#include <cstddef>
#include <memory>
#include <string>

namespace wynbaselib {

class Bytesource {
 public:
  virtual ~Bytesource() {}
  // Copies up to `size` bytes into `buffer`; returns how many, 0 only at the end (or error).
  virtual size_t Read(void* buffer, size_t size) = 0;
  // A new, independent reader that starts at this one's current position; reading either
  // never disturbs the other. Null when the source cannot be duplicated.
  virtual Bytesource* Duplicate() = 0;
  // True when the last 0 from Read meant an error (corrupt or truncated data), not a clean end.
  virtual bool FError() const { return false; }
  // A short description of the error, "" when there is none.
  virtual const char* GetErrorText() const { return ""; }
};

class Bytesink {
 public:
  virtual ~Bytesink() {}
  // Takes all `size` bytes; false when they could not be written.
  virtual bool Write(const char* data, size_t size) = 0;
  virtual bool Flush() = 0;
};

// A byte stream in memory, readable and writable. Copies (and duplicates) share one content:
// what any of them writes is appended to it; each copy reads from its own position. The content
// lives on the C++ heap; when it cannot grow, Write returns false (nothing is thrown), and a
// stream whose content could not be made at all reads as empty and refuses every write.
// Duplicate returns null when memory runs out.
class InMemoryBytestream : public Bytesource, public Bytesink {
 public:
  InMemoryBytestream();
  InMemoryBytestream(const void* data, size_t size);
  explicit InMemoryBytestream(const std::string& text);
  InMemoryBytestream(const InMemoryBytestream& other) = default;
  InMemoryBytestream& operator=(const InMemoryBytestream& other) = default;

  size_t Read(void* buffer, size_t size) override;
  Bytesource* Duplicate() override;
  bool Write(const char* data, size_t size) override;
  bool Flush() override { return true; }

  const std::string& GetContent() const;
  size_t GetPosition() const { return positionM; }
  // Moves the read position (clamped to the content's size).
  void Seek(size_t position);

 private:
  std::shared_ptr<std::string> pContentM;
  size_t positionM;
};

// Counts the bytes written through it and passes them on to `next` (when not null).
class ByteCountingBytesink : public Bytesink {
 public:
  explicit ByteCountingBytesink(Bytesink* next = nullptr) : pNextM(next), countM(0) {}
  bool Write(const char* data, size_t size) override;
  bool Flush() override { return pNextM == nullptr || pNextM->Flush(); }
  size_t GetCount() const { return countM; }

 private:
  Bytesink* pNextM;
  size_t countM;
};

// Reads from and writes to a file descriptor (for tools); the descriptor is not closed.
class FdBytesource : public Bytesource {
 public:
  explicit FdBytesource(int fd) : fdM(fd), isErrorM(false) {}
  size_t Read(void* buffer, size_t size) override;
  // Descriptors have one shared position: not duplicable (returns null).
  Bytesource* Duplicate() override { return nullptr; }
  bool FError() const override { return isErrorM; }
  const char* GetErrorText() const override { return isErrorM ? "read error" : ""; }

 private:
  int fdM;
  bool isErrorM;
};

class FdBytesink : public Bytesink {
 public:
  explicit FdBytesink(int fd) : fdM(fd) {}
  bool Write(const char* data, size_t size) override;
  bool Flush() override { return true; }

 private:
  int fdM;
};

}  // namespace wynbaselib
