// The compact artwork build's inflating of the embedded pixels around uploads (render/artwork.h).
// The arrays, their deflate streams and the table tying them together come from
// tools/artgen/pack_images.py; here: which arrays are inflated (one bit each), how many holds are
// alive, and the release of the arrays' pages when the last hold ends. Empty in the default build.
#include "render/artwork.h"

#if TESSEL_COMPACT_ARTWORK

#define ZLIB_CONST
#include <sys/mman.h>
#include <unistd.h>
#include <zlib.h>

#include <atomic>
#include <cstdlib>
#include <mutex>

#include "crypto/wipe.h"

// One pixel array and its stream, in the arrays' memory order (one page-aligned bss section).
struct TesselPackedArray {
  std::uint8_t* pixels;
  const std::uint8_t* packed;
  std::uint32_t size;
  std::uint32_t packedSize;
};
extern "C" const TesselPackedArray tessel_artwork_streams[];
extern "C" const std::uint32_t tessel_artwork_stream_count;

namespace tessel {

namespace {

std::mutex gMutex;
int gHolds = 0;                    // guarded by gMutex
std::uint64_t gInflated = 0;       // bit i: array i holds its pixels; guarded by gMutex
std::atomic<bool> gRefuseAllocation{false};

voidpf allocate(voidpf, uInt items, uInt size) {
  return gRefuseAllocation.load(std::memory_order_relaxed) ? Z_NULL : std::calloc(items, size);
}
void release(voidpf, voidpf p) { std::free(p); }

// Hands back the whole pages of the arrays' section; its edges may share a page with other
// data, so they stay (already wiped). Pages read as zero again afterwards.
void releasePages() noexcept {
  const std::uint32_t n = tessel_artwork_stream_count;
  const auto begin = reinterpret_cast<std::uintptr_t>(tessel_artwork_streams[0].pixels);
  const auto end = reinterpret_cast<std::uintptr_t>(tessel_artwork_streams[n - 1].pixels) + tessel_artwork_streams[n - 1].size;
  const long page = sysconf(_SC_PAGESIZE);
  if (page <= 0) return;
  const std::uintptr_t mask = static_cast<std::uintptr_t>(page) - 1;
  const std::uintptr_t first = (begin + mask) & ~mask, last = end & ~mask;
  if (first < last) madvise(reinterpret_cast<void*>(first), last - first, MADV_DONTNEED);
}

}  // namespace

bool inflateArtwork(const std::uint8_t* packed, std::size_t packedSize, std::uint8_t* out, std::size_t size) noexcept {
  if (packedSize > UINT32_MAX || size > UINT32_MAX) return false;
  z_stream z{};
  z.zalloc = allocate;
  z.zfree = release;
  if (inflateInit(&z) != Z_OK) return false;  // nothing written yet
  z.next_in = packed;
  z.avail_in = static_cast<uInt>(packedSize);
  z.next_out = out;
  z.avail_out = static_cast<uInt>(size);
  const bool whole = inflate(&z, Z_FINISH) == Z_STREAM_END && z.avail_out == 0 && z.avail_in == 0;
  inflateEnd(&z);
  if (!whole) secureWipe(out, size);
  return whole;
}

ArtworkHold::ArtworkHold() noexcept {
  std::lock_guard<std::mutex> lock(gMutex);
  ++gHolds;
}

ArtworkHold::~ArtworkHold() {
  std::lock_guard<std::mutex> lock(gMutex);
  if (--gHolds > 0) return;
  for (std::uint32_t i = 0; i < tessel_artwork_stream_count; ++i)
    if (gInflated >> i & 1) secureWipe(tessel_artwork_streams[i].pixels, tessel_artwork_streams[i].size);
  gInflated = 0;
  releasePages();
}

const std::uint8_t* artworkPixels(const TextureImage& image) noexcept {
  const auto at = reinterpret_cast<std::uintptr_t>(image.pixels);
  std::lock_guard<std::mutex> lock(gMutex);
  for (std::uint32_t i = 0; i < tessel_artwork_stream_count; ++i) {
    const TesselPackedArray& a = tessel_artwork_streams[i];
    const auto begin = reinterpret_cast<std::uintptr_t>(a.pixels);
    if (at < begin || at >= begin + a.size) continue;
    if (gInflated >> i & 1) return image.pixels;
    if (gHolds == 0 || !inflateArtwork(a.packed, a.packedSize, a.pixels, a.size)) return nullptr;
    gInflated |= std::uint64_t{1} << i;
    return image.pixels;
  }
  return nullptr;
}

void setArtworkAllocationFailureForTesting(bool fail) noexcept { gRefuseAllocation.store(fail, std::memory_order_relaxed); }

}  // namespace tessel

#endif  // TESSEL_COMPACT_ARTWORK
