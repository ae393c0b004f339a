// The compact artwork build against the raw pixels. Built twice: with this build's library, and as
// *_raw with the same image set's raw images.S linked in and the default build's artwork functions
// below. Each prints one line per texture upload of the three surfaces (size, digest of the
// pixels); compact_artwork.cmake compares the two outputs. The compact one then checks the rest of
// render/artwork.h: pixels kept while any hold lives, their pages released after the last, a
// clean refusal when zlib cannot allocate, and streams that do not fit their array refused.
#include <GLES/gl.h>
#include <sys/mman.h>
#include <unistd.h>
#include <zlib.h>

#include <algorithm>
#include <cstdio>
#include <cstring>
#include <vector>

#include "render/artwork.h"
#include "render/surfaces.h"
#include "session/session.h"
#include "support/egl_context.h"

namespace {

std::vector<unsigned long long> gUploads;  // size and digest of each upload, in order

void createAll(tessel::KeyboardSession& s) {
  gUploads.clear();
  tessel::mainSurfaceCreated(s);
  tessel::popSurfaceCreated(s);
  tessel::popTopSurfaceCreated(s);
}

}  // namespace

extern "C" GL_API void GL_APIENTRY glTexImage2D(GLenum, GLint, GLint, GLsizei w, GLsizei h, GLint, GLenum, GLenum,
                                                const void* pixels) {
  unsigned long long digest = 1469598103934665603ull;  // FNV-1a
  for (std::size_t i = 0; i < 4u * w * h; ++i) digest = (digest ^ static_cast<const std::uint8_t*>(pixels)[i]) * 1099511628211ull;
  gUploads.insert(gUploads.end(), {static_cast<unsigned long long>(w) << 16 | h, digest});
}

#ifdef TESSEL_RAW_PIXELS
tessel::ArtworkHold::ArtworkHold() noexcept {}
tessel::ArtworkHold::~ArtworkHold() {}
const std::uint8_t* tessel::artworkPixels(const TextureImage& image) noexcept { return image.pixels; }
#endif

int main() {
  using namespace tessel;
  test::GlesContext gl(64, 64);
  KeyboardSession* s = sessionAt(createSession("compact-artwork"));
  if (!gl.ok() || s == nullptr) return std::fprintf(stderr, "no session or offscreen GLES 1.1: %s\n", gl.error().c_str()), 1;
  createAll(*s);
  const std::vector<unsigned long long> uploads = gUploads;
  for (std::size_t i = 0; i < uploads.size(); i += 2) std::printf("%llux%llu %016llx\n", uploads[i] >> 16, uploads[i] & 0xffff, uploads[i + 1]);
#ifndef TESSEL_RAW_PIXELS
  int failures = 0;
  auto check = [&](bool ok, const char* what) { failures += !ok && std::fprintf(stderr, "FAILED: %s\n", what); };
  const TextureImage& space = images::kSpaceKeys[0];  // 512 KiB: whole pages
  const std::size_t bytes = 4u * space.width * space.height, page = static_cast<std::size_t>(sysconf(_SC_PAGESIZE));
  auto released = [&] {  // no whole page of the array resident (never read here: that would map one)
    const auto first = (reinterpret_cast<std::uintptr_t>(space.pixels) + page - 1) & ~(page - 1);
    std::vector<unsigned char> in(bytes / page - 1);
    mincore(reinterpret_cast<void*>(first), in.size() * page, in.data());
    return std::all_of(in.begin(), in.end(), [](unsigned char c) { return !(c & 1); });
  };
  check(released(), "pages released after the uploads");
  {
    const ArtworkHold outer;
    const std::uint8_t* pixels = artworkPixels(space);
    const std::vector<std::uint8_t> kept(pixels, pixels + bytes);
    { const ArtworkHold inner; artworkPixels(images::kCursor[0]); }
    check(std::memcmp(kept.data(), pixels, bytes) == 0 && kept != std::vector<std::uint8_t>(bytes), "kept while a hold lives");
  }
  check(released(), "released after the outer hold");
  check(artworkPixels(space) == nullptr, "no pixels outside a hold");
  setArtworkAllocationFailureForTesting(true);
  createAll(*s);
  check(gUploads.empty() && released(), "nothing uploaded, nothing kept when zlib cannot allocate");
  setArtworkAllocationFailureForTesting(false);
  createAll(*s);
  check(gUploads == uploads, "the next surfaces upload everything again");

  std::vector<std::uint8_t> raw(5000), packed(6000);
  for (std::size_t i = 0; i < raw.size(); ++i) raw[i] = static_cast<std::uint8_t>(i * i >> 5);
  uLongf n = packed.size();
  compress2(packed.data(), &n, raw.data(), raw.size(), 9);
  const struct { const char* what; std::size_t packedSize, size, flip; } refused[] = {
      {"truncated stream", n - 1, 5000, 0}, {"bad checksum", n, 5000, n - 1}, {"stream longer than its array", n, 4999, 0},
      {"stream shorter than its array", n, 5001, 0}, {"trailing bytes", n + 1, 5000, 0}, {"no stream", 0, 5000, 0}};
  std::vector<std::uint8_t> out(5000);
  check(inflateArtwork(packed.data(), n, out.data(), 5000) && out == raw, "a whole stream inflates");
  for (const auto& c : refused) {
    std::vector<std::uint8_t> bad = packed, into(c.size, 0xAA);
    bad[c.flip] ^= c.flip ? 1 : 0;
    check(!inflateArtwork(bad.data(), c.packedSize, into.data(), c.size) && into == std::vector<std::uint8_t>(c.size), c.what);
  }
  return failures != 0;
#endif
}
