// The x86 kernels: SSE2 (every x86-64 has it) works a pixel at a time with the
// pixel's channels side by side in one register; AVX2, chosen at run time, converts
// matrix-shaper runs two pixels to a register (gathers are slower than loads of each
// pixel's matrix columns on some processors), and does the staged path's
// table reads eight pixels at a time and its trilinear step two at a time. Linear-light
// and staged pixels go in blocks, so that the cache misses of a block overlap. Every
// kernel ends a run with the per-pixel steps the scalar kernel uses.
#include "icm/kernels/fast_path.h"

#ifdef TINTWELL_KERNELS_X86

#include <immintrin.h>

#include <cstring>

#include "icm/kernels/pixel_ops.h"

namespace win32::icm::kernels::detail {

namespace {

constexpr std::int32_t kRound = 1 << (kWeightBits + kValueBits - 1);

inline void PutBytes(std::uint32_t o, std::uint8_t x, const PixelLayout& out, std::uint8_t* d, unsigned channels) {
  for (unsigned k = 0; k < channels; ++k) d[out.at[k]] = static_cast<std::uint8_t>(o >> (8 * k));
  if (out.x >= 0) d[out.x] = x;
}

// The output tables' index for each lane of v, clamped as ops::Shape clamps it.
inline __m128i ShaperIndex(__m128 v, __m128 limit) {
  v = _mm_min_ps(_mm_max_ps(v, _mm_set1_ps(kShaperFloor)), limit);
  return _mm_sub_epi32(_mm_srli_epi32(_mm_castps_si128(v), kShaperShift), _mm_set1_epi32(kShaperBase));
}

inline std::uint8_t ShapeQ(const FastPath& p, unsigned k, std::uint32_t q) { return p.shaper[k * (kShaperSize + 1) + q]; }

inline void MatrixPixelSse2(const FastPath& p, const std::uint8_t* s, const PixelLayout& in, std::uint8_t* d,
                            const PixelLayout& out, __m128 limit) {
  const __m128 a = _mm_loadu_ps(&p.lin[s[in.at[0]] * 4]);
  const __m128 b = _mm_loadu_ps(&p.lin[(256 + s[in.at[1]]) * 4]);
  const __m128 c = _mm_loadu_ps(&p.lin[(512 + s[in.at[2]]) * 4]);
  const std::uint8_t x = ops::FillerOf(s, in);
  __m128 v = _mm_add_ps(_mm_add_ps(a, b), c);
  alignas(16) std::uint32_t q[4];
  _mm_store_si128(reinterpret_cast<__m128i*>(q), ShaperIndex(v, limit));
  std::uint32_t o = 0;
  for (unsigned k = 0; k < p.out_channels; ++k) o |= std::uint32_t{ShapeQ(p, k, q[k])} << (8 * k);
  PutBytes(o, x, out, d, p.out_channels);
}

// Matrix-shaper runs into three channels. The tables and byte offsets are held in
// locals: every byte written could otherwise alias them and force them to be read again.
inline void MatrixRgbSse2(const FastPath& p, const std::uint8_t* src, const PixelLayout& in, std::uint8_t* dst,
                          const PixelLayout& out, std::size_t from, std::size_t n) {
  const float* lin = p.lin.data();
  const std::uint8_t* t0 = p.shaper.data();
  const std::uint8_t* t1 = t0 + (kShaperSize + 1);
  const std::uint8_t* t2 = t1 + (kShaperSize + 1);
  const unsigned ib = in.bytes, ob = out.bytes, i0 = in.at[0], i1 = in.at[1], i2 = in.at[2];
  const unsigned o0 = out.at[0], o1 = out.at[1], o2 = out.at[2];
  const int ix = in.x, ox = out.x;
  const __m128 limit = _mm_set1_ps(p.limit);
  for (std::size_t i = from; i < n; ++i) {
    const std::uint8_t* s = src + i * ib;
    std::uint8_t* d = dst + i * ob;
    const std::uint8_t x = ix >= 0 ? s[ix] : 0;
    const __m128 a = _mm_loadu_ps(lin + s[i0] * 4);
    const __m128 b = _mm_loadu_ps(lin + (256 + s[i1]) * 4);
    const __m128 c = _mm_loadu_ps(lin + (512 + s[i2]) * 4);
    const __m128i q = ShaperIndex(_mm_add_ps(_mm_add_ps(a, b), c), limit);
    const std::uint8_t r = t0[_mm_cvtsi128_si32(q)];
    const std::uint8_t g = t1[_mm_cvtsi128_si32(_mm_srli_si128(q, 4))];
    const std::uint8_t bl = t2[_mm_cvtsi128_si32(_mm_srli_si128(q, 8))];
    d[o0] = r;
    d[o1] = g;
    d[o2] = bl;
    if (ox >= 0) d[ox] = x;
  }
}

template <unsigned N>
inline void ClutPixelSse2(const FastPath& p, const std::uint8_t* s, const PixelLayout& in, std::uint8_t* d,
                          const PixelLayout& out) {
  std::int32_t base;
  const ops::Simplex<N> sx = ops::Locate<N>(p, s, in, base);
  const std::uint8_t x = ops::FillerOf(s, in);
  const std::int16_t* c = &p.nodes[base];
  __m128i n[N + 1];
  n[0] = _mm_loadl_epi64(reinterpret_cast<const __m128i*>(c));
  for (unsigned i = 0; i < N; ++i) {
    c += sx.step[i];
    n[i + 1] = _mm_loadl_epi64(reinterpret_cast<const __m128i*>(c));
  }
  // sum = n0 * 2^14 + sum_i (n[i+1] - n[i]) * w[i], as pairs of 16-bit products.
  const auto pair = [](std::int32_t lo, std::int32_t hi) { return _mm_set1_epi32((hi << 16) | lo); };
  __m128i acc = _mm_madd_epi16(_mm_unpacklo_epi16(n[0], _mm_sub_epi16(n[1], n[0])), pair(1 << kWeightBits, sx.w[0]));
  acc = _mm_add_epi32(acc, _mm_madd_epi16(_mm_unpacklo_epi16(_mm_sub_epi16(n[2], n[1]), _mm_sub_epi16(n[3], n[2])),
                                          pair(sx.w[1], sx.w[2])));
  if constexpr (N == 4) {
    acc = _mm_add_epi32(acc, _mm_madd_epi16(_mm_unpacklo_epi16(_mm_sub_epi16(n[4], n[3]), _mm_setzero_si128()),
                                            pair(sx.w[3], 0)));
  }
  acc = _mm_srai_epi32(_mm_add_epi32(acc, _mm_set1_epi32(kRound)), kWeightBits + kValueBits);
  const __m128i bytes = _mm_packus_epi16(_mm_packs_epi32(acc, acc), _mm_setzero_si128());
  PutBytes(static_cast<std::uint32_t>(_mm_cvtsi128_si32(bytes)), x, out, d, p.out_channels);
}

inline __m128 TetraSse2(const float* c0, const ops::Simplex<3>& sx, const __m128* w) {
  const float* c1 = c0 + sx.step[0];
  const float* c2 = c1 + sx.step[1];
  const float* c3 = c2 + sx.step[2];
  const __m128 n0 = _mm_loadu_ps(c0), n1 = _mm_loadu_ps(c1), n2 = _mm_loadu_ps(c2), n3 = _mm_loadu_ps(c3);
  __m128 v = _mm_add_ps(n0, _mm_mul_ps(_mm_sub_ps(n1, n0), w[0]));
  v = _mm_add_ps(v, _mm_mul_ps(_mm_sub_ps(n2, n1), w[1]));
  return _mm_add_ps(v, _mm_mul_ps(_mm_sub_ps(n3, n2), w[2]));
}

// A pixel of a ShapedClut kind once located: its first node, simplex, weights and
// filler byte.
struct ShapedCell {
  const float* c;
  ops::Simplex<3> sx;
  std::int32_t k_step;
  float k_weight;
  std::uint8_t x;
};

template <unsigned N>
inline ShapedCell LocateShaped(const FastPath& p, const std::uint8_t* s, const PixelLayout& in) {
  ShapedCell cell;
  std::int32_t base;
  cell.sx = ops::Locate<3>(p, s, in, base);
  cell.x = ops::FillerOf(s, in);
  cell.k_step = 0;
  cell.k_weight = 0.0f;
  if constexpr (N == 4) {
    const std::uint8_t k_level = s[in.at[3]];
    base += p.offset[3 * 256 + k_level];
    cell.k_step = p.stride[3];
    cell.k_weight = p.weight[3 * 256 + k_level] * ops::kUnitWeight;
  }
  cell.c = &p.linear_nodes[base];
  return cell;
}

// The scalar ShapedClutPixel with the channels side by side, up to the output
// tables' indices.
template <unsigned N>
inline __m128i ShapedIndicesSse2(const ShapedCell& cell, __m128 limit) {
  const ops::Simplex<3>& sx = cell.sx;
  const __m128 w[3] = {_mm_set1_ps(sx.w[0] * ops::kUnitWeight), _mm_set1_ps(sx.w[1] * ops::kUnitWeight),
                       _mm_set1_ps(sx.w[2] * ops::kUnitWeight)};
  __m128 v = TetraSse2(cell.c, sx, w);
  if constexpr (N == 4) {
    v = _mm_add_ps(v, _mm_mul_ps(_mm_sub_ps(TetraSse2(cell.c + cell.k_step, sx, w), v), _mm_set1_ps(cell.k_weight)));
  }
  return ShaperIndex(v, limit);
}

// Linear-light tables run to megabytes, so most pixels miss the cache: a block of
// pixels is located first, with the corners of each cell fetched ahead, then
// interpolated, then written, so that the misses of the block overlap and no byte
// written can alias the tables being read. Every pixel of a block is read before any
// is written, as in-place conversion needs.
constexpr std::size_t kShapedBlock = 32;

struct ShapedBlock {
  ShapedCell cells[kShapedBlock];
  alignas(16) std::int32_t at[kShapedBlock][4];  // output table indices
};

template <unsigned N>
inline void LocateBlock(const FastPath& p, const std::uint8_t* src, const PixelLayout& in, std::size_t m,
                        ShapedBlock& b) {
  for (std::size_t j = 0; j < m; ++j) {
    const ShapedCell& cell = b.cells[j] = LocateShaped<N>(p, src + j * in.bytes, in);
    const float* corner = cell.c;
    for (unsigned t = 0; t < 4; ++t) {
      _mm_prefetch(reinterpret_cast<const char*>(corner), _MM_HINT_T0);
      if constexpr (N == 4) _mm_prefetch(reinterpret_cast<const char*>(corner + cell.k_step + 3), _MM_HINT_T0);
      if (t < 3) corner += cell.sx.step[t];
    }
  }
}

inline void WriteBlock(const FastPath& p, const PixelLayout& out, std::uint8_t* d, std::size_t m,
                       const ShapedBlock& b) {
  const std::uint8_t* table = p.shaper.data();
  const unsigned oc = p.out_channels;
  for (std::size_t j = 0; j < m; ++j, d += out.bytes) {
    for (unsigned k = 0; k < oc; ++k) d[out.at[k]] = table[b.at[j][k]];
    if (out.x >= 0) d[out.x] = b.cells[j].x;
  }
}

const __m128i kTableAt = _mm_setr_epi32(0, kShaperSize + 1, 2 * (kShaperSize + 1), 0);

template <unsigned N>
void ShapedBlocksSse2(const FastPath& p, const std::uint8_t* src, const PixelLayout& in, std::uint8_t* dst,
                      const PixelLayout& out, std::size_t n) {
  const __m128 limit = _mm_set1_ps(p.limit);
  ShapedBlock b;
  for (std::size_t i = 0; i < n; i += kShapedBlock) {
    const std::size_t m = n - i < kShapedBlock ? n - i : kShapedBlock;
    LocateBlock<N>(p, src + i * in.bytes, in, m, b);
    for (std::size_t j = 0; j < m; ++j) {
      _mm_store_si128(reinterpret_cast<__m128i*>(b.at[j]), _mm_add_epi32(ShapedIndicesSse2<N>(b.cells[j], limit), kTableAt));
    }
    WriteBlock(p, out, dst + i * out.bytes, m, b);
  }
}

// CMYK in linear light with AVX: a K plane's node and the next plane's lie side by
// side, so one 8-lane read holds both, the tetrahedron is interpolated in both planes
// at once, and the next plane's lanes are moved down for the step between them. Each
// lane sees the operations of the SSE2 kernel in the same order.
__attribute__((target("avx2"))) inline __m128i CmykIndicesAvx2(const ShapedCell& cell, __m128 limit,
                                                               __m256i next_plane) {
  const ops::Simplex<3>& sx = cell.sx;
  const float* c0 = cell.c;
  const float* c1 = c0 + sx.step[0];
  const float* c2 = c1 + sx.step[1];
  const float* c3 = c2 + sx.step[2];
  const __m256 n0 = _mm256_loadu_ps(c0), n1 = _mm256_loadu_ps(c1), n2 = _mm256_loadu_ps(c2), n3 = _mm256_loadu_ps(c3);
  __m256 v = _mm256_add_ps(n0, _mm256_mul_ps(_mm256_sub_ps(n1, n0), _mm256_set1_ps(sx.w[0] * ops::kUnitWeight)));
  v = _mm256_add_ps(v, _mm256_mul_ps(_mm256_sub_ps(n2, n1), _mm256_set1_ps(sx.w[1] * ops::kUnitWeight)));
  v = _mm256_add_ps(v, _mm256_mul_ps(_mm256_sub_ps(n3, n2), _mm256_set1_ps(sx.w[2] * ops::kUnitWeight)));
  const __m128 lo = _mm256_castps256_ps128(v);
  const __m128 hi = _mm256_castps256_ps128(_mm256_permutevar8x32_ps(v, next_plane));
  __m128 r = _mm_add_ps(lo, _mm_mul_ps(_mm_sub_ps(hi, lo), _mm_set1_ps(cell.k_weight)));
  return ShaperIndex(r, limit);
}

__attribute__((target("avx2"))) void CmykBlocksAvx2(const FastPath& p, const std::uint8_t* src,
                                                     const PixelLayout& in, std::uint8_t* dst, const PixelLayout& out,
                                                     std::size_t n) {
  const __m128 limit = _mm_set1_ps(p.limit);
  const __m256i next_plane = _mm256_add_epi32(_mm256_setr_epi32(0, 1, 2, 3, 4, 4, 4, 4), _mm256_set1_epi32(p.stride[3]));
  ShapedBlock b;
  for (std::size_t i = 0; i < n; i += kShapedBlock) {
    const std::size_t m = n - i < kShapedBlock ? n - i : kShapedBlock;
    LocateBlock<4>(p, src + i * in.bytes, in, m, b);
    for (std::size_t j = 0; j < m; ++j) {
      _mm_store_si128(reinterpret_cast<__m128i*>(b.at[j]), _mm_add_epi32(CmykIndicesAvx2(b.cells[j], limit, next_plane), kTableAt));
    }
    WriteBlock(p, out, dst + i * out.bytes, m, b);
  }
}

// lo + (hi - lo) * w in eight 16-bit lanes, as ops::Lerp; pw holds (2^14, w) pairs.
inline __m128i Lerp8(__m128i lo, __m128i hi, __m128i pw) {
  const __m128i d = _mm_sub_epi16(hi, lo);
  const __m128i r = _mm_set1_epi32(1 << (kWeightBits - 1));
  const __m128i a = _mm_srai_epi32(_mm_add_epi32(_mm_madd_epi16(_mm_unpacklo_epi16(lo, d), pw), r), kWeightBits);
  const __m128i b = _mm_srai_epi32(_mm_add_epi32(_mm_madd_epi16(_mm_unpackhi_epi16(lo, d), pw), r), kWeightBits);
  return _mm_packs_epi32(a, b);
}

inline __m128i WeightPair(std::int32_t w) { return _mm_set1_epi32((w << 16) | (1 << kWeightBits)); }

// The staged pixels of ops::StagedPixel, a block at a time in four passes (stage 1,
// input curves, the table's trilinear step, output curves): each pass is a short chain
// of dependent steps, so the processor overlaps many pixels. A block is read before
// any of it is written.
constexpr std::size_t kStagedBlock = 64;
constexpr std::int16_t kCurveMid = 255 * 128;

struct StagedBlock {
  alignas(32) std::int32_t t[3][kStagedBlock];  // curve positions, axis by axis
  alignas(16) std::int16_t v[kStagedBlock][4];  // the table's values
  alignas(32) std::int32_t at[kStagedBlock];    // node offset of the cell
  alignas(32) std::int32_t w[3][kStagedBlock];  // its weights, axis by axis
  std::uint8_t fill[kStagedBlock];
};

inline void StagedCurvePositions(const FastPath& p, const std::uint8_t* src, const PixelLayout& in, std::size_t m,
                                 StagedBlock& b, std::size_t from = 0) {
  const auto pair = [](std::int32_t lo, std::int32_t hi) { return _mm_set1_epi32((hi << 16) | lo); };
  const __m128i lo = _mm_set1_epi16(-kCurveMid), hi = _mm_set1_epi16(kCurveMid);
  for (std::size_t j = from; j < m; ++j) {
    const std::uint8_t* s = src + j * in.bytes;
    std::int32_t base;
    const ops::Simplex<3> sx = ops::Locate<3>(p, s, in, base);
    b.fill[j] = ops::FillerOf(s, in);
    const std::int16_t* c = &p.nodes[base];
    __m128i q[4];
    q[0] = _mm_loadl_epi64(reinterpret_cast<const __m128i*>(c));
    for (unsigned k = 0; k < 3; ++k) {
      c += sx.step[k];
      q[k + 1] = _mm_loadl_epi64(reinterpret_cast<const __m128i*>(c));
    }
    __m128i acc = _mm_madd_epi16(_mm_unpacklo_epi16(q[0], _mm_sub_epi16(q[1], q[0])), pair(1 << kWeightBits, sx.w[0]));
    acc = _mm_add_epi32(acc, _mm_madd_epi16(_mm_unpacklo_epi16(_mm_sub_epi16(q[2], q[1]), _mm_sub_epi16(q[3], q[2])),
                                            pair(sx.w[1], sx.w[2])));
    acc = _mm_srai_epi32(_mm_add_epi32(acc, _mm_set1_epi32(1 << (kWeightBits - 2))), kWeightBits - 1);
    const __m128i clipped = _mm_min_epi16(_mm_max_epi16(_mm_packs_epi32(acc, acc), lo), hi);
    b.t[0][j] = static_cast<std::int16_t>(_mm_extract_epi16(clipped, 0)) + kCurveMid;
    b.t[1][j] = static_cast<std::int16_t>(_mm_extract_epi16(clipped, 1)) + kCurveMid;
    b.t[2][j] = static_cast<std::int16_t>(_mm_extract_epi16(clipped, 2)) + kCurveMid;
  }
}

inline void StagedCells(const FastPath& p, std::size_t m, StagedBlock& b, std::size_t from = 0) {
  for (std::size_t j = from; j < m; ++j) {
    std::int32_t o[3];
    for (unsigned a = 0; a < 3; ++a) ops::ClutAxis(p, a, b.t[a][j], o[a], b.w[a][j]);
    b.at[j] = o[0] + o[1] + o[2];
  }
}

inline void StagedTrilinearSse2(const FastPath& p, std::size_t m, StagedBlock& b, std::size_t from = 0) {
  const auto load = [](const std::int16_t* a) { return _mm_loadu_si128(reinterpret_cast<const __m128i*>(a)); };
  const std::int32_t sx = p.clut_stride[0], sy = p.clut_stride[1];
  for (std::size_t j = from; j < m; ++j) {
    const std::int16_t* q = &p.clut[b.at[j]];
    const __m128i wx = WeightPair(b.w[0][j]);
    const __m128i x0 = Lerp8(load(q), load(q + sx), wx);            // x00 | x01
    const __m128i x1 = Lerp8(load(q + sy), load(q + sx + sy), wx);  // x10 | x11
    const __m128i y = Lerp8(x0, x1, WeightPair(b.w[1][j]));         // y0 | y1
    _mm_storel_epi64(reinterpret_cast<__m128i*>(b.v[j]), Lerp8(y, _mm_srli_si128(y, 8), WeightPair(b.w[2][j])));
  }
}

// Output curves, and the bytes in place: as one 32-bit word when the pixel is four
// bytes that all get written.
inline void StagedOutput(const FastPath& p, const PixelLayout& out, std::uint8_t* dst, std::size_t m,
                         const StagedBlock& b) {
  const unsigned oc = p.out_channels;
  if (out.bytes == 4 && (oc == 4 || (oc == 3 && out.x >= 0))) {
    unsigned shift[4];
    for (unsigned k = 0; k < oc; ++k) shift[k] = 8 * out.at[k];
    const unsigned xs = out.x >= 0 ? 8 * out.x : 0;
    const std::uint8_t* table[4];
    for (unsigned k = 0; k < oc; ++k) table[k] = &p.out_level[k * ((255 << kValueBits) + 1)];
    for (std::size_t j = 0; j < m; ++j) {
      std::uint32_t o = out.x >= 0 ? std::uint32_t{b.fill[j]} << xs : 0;
      for (unsigned k = 0; k < oc; ++k) o |= std::uint32_t{table[k][b.v[j][k]]} << shift[k];
      std::memcpy(dst + j * 4, &o, 4);
    }
    return;
  }
  for (std::size_t j = 0; j < m; ++j) {
    std::uint32_t o = 0;
    for (unsigned k = 0; k < oc; ++k) o |= std::uint32_t{ops::OutLevel(p, k, b.v[j][k])} << (8 * k);
    PutBytes(o, b.fill[j], out, dst + j * out.bytes, oc);
  }
}

template <typename Positions, typename Cells, typename Trilinear>
inline void StagedRun(const FastPath& p, const std::uint8_t* src, const PixelLayout& in, std::uint8_t* dst,
                      const PixelLayout& out, std::size_t from, std::size_t n, Positions positions, Cells cells,
                      Trilinear trilinear) {
  StagedBlock b;
  for (std::size_t i = from; i < n; i += kStagedBlock) {
    const std::size_t m = n - i < kStagedBlock ? n - i : kStagedBlock;
    positions(p, src + i * in.bytes, in, m, n - i, b);
    cells(p, m, b);
    trilinear(p, m, b);
    StagedOutput(p, out, dst + i * out.bytes, m, b);
  }
}

template <typename PixelFn>
inline void Each(const std::uint8_t* src, const PixelLayout& in, std::uint8_t* dst, const PixelLayout& out,
                 std::size_t from, std::size_t n, PixelFn pixel) {
  for (std::size_t i = from; i < n; ++i) pixel(src + i * in.bytes, dst + i * out.bytes);
}

inline void RunPerPixel(const FastPath& p, const std::uint8_t* src, const PixelLayout& in, std::uint8_t* dst,
                        const PixelLayout& out, std::size_t from, std::size_t n) {
  switch (p.kind) {
    case Kind::Table1:
      return Each(src, in, dst, out, from, n,
                  [&](const std::uint8_t* s, std::uint8_t* d) { ops::Table1Pixel(p, s, in, d, out); });
    case Kind::Matrix: {
      if (p.out_channels == 3) return MatrixRgbSse2(p, src, in, dst, out, from, n);
      const __m128 limit = _mm_set1_ps(p.limit);
      return Each(src, in, dst, out, from, n,
                  [&](const std::uint8_t* s, std::uint8_t* d) { MatrixPixelSse2(p, s, in, d, out, limit); });
    }
    case Kind::Clut3:
      return Each(src, in, dst, out, from, n,
                  [&](const std::uint8_t* s, std::uint8_t* d) { ClutPixelSse2<3>(p, s, in, d, out); });
    case Kind::Clut4:
      return Each(src, in, dst, out, from, n,
                  [&](const std::uint8_t* s, std::uint8_t* d) { ClutPixelSse2<4>(p, s, in, d, out); });
    case Kind::ShapedClut3:
      return ShapedBlocksSse2<3>(p, src + from * in.bytes, in, dst + from * out.bytes, out, n - from);
    case Kind::ShapedClut4:
      return ShapedBlocksSse2<4>(p, src + from * in.bytes, in, dst + from * out.bytes, out, n - from);
    case Kind::Staged:
      return StagedRun(
          p, src, in, dst, out, from, n,
          [](const FastPath& q, const std::uint8_t* s, const PixelLayout& l, std::size_t m, std::size_t,
             StagedBlock& b) { StagedCurvePositions(q, s, l, m, b); },
          [](const FastPath& q, std::size_t m, StagedBlock& b) { StagedCells(q, m, b); },
          [](const FastPath& q, std::size_t m, StagedBlock& b) { StagedTrilinearSse2(q, m, b); });
  }
}

// MatrixRgbSse2 two pixels at a time: both are read before either is written (in
// place needs it), their six channels share one clamp and index computation, and
// their bytes are written as one word.
__attribute__((target("avx2"))) void MatrixRgbAvx2(const FastPath& p, const std::uint8_t* src,
                                                    const PixelLayout& in, std::uint8_t* dst, const PixelLayout& out,
                                                    std::size_t n, std::size_t& done) {
  const float* lin = p.lin.data();
  const std::uint8_t* t0 = p.shaper.data();
  const std::uint8_t* t1 = t0 + (kShaperSize + 1);
  const std::uint8_t* t2 = t1 + (kShaperSize + 1);
  const unsigned ib = in.bytes, ob = out.bytes, i0 = in.at[0], i1 = in.at[1], i2 = in.at[2];
  const unsigned o0 = out.at[0], o1 = out.at[1], o2 = out.at[2];
  const int ix = in.x, ox = out.x;
  const unsigned s0 = 8 * o0, s1 = 8 * o1, s2 = 8 * o2, sx = ox >= 0 ? 8 * ox : 0, sb = 8 * ob;
  const __m256 limit = _mm256_set1_ps(p.limit), floor = _mm256_set1_ps(kShaperFloor);
  const __m256i base = _mm256_set1_epi32(kShaperBase);
  const auto sum = [&](const std::uint8_t* s) {
    return _mm_add_ps(_mm_add_ps(_mm_loadu_ps(lin + s[i0] * 4), _mm_loadu_ps(lin + (256 + s[i1]) * 4)),
                      _mm_loadu_ps(lin + (512 + s[i2]) * 4));
  };
  std::size_t i = 0;
  for (; i + 2 <= n; i += 2) {
    const std::uint8_t* s = src + i * ib;
    std::uint8_t* d = dst + i * ob;
    const std::uint8_t x0 = ix >= 0 ? s[ix] : 0, x1 = ix >= 0 ? s[ib + ix] : 0;
    __m256 v = _mm256_insertf128_ps(_mm256_castps128_ps256(sum(s)), sum(s + ib), 1);
    v = _mm256_min_ps(_mm256_max_ps(v, floor), limit);
    alignas(32) std::int32_t q[8];
    _mm256_store_si256(reinterpret_cast<__m256i*>(q),
                       _mm256_sub_epi32(_mm256_srli_epi32(_mm256_castps_si256(v), kShaperShift), base));
    // Both pixels' bytes in one word, written as exactly their 2 * ob bytes.
    std::uint64_t word = (std::uint64_t{t0[q[0]]} << s0) | (std::uint64_t{t1[q[1]]} << s1) |
                         (std::uint64_t{t2[q[2]]} << s2) | (std::uint64_t{t0[q[4]]} << (s0 + sb)) |
                         (std::uint64_t{t1[q[5]]} << (s1 + sb)) | (std::uint64_t{t2[q[6]]} << (s2 + sb));
    if (ox >= 0) word |= (std::uint64_t{x0} << sx) | (std::uint64_t{x1} << (sx + sb));
    std::uint8_t bytes[8];
    for (unsigned k = 0; k < 8; ++k) bytes[k] = static_cast<std::uint8_t>(word >> (8 * k));
    if (ob == 4) {
      std::memcpy(d, bytes, 8);
    } else {
      std::memcpy(d, bytes, 6);
    }
  }
  done = i;
}

// The trilinear step of StagedTrilinearSse2 for two pixels at once, one in each half.
__attribute__((target("avx2"))) inline __m256i Lerp16(__m256i lo, __m256i hi, __m256i pw) {
  const __m256i d = _mm256_sub_epi16(hi, lo);
  const __m256i r = _mm256_set1_epi32(1 << (kWeightBits - 1));
  const __m256i a =
      _mm256_srai_epi32(_mm256_add_epi32(_mm256_madd_epi16(_mm256_unpacklo_epi16(lo, d), pw), r), kWeightBits);
  const __m256i b =
      _mm256_srai_epi32(_mm256_add_epi32(_mm256_madd_epi16(_mm256_unpackhi_epi16(lo, d), pw), r), kWeightBits);
  return _mm256_packs_epi32(a, b);
}

__attribute__((target("avx2"))) inline __m256i Load2(const std::int16_t* a0, const std::int16_t* a1) {
  return _mm256_inserti128_si256(_mm256_castsi128_si256(_mm_loadu_si128(reinterpret_cast<const __m128i*>(a0))),
                                 _mm_loadu_si128(reinterpret_cast<const __m128i*>(a1)), 1);
}

__attribute__((target("avx2"))) inline __m256i WeightPairs(std::int32_t w0, std::int32_t w1) {
  const std::int32_t a = (w0 << 16) | (1 << kWeightBits), c = (w1 << 16) | (1 << kWeightBits);
  return _mm256_setr_epi32(a, a, a, a, c, c, c, c);
}

// The byte shuffle that puts channel c (or the filler, c = 3) of four pixels in the low
// bytes of four dwords, for each 128-bit half.
__attribute__((target("avx2"))) inline __m256i LevelShuffle(const PixelLayout& in, int c) {
  alignas(16) std::int8_t m[16];
  for (int k = 0; k < 16; ++k) m[k] = -128;
  const int at = c < 3 ? in.at[c] : in.x;
  for (int px = 0; px < 4; ++px) m[px * 4] = static_cast<std::int8_t>(px * static_cast<int>(in.bytes) + at);
  return _mm256_broadcastsi128_si256(_mm_load_si128(reinterpret_cast<const __m128i*>(m)));
}

// Stage 1 of StagedCurvePositions for eight pixels at once: two 16-byte reads hold
// them (groups stop while those stay inside the run), gathers read the tables.
__attribute__((target("avx2"))) void StagedCurvePositionsAvx2(const FastPath& p, const std::uint8_t* src,
                                                               const PixelLayout& in, std::size_t m, std::size_t avail,
                                                               StagedBlock& b) {
  const __m256i level_of[3] = {LevelShuffle(in, 0), LevelShuffle(in, 1), LevelShuffle(in, 2)};
  const __m256i filler_of = LevelShuffle(in, in.x >= 0 ? 3 : 0);
  const __m256i wmask = _mm256_set1_epi32((1 << 15) - 1);
  const __m256i stride[3] = {_mm256_set1_epi32(p.stride[0] / 4), _mm256_set1_epi32(p.stride[1] / 4),
                             _mm256_set1_epi32(p.stride[2] / 4)};
  const __m256i all = _mm256_set1_epi32((p.stride[0] + p.stride[1] + p.stride[2]) / 4);
  const __m256i round = _mm256_set1_epi32(1 << (kWeightBits - 2));
  const __m256i lo = _mm256_set1_epi32(-kCurveMid), hi = _mm256_set1_epi32(kCurveMid), mid = hi;
  const auto* nodes64 = reinterpret_cast<const long long*>(p.nodes.data());
  std::size_t j = 0;
  for (; j + 8 <= m && (j + 4) * in.bytes + 16 <= avail * in.bytes; j += 8) {
    const std::uint8_t* s = src + j * in.bytes;
    const __m256i px = _mm256_inserti128_si256(
        _mm256_castsi128_si256(_mm_loadu_si128(reinterpret_cast<const __m128i*>(s))),
        _mm_loadu_si128(reinterpret_cast<const __m128i*>(s + 4 * in.bytes)), 1);
    __m256i base = _mm256_setzero_si256(), w[3];
    for (int c = 0; c < 3; ++c) {
      const __m256i level = _mm256_shuffle_epi8(px, level_of[c]);
      const __m256i cell = _mm256_i32gather_epi32(p.cell.data() + c * 256, level, 4);
      w[c] = _mm256_and_si256(cell, wmask);
      base = _mm256_add_epi32(base, _mm256_srli_epi32(cell, 15));
    }
    if (in.x >= 0) {
      alignas(32) std::int32_t x[8];
      _mm256_store_si256(reinterpret_cast<__m256i*>(x), _mm256_shuffle_epi8(px, filler_of));
      for (int k = 0; k < 8; ++k) b.fill[j + k] = static_cast<std::uint8_t>(x[k]);
    } else {
      std::memset(&b.fill[j], 0, 8);
    }
    // The simplex: largest weight first, ties to the lower axis (as ops::Sort; with
    // equal weights either order gives the same sums).
    const __m256i gt10 = _mm256_cmpgt_epi32(w[1], w[0]), gt20 = _mm256_cmpgt_epi32(w[2], w[0]);
    const __m256i gt21 = _mm256_cmpgt_epi32(w[2], w[1]);
    const __m256i first0 = _mm256_andnot_si256(_mm256_or_si256(gt10, gt20), _mm256_set1_epi32(-1));
    const __m256i first1 = _mm256_andnot_si256(gt21, gt10);
    const __m256i last0 = _mm256_and_si256(gt10, gt20);
    const __m256i last1 = _mm256_andnot_si256(gt10, gt21);
    const __m256i s_first = _mm256_blendv_epi8(_mm256_blendv_epi8(stride[2], stride[1], first1), stride[0], first0);
    const __m256i s_last = _mm256_blendv_epi8(_mm256_blendv_epi8(stride[2], stride[1], last1), stride[0], last0);
    const __m256i wmax = _mm256_max_epi32(_mm256_max_epi32(w[0], w[1]), w[2]);
    const __m256i wmin = _mm256_min_epi32(_mm256_min_epi32(w[0], w[1]), w[2]);
    const __m256i wsum = _mm256_add_epi32(_mm256_add_epi32(w[0], w[1]), w[2]);
    const __m256i wmid = _mm256_sub_epi32(wsum, _mm256_add_epi32(wmax, wmin));
    const __m256i corner[4] = {base, _mm256_add_epi32(base, s_first),
                               _mm256_sub_epi32(_mm256_add_epi32(base, all), s_last), _mm256_add_epi32(base, all)};
    // Weight pairs for the multiply-adds: (2^14, largest) and (middle, smallest).
    const __m256i w1 = _mm256_or_si256(_mm256_slli_epi32(wmax, 16), _mm256_set1_epi32(1 << kWeightBits));
    const __m256i w2 = _mm256_or_si256(_mm256_slli_epi32(wmin, 16), wmid);
    __m256i sums[2][2];  // per half: channels 0-1 and 2-3 of its four pixels, axis-major
    for (int h = 0; h < 2; ++h) {
      // Whole nodes (four 16-bit lanes) for pixels 4h .. 4h + 3.
      __m256i n[4];
      for (int k = 0; k < 4; ++k) {
        const __m128i idx = h ? _mm256_extracti128_si256(corner[k], 1) : _mm256_castsi256_si128(corner[k]);
        n[k] = _mm256_i32gather_epi64(nodes64, idx, 8);
      }
      const __m256i d1 = _mm256_sub_epi16(n[1], n[0]), d2 = _mm256_sub_epi16(n[2], n[1]);
      const __m256i d3 = _mm256_sub_epi16(n[3], n[2]);
      // Even pixels of the half (4h, 4h + 2) sit in the low quadwords, odd ones high.
      const __m256i even = _mm256_setr_epi32(4 * h, 4 * h, 4 * h, 4 * h, 4 * h + 2, 4 * h + 2, 4 * h + 2, 4 * h + 2);
      const __m256i odd = _mm256_add_epi32(even, _mm256_set1_epi32(1));
      const __m256i se = _mm256_add_epi32(
          _mm256_madd_epi16(_mm256_unpacklo_epi16(n[0], d1), _mm256_permutevar8x32_epi32(w1, even)),
          _mm256_madd_epi16(_mm256_unpacklo_epi16(d2, d3), _mm256_permutevar8x32_epi32(w2, even)));
      const __m256i so = _mm256_add_epi32(
          _mm256_madd_epi16(_mm256_unpackhi_epi16(n[0], d1), _mm256_permutevar8x32_epi32(w1, odd)),
          _mm256_madd_epi16(_mm256_unpackhi_epi16(d2, d3), _mm256_permutevar8x32_epi32(w2, odd)));
      // [c0 of p0 p1 p2 p3 | c1 of them] and [c2 | c3].
      sums[h][0] = _mm256_permute4x64_epi64(_mm256_unpacklo_epi32(se, so), 0xD8);
      sums[h][1] = _mm256_permute4x64_epi64(_mm256_unpackhi_epi32(se, so), 0xD8);
    }
    const __m256i sum[3] = {_mm256_permute2x128_si256(sums[0][0], sums[1][0], 0x20),
                            _mm256_permute2x128_si256(sums[0][0], sums[1][0], 0x31),
                            _mm256_permute2x128_si256(sums[0][1], sums[1][1], 0x20)};
    for (int a = 0; a < 3; ++a) {
      __m256i v = _mm256_srai_epi32(_mm256_add_epi32(sum[a], round), kWeightBits - 1);
      v = _mm256_min_epi32(_mm256_max_epi32(v, lo), hi);
      _mm256_store_si256(reinterpret_cast<__m256i*>(&b.t[a][j]), _mm256_add_epi32(v, mid));
    }
  }
  StagedCurvePositions(p, src, in, m, b, j);
}

// The cells of StagedCells for eight pixels at once, the curve points gathered.
__attribute__((target("avx2"))) void StagedCellsAvx2(const FastPath& p, std::size_t m, StagedBlock& b) {
  const __m256i low8 = _mm256_set1_epi32(255);
  const __m256i half = _mm256_set1_epi32(128), frac = _mm256_set1_epi32((1 << kClutFracBits) - 1);
  const __m256i evens_first = _mm256_setr_epi32(0, 2, 4, 6, 1, 3, 5, 7);
  std::size_t j = 0;
  for (; j + 8 <= m; j += 8) {
    __m256i at = _mm256_setzero_si256();
    for (unsigned a = 0; a < 3; ++a) {
      const __m256i t = _mm256_load_si256(reinterpret_cast<const __m256i*>(&b.t[a][j]));
      const __m256i idx = _mm256_srli_epi32(t, 8);
      // Both points of a curve step in one 64-bit read, then split into c0 and c1.
      const auto* curve = reinterpret_cast<const long long*>(&p.in_curve[a * 257]);
      const __m256i p0 = _mm256_permutevar8x32_epi32(
          _mm256_i32gather_epi64(curve, _mm256_castsi256_si128(idx), 4), evens_first);
      const __m256i p1 = _mm256_permutevar8x32_epi32(
          _mm256_i32gather_epi64(curve, _mm256_extracti128_si256(idx, 1), 4), evens_first);
      const __m256i c0 = _mm256_permute2x128_si256(p0, p1, 0x20);
      const __m256i c1 = _mm256_permute2x128_si256(p0, p1, 0x31);
      const __m256i step = _mm256_mullo_epi32(_mm256_sub_epi32(c1, c0), _mm256_and_si256(t, low8));
      const __m256i pos = _mm256_add_epi32(c0, _mm256_srai_epi32(_mm256_add_epi32(step, half), 8));
      _mm256_store_si256(reinterpret_cast<__m256i*>(&b.w[a][j]), _mm256_and_si256(pos, frac));
      at = _mm256_add_epi32(at, _mm256_mullo_epi32(_mm256_srai_epi32(pos, kClutFracBits),
                                                   _mm256_set1_epi32(p.clut_stride[a])));
    }
    _mm256_store_si256(reinterpret_cast<__m256i*>(&b.at[j]), at);
  }
  StagedCells(p, m, b, j);
}

__attribute__((target("avx2"))) void StagedTrilinearAvx2(const FastPath& p, std::size_t m, StagedBlock& b) {
  const std::int32_t sx = p.clut_stride[0], sy = p.clut_stride[1];
  std::size_t j = 0;
  for (; j + 2 <= m; j += 2) {
    const std::int16_t* q0 = &p.clut[b.at[j]];
    const std::int16_t* q1 = &p.clut[b.at[j + 1]];
    const __m256i wx = WeightPairs(b.w[0][j], b.w[0][j + 1]);
    const __m256i x0 = Lerp16(Load2(q0, q1), Load2(q0 + sx, q1 + sx), wx);
    const __m256i x1 = Lerp16(Load2(q0 + sy, q1 + sy), Load2(q0 + sx + sy, q1 + sx + sy), wx);
    const __m256i y = Lerp16(x0, x1, WeightPairs(b.w[1][j], b.w[1][j + 1]));
    const __m256i z = Lerp16(y, _mm256_srli_si256(y, 8), WeightPairs(b.w[2][j], b.w[2][j + 1]));
    _mm_storel_epi64(reinterpret_cast<__m128i*>(b.v[j]), _mm256_castsi256_si128(z));
    _mm_storel_epi64(reinterpret_cast<__m128i*>(b.v[j + 1]), _mm256_extracti128_si256(z, 1));
  }
  StagedTrilinearSse2(p, m, b, j);
}

}  // namespace

void RunSse2(const FastPath& p, const std::uint8_t* src, const PixelLayout& in, std::uint8_t* dst,
             const PixelLayout& out, std::size_t n) {
  RunPerPixel(p, src, in, dst, out, 0, n);
}

__attribute__((target("avx2"))) void RunAvx2(const FastPath& p, const std::uint8_t* src, const PixelLayout& in,
                                              std::uint8_t* dst, const PixelLayout& out, std::size_t n) {
  std::size_t done = 0;
  if (p.kind == Kind::Staged) {
    return StagedRun(p, src, in, dst, out, 0, n, StagedCurvePositionsAvx2, StagedCellsAvx2, StagedTrilinearAvx2);
  }
  if (p.kind == Kind::ShapedClut4) return CmykBlocksAvx2(p, src, in, dst, out, n);
  if (p.kind == Kind::Matrix && p.out_channels == 3) MatrixRgbAvx2(p, src, in, dst, out, n, done);
  RunPerPixel(p, src, in, dst, out, done, n);
}

}  // namespace win32::icm::kernels::detail

#endif
