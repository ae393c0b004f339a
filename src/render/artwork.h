// How texture uploads reach the embedded pixels.
//
// Default build: the pixels are read-only data in the library (render/image_table.h), always
// there; ArtworkHold does nothing and artworkPixels returns the record's pointer.
//
// Compact build (TESSEL_COMPACT_ARTWORK, a public definition of the core library): the library
// carries each pixel array of image_data.h deflate-compressed, and the arrays themselves are
// zero-filled memory at the same addresses, so the image records are unchanged. The contract:
//   - Pixels exist only while an upload holds them. Each upload list (render/textures.h) keeps
//     an ArtworkHold for its whole length; artworkPixels inflates the array holding an image the
//     first time an image of it is asked for while any hold is alive (system zlib, under one
//     process-wide mutex) and returns the record's pointer, valid until the hold ends.
//   - When the last hold alive ends, every inflated array is wiped and its pages go back to the
//     system. Holds count, so uploads of several surfaces and sessions on different GL threads
//     may overlap: one ending never wipes pixels that another is still reading.
//   - Hence every surface creation inflates what it uploads, as the first one did: a surface
//     may be created again at any time (the app recreates its GL context, a second keyboard
//     comes up), so no upload can tell that it is the last and nothing is kept between them.
//   - Failure (a stream that does not inflate to exactly its array, zlib out of memory, or a
//     call outside any hold): artworkPixels returns null, the array stays zero, and the caller
//     leaves that texture without an image. The next upload tries again.
#pragma once

#include <cstddef>
#include <cstdint>

#include "render/image_table.h"

namespace tessel {

#if TESSEL_COMPACT_ARTWORK

struct ArtworkHold {
  ArtworkHold() noexcept;
  ~ArtworkHold();
  ArtworkHold(const ArtworkHold&) = delete;
  ArtworkHold& operator=(const ArtworkHold&) = delete;
};

// The pixels of `image` (inflated if need be), or null as above. Needs a live ArtworkHold.
const std::uint8_t* artworkPixels(const TextureImage& image) noexcept;

// Inflates one zlib-format stream into out[0..size). True only when the stream is whole, its
// checksum right and its length exactly `size`; otherwise out is left zero-filled.
bool inflateArtwork(const std::uint8_t* packed, std::size_t packedSize, std::uint8_t* out, std::size_t size) noexcept;

// Tests make zlib's allocations fail (true) or succeed again (false).
void setArtworkAllocationFailureForTesting(bool fail) noexcept;

#else

struct ArtworkHold {
  ArtworkHold() noexcept {}  // user-provided: a hold is not an unused variable
};
inline const std::uint8_t* artworkPixels(const TextureImage& image) noexcept { return image.pixels; }

#endif

}  // namespace tessel
