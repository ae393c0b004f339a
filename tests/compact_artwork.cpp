// The compact build's uploads against the raw pixels': built with this build's library, and as *_raw
// with the raw images.S of the same images and the default build's artwork functions. Both print
// every upload of the three surfaces (no GL context: the other GL calls do nothing); CMake compares
// them. The compact one then checks the rest of render/artwork.h's contract.
#include <GLES/gl.h>
#include <sys/mman.h>
#include <unistd.h>
#include <zlib.h>

#include <algorithm>
#include <cstdio>
#include <vector>

#include "render/artwork.h"
#include "render/surfaces.h"
#include "session/session.h"

static std::vector<unsigned long long> gUploads;  // digest of each upload (size and pixels), in order

extern "C" GL_API void GL_APIENTRY glTexImage2D(GLenum, GLint, GLint, GLsizei w, GLsizei h, GLint, GLenum, GLenum,
                                                const void* pixels) {
  unsigned long long digest = 1469598103934665603ull ^ (static_cast<unsigned>(w) << 16 | h);  // FNV-1a
  for (std::size_t i = 0; i < 4u * w * h; ++i) digest = (digest ^ static_cast<const std::uint8_t*>(pixels)[i]) * 1099511628211ull;
  gUploads.push_back(digest);
}

#ifdef TESSEL_RAW_PIXELS
tessel::ArtworkHold::ArtworkHold() noexcept {}
tessel::ArtworkHold::~ArtworkHold() {}
const std::uint8_t* tessel::artworkPixels(const TextureImage& image) noexcept { return image.pixels; }
#endif

int main() {
  using namespace tessel;
  KeyboardSession* s = sessionAt(createSession("compact-artwork"));
  auto createAll = [&] { gUploads.clear(), mainSurfaceCreated(*s), popSurfaceCreated(*s), popTopSurfaceCreated(*s); };
  createAll();
  const std::vector<unsigned long long> uploads = gUploads;
  for (unsigned long long digest : uploads) std::printf("%016llx\n", digest);
#ifndef TESSEL_RAW_PIXELS
  int failures = 0;
  auto check = [&](bool ok, const char* what) { failures += !ok && std::fprintf(stderr, "FAILED: %s\n", what); };
  const TextureImage& space = images::kSpaceKeys[0];  // 512 KiB: whole pages
  const std::size_t bytes = 4u * space.width * space.height, page = static_cast<std::size_t>(sysconf(_SC_PAGESIZE));
  auto released = [&] {  // no whole page of the array resident (never read here: that would map one)
    std::vector<unsigned char> in(bytes / page - 1, 1);
    mincore(reinterpret_cast<void*>((reinterpret_cast<std::uintptr_t>(space.pixels) + page - 1) & ~(page - 1)), in.size() * page, in.data());
    return std::none_of(in.begin(), in.end(), [](unsigned char c) { return c & 1; });
  };
  check(released(), "pages released after the uploads");
  {
    const ArtworkHold outer;
    const std::uint8_t* pixels = artworkPixels(space);
    const std::vector<std::uint8_t> kept(pixels, pixels + bytes);
    { const ArtworkHold inner; artworkPixels(images::kCursor[0]); }
    check(std::vector<std::uint8_t>(pixels, pixels + bytes) == kept && kept != std::vector<std::uint8_t>(bytes), "kept while a hold lives");
  }
  setArtworkAllocationFailureForTesting(true);
  createAll();
  check(gUploads.empty() && released(), "nothing kept after the last hold; nothing uploaded when zlib cannot allocate");
  setArtworkAllocationFailureForTesting(false);
  createAll();
  check(gUploads == uploads, "the next surfaces upload everything again");
  std::vector<std::uint8_t> raw(5000, 7), packed(6000);
  uLongf n = packed.size();
  compress2(packed.data(), &n, raw.data(), raw.size(), 9);
  const struct { const char* what; std::size_t packedSize, size, flip; } cases[] = {  // all but the first refused
      {"whole stream", n, 5000, 0}, {"truncated stream", n - 1, 5000, 0}, {"bad checksum", n, 5000, n - 1},
      {"stream longer than its array", n, 4999, 0}, {"stream shorter than its array", n, 5001, 0},
      {"trailing bytes", n + 1, 5000, 0}, {"no stream", 0, 5000, 0}};
  for (const auto& c : cases) {
    std::vector<std::uint8_t> bad = packed, into(c.size, 0xAA);
    bad[c.flip] ^= c.flip ? 1 : 0;
    check(inflateArtwork(bad.data(), c.packedSize, into.data(), c.size) == (&c == cases) &&
              into == (&c == cases ? raw : std::vector<std::uint8_t>(c.size)), c.what);  // refused: left zero
  }
  return failures != 0;
#endif
}
