// TranslateBitmapBits: 8-bit RGB, gray and CMYK layouts through one Little CMS image
// transform per format pair, made once per colour transform and shared by threads.
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
};

constexpr Layout kLayouts[] = {
    {BM_RGBTRIPLETS, TYPE_BGR_8, cmsSigRgbData, 3, false},
    {BM_BGRTRIPLETS, TYPE_RGB_8, cmsSigRgbData, 3, false},
    {BM_xRGBQUADS, TYPE_BGRA_8, cmsSigRgbData, 4, true},
    {BM_xBGRQUADS, TYPE_RGBA_8, cmsSigRgbData, 4, true},
    {BM_GRAY, TYPE_GRAY_8, cmsSigGrayData, 1, false},
    {BM_KYMCQUADS, TYPE_CMYK_8, cmsSigCmykData, 4, false},
    {BM_CMYKQUADS, TYPE_KYMC_8, cmsSigCmykData, 4, false},
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

struct Job {
  cmsHTRANSFORM transform;
  const uint8_t* src;
  uint8_t* dst;
  size_t width;
  size_t in_stride;
  size_t out_stride;
  size_t out_bytes;
  bool zero_x;  // quads out of a layout without x: write 0 there

  void Rows(size_t first, size_t count) const {
    if (count == 0) return;
    cmsDoTransformLineStride(transform, src + first * in_stride, dst + first * out_stride,
                             static_cast<cmsUInt32Number>(width), static_cast<cmsUInt32Number>(count),
                             static_cast<cmsUInt32Number>(in_stride), static_cast<cmsUInt32Number>(out_stride), 0,
                             0);
    if (zero_x) {
      for (size_t r = first; r < first + count; ++r) {
        uint8_t* row = dst + r * out_stride;
        for (size_t i = 0; i < width; ++i) row[i * out_bytes + 3] = 0;
      }
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

    cmsHTRANSFORM x = t->Bitmap(in->lcms, out->lcms, error);
    if (!x) return Fail(error);

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
    const Job job{x, src, dst, dwWidth, static_cast<size_t>(in_stride), static_cast<size_t>(out_stride),
                  out->bytes, out->x && !in->x};

    const size_t height = dwHeight;
    const unsigned workers = Workers(size_t{dwWidth} * height);
    const size_t band = std::max<size_t>(1, kBandPixels / dwWidth);
    for (size_t first = 0; first < height; first += band) {
      const size_t rows = std::min(band, height - first);
      if (workers == 1) {
        job.Rows(first, rows);
      } else {
        std::vector<std::thread> pool;
        pool.reserve(workers);  // no reallocation once threads run
        const size_t share = (rows + workers - 1) / workers;
        for (unsigned w = 1; w < workers; ++w) {
          const size_t begin = std::min(rows, w * share);
          const size_t count = std::min(share, rows - begin);
          try {
            pool.emplace_back([&job, first, begin, count] { job.Rows(first + begin, count); });
          } catch (const std::system_error&) {
            job.Rows(first + begin, count);  // no thread to spare: do this share here
          }
        }
        job.Rows(first, std::min(share, rows));
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
