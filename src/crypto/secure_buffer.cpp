// SecureBuffer: malloc-backed so the allocation can fail softly (results become "absent" and
// callers map that to their error codes) and so a test build can watch every freed block.
#include "crypto/secure_buffer.h"

#include <cstdlib>
#include <cstring>

#include "crypto/wipe.h"

namespace tessel {

SecureBuffer::SecureBuffer(SecureBuffer&& other) noexcept
    : block_(other.block_), size_(other.size_), capacity_(other.capacity_) {
  other.block_ = nullptr;
  other.size_ = other.capacity_ = 0;
}

SecureBuffer& SecureBuffer::operator=(SecureBuffer&& other) noexcept {
  if (this != &other) {
    reset();
    block_ = other.block_;
    size_ = other.size_;
    capacity_ = other.capacity_;
    other.block_ = nullptr;
    other.size_ = other.capacity_ = 0;
  }
  return *this;
}

SecureBuffer SecureBuffer::allocate(std::size_t n) noexcept {
  SecureBuffer b;
  if (n == SIZE_MAX) return b;
  b.block_ = static_cast<std::uint8_t*>(std::calloc(n + 1, 1));
  if (b.block_ != nullptr) b.size_ = b.capacity_ = n;
  return b;
}

SecureBuffer SecureBuffer::copyOf(const void* p, std::size_t n) noexcept {
  SecureBuffer b = allocate(n);
  if (b && n != 0) std::memcpy(b.block_, p, n);
  return b;
}

SecureBuffer SecureBuffer::copyOfText(const char* s) noexcept {
  if (s == nullptr) return SecureBuffer();
  return copyOf(s, std::strlen(s));
}

void SecureBuffer::truncate(std::size_t n) noexcept {
  if (n >= size_) return;
  secureWipe(block_ + n, size_ - n);
  size_ = n;
}

void SecureBuffer::reset() noexcept {
  if (block_ != nullptr) wipeAndFree(block_, capacity_ + 1);
  block_ = nullptr;
  size_ = capacity_ = 0;
}

}  // namespace tessel
