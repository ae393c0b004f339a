// Bump allocator that holds a compiled pattern's node tree.
//
// A pattern is compiled on every key press (the accepts check), so compiling must not pay for
// one heap allocation per node: the first kInlineBytes come from storage inside the arena
// object itself (an engine on the caller's stack allocates nothing for small patterns), later
// requests come from malloc'd chunks that are freed together when the arena goes. Objects
// placed here are destroyed by their owner (the engine walks its node list); the arena only
// releases memory. Not thread-safe; not copyable.
#pragma once

#include <cstddef>
#include <cstdint>

namespace tessel {

class Arena {
 public:
  static constexpr std::size_t kInlineBytes = 768;

  Arena() noexcept = default;
  ~Arena();
  Arena(const Arena&) = delete;
  Arena& operator=(const Arena&) = delete;

  // size bytes aligned to align (a power of two, at most 16); null when memory runs out.
  void* allocate(std::size_t size, std::size_t align) noexcept;

  // Bytes obtained from the heap so far (for tests and the benchmark).
  std::size_t heapBytes() const noexcept { return heapBytes_; }

 private:
  struct Chunk {
    Chunk* next;
    std::size_t size;
  };

  alignas(16) unsigned char inline_[kInlineBytes];
  unsigned char* cursor_ = inline_;
  unsigned char* limit_ = inline_ + kInlineBytes;
  Chunk* chunks_ = nullptr;
  std::size_t heapBytes_ = 0;
};

}  // namespace tessel
