// SecureBuffer: the one owning byte/text buffer that crosses module boundaries.
//
// Layout: a malloc'd block of capacity()+1 bytes; size() bytes of payload followed by at least
// one NUL, so a text result can be read with c_str(). A default-constructed buffer is "absent"
// (no block at all), which is how operations report "nothing" (allocation failure, refused
// input); an empty but present buffer is a valid zero-length result. The whole block is wiped
// before it is freed, whatever it held, so results that carry plaintext, keys or their
// hex/base64 forms never leave a readable copy on the heap.
#pragma once

#include <cstddef>
#include <cstdint>

namespace tessel {

class SecureBuffer {
 public:
  SecureBuffer() noexcept = default;
  ~SecureBuffer() { reset(); }
  SecureBuffer(SecureBuffer&& other) noexcept;
  SecureBuffer& operator=(SecureBuffer&& other) noexcept;
  SecureBuffer(const SecureBuffer&) = delete;
  SecureBuffer& operator=(const SecureBuffer&) = delete;

  // n zero bytes (plus the terminator); absent if the allocation fails.
  static SecureBuffer allocate(std::size_t n) noexcept;
  // A copy of n bytes at p (p may be null only when n is 0); absent on allocation failure.
  static SecureBuffer copyOf(const void* p, std::size_t n) noexcept;
  // A copy of a NUL-terminated text; absent when s is null or on allocation failure.
  static SecureBuffer copyOfText(const char* s) noexcept;

  explicit operator bool() const noexcept { return block_ != nullptr; }
  std::uint8_t* data() noexcept { return block_; }
  const std::uint8_t* data() const noexcept { return block_; }
  char* c_str() noexcept { return reinterpret_cast<char*>(block_); }
  const char* c_str() const noexcept { return reinterpret_cast<const char*>(block_); }
  std::size_t size() const noexcept { return size_; }
  std::size_t capacity() const noexcept { return capacity_; }

  // Shortens the payload to n <= size() bytes; the cut-off bytes are zeroed.
  void truncate(std::size_t n) noexcept;
  // Wipes and frees the block; the buffer becomes absent.
  void reset() noexcept;

 private:
  std::uint8_t* block_ = nullptr;
  std::size_t size_ = 0;
  std::size_t capacity_ = 0;
};

}  // namespace tessel
