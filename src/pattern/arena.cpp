// Bump allocator for compiled patterns: inline first, then doubling heap chunks.
#include "pattern/arena.h"

#include <cstdlib>

namespace tessel {

namespace {
constexpr std::size_t kChunkHeader = 16;  // keeps chunk payloads 16-byte aligned
constexpr std::size_t kFirstChunk = 2048;
}  // namespace

Arena::~Arena() {
  Chunk* c = chunks_;
  while (c != nullptr) {
    Chunk* next = c->next;
    std::free(c);
    c = next;
  }
}

void* Arena::allocate(std::size_t size, std::size_t align) noexcept {
  auto fits = [&](unsigned char* cursor, unsigned char* limit) -> unsigned char* {
    const std::uintptr_t p = reinterpret_cast<std::uintptr_t>(cursor);
    const std::uintptr_t aligned = (p + (align - 1)) & ~static_cast<std::uintptr_t>(align - 1);
    const std::uintptr_t end = reinterpret_cast<std::uintptr_t>(limit);
    if (aligned > end || end - aligned < size) return nullptr;
    return reinterpret_cast<unsigned char*>(aligned);
  };
  if (unsigned char* p = fits(cursor_, limit_)) {
    cursor_ = p + size;
    return p;
  }
  std::size_t chunkSize = chunks_ == nullptr ? kFirstChunk : chunks_->size * 2;
  if (chunkSize > (std::size_t{1} << 24)) chunkSize = std::size_t{1} << 24;
  if (size + align > chunkSize - kChunkHeader) chunkSize = size + align + kChunkHeader;
  auto* raw = static_cast<unsigned char*>(std::malloc(chunkSize));
  if (raw == nullptr) return nullptr;
  auto* chunk = reinterpret_cast<Chunk*>(raw);
  chunk->next = chunks_;
  chunk->size = chunkSize;
  chunks_ = chunk;
  heapBytes_ += chunkSize;
  cursor_ = raw + kChunkHeader;
  limit_ = raw + chunkSize;
  unsigned char* p = fits(cursor_, limit_);
  if (p == nullptr) return nullptr;
  cursor_ = p + size;
  return p;
}

}  // namespace tessel
