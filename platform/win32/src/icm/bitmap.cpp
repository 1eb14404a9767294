// TranslateBitmapBits: 8-bit RGB, gray and CMYK layouts. The work is done by the
// image kernels (icm/kernels/) from tables made once per colour transform; a chain they
// do not cover goes through one Little CMS image transform per format pair, also made
// once and shared by threads.
//
// Byte order in memory: BM_RGBTRIPLETS B,G,R; BM_BGRTRIPLETS R,G,B; BM_xRGBQUADS
// B,G,R,x; BM_xBGRQUADS R,G,B,x; BM_KYMCQUADS C,M,Y,K; BM_CMYKQUADS K,Y,M,C; BM_GRAY one
// byte. The x byte is copied from an x input and set to 0 otherwise.
// Rows are converted in bands; the callback hears after each band how many rows are
// done, and FALSE from it stops the call with ERROR_CANCELLED (earlier bands stay
// converted). Source and destination may be the same buffer or overlap: when the
// output pixel and stride are no larger than the input's, rows are converted in place;
// otherwise the source is copied first.
#include "icm/bitmap.h"

#include <algorithm>
#include <atomic>
#include <cstdint>
#include <cstring>
#include <new>
#include <system_error>
#include <thread>
#include <vector>

#include "icm/kernels/fast_path.h"
#include "icm/transform.h"

namespace win32::icm {

namespace {

std::atomic<unsigned> thread_limit{0};

constexpr size_t kBandPixels = size_t{1} << 20;  // pixels between callbacks

struct Layout {
  BMFORMAT format;
  cmsUInt32Number lcms;
  cmsColorSpaceSignature space;
  unsigned bytes;
  bool x;  // a filler byte after the colour
  kernels::PixelLayout pixel;
};

constexpr Layout kLayouts[] = {
    {BM_RGBTRIPLETS, TYPE_BGR_8, cmsSigRgbData, 3, false, {3, {2, 1, 0, 0}, -1}},
    {BM_BGRTRIPLETS, TYPE_RGB_8, cmsSigRgbData, 3, false, {3, {0, 1, 2, 0}, -1}},
    {BM_xRGBQUADS, TYPE_BGRA_8, cmsSigRgbData, 4, true, {4, {2, 1, 0, 0}, 3}},
    {BM_xBGRQUADS, TYPE_RGBA_8, cmsSigRgbData, 4, true, {4, {0, 1, 2, 0}, 3}},
    {BM_GRAY, TYPE_GRAY_8, cmsSigGrayData, 1, false, {1, {0, 0, 0, 0}, -1}},
    {BM_KYMCQUADS, TYPE_CMYK_8, cmsSigCmykData, 4, false, {4, {0, 1, 2, 3}, -1}},
    {BM_CMYKQUADS, TYPE_KYMC_8, cmsSigCmykData, 4, false, {4, {3, 2, 1, 0}, -1}},
};

// Every other BMFORMAT the SDK names; known, but not converted here.
constexpr BMFORMAT kUnsupported[] = {
    BM_x555RGB,     BM_x555XYZ,     BM_x555Yxy,  BM_x555Lab,  BM_x555G3CH, BM_XYZTRIPLETS, BM_YxyTRIPLETS,
    BM_LabTRIPLETS, BM_G3CHTRIPLETS, BM_5CHANNEL, BM_6CHANNEL, BM_7CHANNEL, BM_8CHANNEL,    BM_xG3CHQUADS,
    BM_10b_RGB,     BM_10b_XYZ,     BM_10b_Yxy,  BM_10b_Lab,  BM_10b_G3CH, BM_NAMED_INDEX, BM_16b_RGB,
    BM_16b_XYZ,     BM_16b_Yxy,     BM_16b_Lab,  BM_16b_G3CH, BM_16b_GRAY, BM_565RGB,
};

const Layout* FindLayout(BMFORMAT format, DWORD& error) {
  for (const Layout& l : kLayouts) {
    if (l.format == format) return &l;
  }
  error = std::find(std::begin(kUnsupported), std::end(kUnsupported), format) != std::end(kUnsupported)
              ? ERROR_NOT_SUPPORTED
              : ERROR_INVALID_PARAMETER;
  return nullptr;
}

bool SpaceFits(cmsColorSpaceSignature layout, cmsColorSpaceSignature chain) {
  return layout == chain || (layout == cmsSigCmykData && chain == cmsSigMCH4Data);
}

// Resolves a stride (0 = rows padded to 4 bytes); false when it cannot hold a row.
bool ResolveStride(DWORD width, unsigned bytes, DWORD given, uint64_t& stride) {
  const uint64_t row = uint64_t{width} * bytes;
  stride = given ? given : (row + 3) & ~uint64_t{3};
  return stride >= row && stride <= 0xFFFFFFFFu;
}

// One call's pixels. Work is handed out as runs of pixels counted from the first pixel
// of the image, so a share may start or end inside a row.
struct Job {
  const kernels::FastPath* fast;  // null: the Little CMS transform below
  cmsHTRANSFORM transform;
  const Layout* in;
  const Layout* out;
  const uint8_t* src;
  uint8_t* dst;
  size_t width;
  size_t in_stride;
  size_t out_stride;
  bool zero_x;  // quads out of a layout without x: write 0 there

  void Run(size_t row, size_t x0, size_t count) const {
    const uint8_t* s = src + row * in_stride + x0 * in->bytes;
    uint8_t* d = dst + row * out_stride + x0 * out->bytes;
    if (fast) {
      kernels::Run(*fast, s, in->pixel, d, out->pixel, count);
      return;
    }
    cmsDoTransform(transform, s, d, static_cast<cmsUInt32Number>(count));
    if (zero_x) {
      for (size_t i = 0; i < count; ++i) d[i * out->bytes + 3] = 0;
    }
  }

  // Pixels [first, last) of the image.
  void Pixels(size_t first, size_t last) const {
    while (first < last) {
      const size_t row = first / width, x0 = first % width;
      const size_t count = std::min(width - x0, last - first);
      Run(row, x0, count);
      first += count;
    }
  }
};

unsigned Workers(size_t pixels) {
  if (pixels < kBitmapThreadingPixels) return 1;
  unsigned n = std::max(1u, std::thread::hardware_concurrency());
  const unsigned limit = thread_limit.load();
  if (limit) n = std::min(n, limit);
  return std::min(n, 16u);
}

}  // namespace

void SetBitmapThreadLimit(unsigned limit) { thread_limit = limit; }

}  // namespace win32::icm

using namespace win32;
using namespace win32::icm;

extern "C" BOOL WINAPI TranslateBitmapBits(HTRANSFORM hColorTransform, PVOID pSrcBits, BMFORMAT bmInput,
                                           DWORD dwWidth, DWORD dwHeight, DWORD dwInputStride, PVOID pDestBits,
                                           BMFORMAT bmOutput, DWORD dwOutputStride, PBMCALLBACKFN pfnCallBack,
                                           LPARAM ulCallbackData) {
  try {
    auto t = FindTransform(hColorTransform);
    if (!t) return FALSE;
    if (!pSrcBits || !pDestBits) return Fail(ERROR_INVALID_PARAMETER);
    DWORD error = ERROR_SUCCESS;
    const Layout* in = FindLayout(bmInput, error);
    const Layout* out = in ? FindLayout(bmOutput, error) : nullptr;
    if (!out) return Fail(error);
    uint64_t in_stride = 0, out_stride = 0;
    if (!ResolveStride(dwWidth, in->bytes, dwInputStride, in_stride) ||
        !ResolveStride(dwWidth, out->bytes, dwOutputStride, out_stride)) {
      return Fail(ERROR_INVALID_PARAMETER);
    }
    const Chain& chain = t->chain();
    if (chain.named() || !SpaceFits(in->space, chain.input()) || !SpaceFits(out->space, chain.output())) {
      return Fail(ERROR_COLORSPACE_MISMATCH);
    }
    if (dwWidth == 0 || dwHeight == 0) return Succeed();
    // Both extents must be addressable; each is below height * stride < 2^64.
    const uint64_t in_extent = (uint64_t{dwHeight} - 1) * in_stride + uint64_t{dwWidth} * in->bytes;
    const uint64_t out_extent = (uint64_t{dwHeight} - 1) * out_stride + uint64_t{dwWidth} * out->bytes;
    if (in_extent > PTRDIFF_MAX || out_extent > PTRDIFF_MAX) return Fail(ERROR_INVALID_PARAMETER);

    const auto* src = static_cast<const uint8_t*>(pSrcBits);
    auto* dst = static_cast<uint8_t*>(pDestBits);
    const uintptr_t s0 = reinterpret_cast<uintptr_t>(src), d0 = reinterpret_cast<uintptr_t>(dst);
    const bool overlap = s0 < d0 + out_extent && d0 < s0 + in_extent;
    // In place is safe only row onto the same row, pixel onto a pixel no larger: Little
    // CMS copies the x bytes of every row of a call before it converts any colour.
    const bool in_place = overlap && src == dst && out->bytes <= in->bytes && out_stride == in_stride;
    std::vector<uint8_t> copy;
    if (overlap && !in_place) {
      // The output would overtake bytes not yet read: convert from a copy.
      copy.assign(src, src + in_extent);
      src = copy.data();
    }
    Job job{t->FastPath(), nullptr, in, out, src, dst, dwWidth, static_cast<size_t>(in_stride),
                  static_cast<size_t>(out_stride), out->x && !in->x};
    if (!job.fast) {
      job.transform = t->Bitmap(in->lcms, out->lcms, error);
      if (!job.transform) return Fail(error);
    }

    const size_t width = dwWidth, height = dwHeight;
    const unsigned workers = Workers(width * height);
    // Shares split rows only where no share can write bytes another still has to
    // read: out of place, or pixels of one size converted in place.
    const bool split_rows = !in_place || in->bytes == out->bytes;
    const size_t band = std::max<size_t>(1, kBandPixels / width);
    for (size_t first = 0; first < height; first += band) {
      const size_t rows = std::min(band, height - first);
      const size_t begin = first * width, end = (first + rows) * width;
      if (workers == 1) {
        job.Pixels(begin, end);
      } else {
        // The band is taken a chunk at a time, so a core that runs slower (or is taken
        // away for a while) converts less of it rather than holding up the others.
        // Chunks are whole rows unless rows may be split.
        size_t chunk = std::clamp<size_t>((end - begin) / (size_t{workers} * 32), 4096, 65536);
        if (!split_rows) chunk = std::max<size_t>(1, chunk / width) * width;
        std::atomic<size_t> next{begin};
        const auto share = [&job, &next, chunk, end] {
          for (size_t from; (from = next.fetch_add(chunk)) < end;) job.Pixels(from, std::min(end, from + chunk));
        };
        std::vector<std::thread> pool;
        pool.reserve(workers);  // no reallocation once threads run
        for (unsigned w = 1; w < workers; ++w) {
          try {
            pool.emplace_back(share);
          } catch (const std::system_error&) {
            break;  // no thread to spare: the others take its chunks
          }
        }
        share();
        for (std::thread& th : pool) th.join();
      }
      if (pfnCallBack && !pfnCallBack(dwHeight, static_cast<ULONG>(first + rows), ulCallbackData)) {
        return Fail(ERROR_CANCELLED);
      }
    }
    return Succeed();
  } catch (const std::bad_alloc&) {
    return Fail(ERROR_NOT_ENOUGH_MEMORY);
  }
}
