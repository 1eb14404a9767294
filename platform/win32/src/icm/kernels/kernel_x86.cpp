// The x86 kernels: SSE2 (every x86-64 has it) works a pixel at a time with the
// pixel's channels side by side in one register; AVX2, chosen at run time, converts
// matrix-shaper runs eight pixels at a time with gathers. Both end a run with the
// per-pixel steps the scalar kernel uses.
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

inline std::uint8_t ShapeQ(const FastPath& p, unsigned k, std::uint32_t q) {
  const std::uint16_t* t = &p.shaper[k * (kShaperSteps + 2) + (q >> 8)];
  const std::uint32_t f = q & 255;
  return static_cast<std::uint8_t>((t[0] * (256 - f) + t[1] * f + (1u << (kValueBits + 7))) >> (kValueBits + 8));
}

inline void MatrixPixelSse2(const FastPath& p, const std::uint8_t* s, const PixelLayout& in, std::uint8_t* d,
                            const PixelLayout& out, __m128 limit) {
  const __m128 a = _mm_loadu_ps(&p.lin[s[in.at[0]] * 4]);
  const __m128 b = _mm_loadu_ps(&p.lin[(256 + s[in.at[1]]) * 4]);
  const __m128 c = _mm_loadu_ps(&p.lin[(512 + s[in.at[2]]) * 4]);
  const std::uint8_t x = ops::FillerOf(s, in);
  __m128 v = _mm_add_ps(_mm_add_ps(a, b), c);
  v = _mm_min_ps(_mm_max_ps(v, _mm_setzero_ps()), limit);
  alignas(16) std::uint32_t q[4];
  _mm_store_si128(reinterpret_cast<__m128i*>(q), _mm_cvttps_epi32(_mm_sqrt_ps(v)));
  std::uint32_t o = 0;
  for (unsigned k = 0; k < p.out_channels; ++k) o |= std::uint32_t{ShapeQ(p, k, q[k])} << (8 * k);
  PutBytes(o, x, out, d, p.out_channels);
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

// The scalar ShapedClutPixel with the channels side by side.
template <unsigned N>
inline void ShapedPixelSse2(const FastPath& p, const ShapedCell& cell, std::uint8_t* d, const PixelLayout& out,
                            __m128 limit) {
  const ops::Simplex<3>& sx = cell.sx;
  const __m128 w[3] = {_mm_set1_ps(sx.w[0] * ops::kUnitWeight), _mm_set1_ps(sx.w[1] * ops::kUnitWeight),
                       _mm_set1_ps(sx.w[2] * ops::kUnitWeight)};
  __m128 v = TetraSse2(cell.c, sx, w);
  if constexpr (N == 4) {
    v = _mm_add_ps(v, _mm_mul_ps(_mm_sub_ps(TetraSse2(cell.c + cell.k_step, sx, w), v), _mm_set1_ps(cell.k_weight)));
  }
  v = _mm_min_ps(_mm_max_ps(v, _mm_setzero_ps()), limit);
  alignas(16) std::uint32_t q[4];
  _mm_store_si128(reinterpret_cast<__m128i*>(q), _mm_cvttps_epi32(_mm_sqrt_ps(v)));
  std::uint32_t o = 0;
  for (unsigned k = 0; k < p.out_channels; ++k) o |= std::uint32_t{ShapeQ(p, k, q[k])} << (8 * k);
  PutBytes(o, cell.x, out, d, p.out_channels);
}

// Linear-light tables run to megabytes, so most pixels miss the cache: a block of
// pixels is located first, with the corners of each cell fetched ahead, and then
// interpolated, so that the misses of the block overlap. Every pixel of a block is
// read before any is written, as in-place conversion needs.
template <unsigned N>
void ShapedBlocksSse2(const FastPath& p, const std::uint8_t* src, const PixelLayout& in, std::uint8_t* dst,
                      const PixelLayout& out, std::size_t n) {
  constexpr std::size_t kBlock = 32;
  const __m128 limit = _mm_set1_ps(p.limit);
  ShapedCell cells[kBlock];
  for (std::size_t i = 0; i < n; i += kBlock) {
    const std::size_t m = n - i < kBlock ? n - i : kBlock;
    for (std::size_t j = 0; j < m; ++j) {
      const ShapedCell& cell = cells[j] = LocateShaped<N>(p, src + (i + j) * in.bytes, in);
      const float* corner = cell.c;
      for (unsigned t = 0; t < 4; ++t) {
        _mm_prefetch(reinterpret_cast<const char*>(corner), _MM_HINT_T0);
        if constexpr (N == 4) _mm_prefetch(reinterpret_cast<const char*>(corner + cell.k_step + 3), _MM_HINT_T0);
        if (t < 3) corner += cell.sx.step[t];
      }
    }
    for (std::size_t j = 0; j < m; ++j) ShapedPixelSse2<N>(p, cells[j], dst + (i + j) * out.bytes, out, limit);
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
  }
}

// The byte shuffle that turns eight dwords (channel k in byte k, the filler in byte 3)
// into the output layout, four pixels per 128-bit half.
__attribute__((target("avx2"))) __m256i OutputShuffle(const PixelLayout& out, unsigned channels) {
  alignas(16) std::int8_t m[16];
  std::memset(m, -128, sizeof m);  // zero the bytes past the packed pixels
  for (unsigned px = 0; px < 4; ++px) {
    for (unsigned k = 0; k < channels; ++k) m[px * out.bytes + out.at[k]] = static_cast<std::int8_t>(px * 4 + k);
    if (out.x >= 0) m[px * out.bytes + out.x] = static_cast<std::int8_t>(px * 4 + 3);
  }
  const __m128i h = _mm_load_si128(reinterpret_cast<const __m128i*>(m));
  return _mm256_broadcastsi128_si256(h);
}

__attribute__((target("avx2"))) void MatrixAvx2(const FastPath& p, const std::uint8_t* src, const PixelLayout& in,
                                                 std::uint8_t* dst, const PixelLayout& out, std::size_t n,
                                                 std::size_t& done) {
  const unsigned oc = p.out_channels;
  const __m256i lanes = _mm256_mullo_epi32(_mm256_setr_epi32(0, 1, 2, 3, 4, 5, 6, 7), _mm256_set1_epi32(in.bytes));
  __m256i at[3];
  for (int c = 0; c < 3; ++c) at[c] = _mm256_add_epi32(lanes, _mm256_set1_epi32(in.at[c]));
  const __m256i at_x = _mm256_add_epi32(lanes, _mm256_set1_epi32(in.x >= 0 ? in.x : 0));
  const __m256i byte = _mm256_set1_epi32(0xFF);
  const __m256 zero = _mm256_setzero_ps(), limit = _mm256_set1_ps(p.limit);
  const __m256i low8 = _mm256_set1_epi32(0xFF), half = _mm256_set1_epi32(1 << (kValueBits + 7));
  const __m256i one = _mm256_set1_epi32(256);
  const __m256i shuffle = OutputShuffle(out, oc);
  const float* lin = p.lin.data();
  const int* shaper = reinterpret_cast<const int*>(p.shaper.data());
  // A gather reads four bytes from each channel's offset: stop while whole pixels
  // remain past the last one read, so no read leaves the run.
  std::size_t i = 0;
  for (; i + 9 <= n; i += 8) {
    const int* s = reinterpret_cast<const int*>(src + i * in.bytes);
    __m256i v[3];
    for (int c = 0; c < 3; ++c) {
      v[c] = _mm256_slli_epi32(_mm256_and_si256(_mm256_i32gather_epi32(s, at[c], 1), byte), 2);
    }
    const __m256i x = in.x >= 0 ? _mm256_and_si256(_mm256_i32gather_epi32(s, at_x, 1), byte) : _mm256_setzero_si256();
    __m256i packed = _mm256_slli_epi32(x, 24);
    for (unsigned k = 0; k < oc; ++k) {
      const __m256 a = _mm256_i32gather_ps(lin + k, v[0], 4);
      const __m256 b = _mm256_i32gather_ps(lin + 256 * 4 + k, v[1], 4);
      const __m256 c = _mm256_i32gather_ps(lin + 512 * 4 + k, v[2], 4);
      __m256 sum = _mm256_add_ps(_mm256_add_ps(a, b), c);
      sum = _mm256_min_ps(_mm256_max_ps(sum, zero), limit);
      const __m256i q = _mm256_cvttps_epi32(_mm256_sqrt_ps(sum));
      const __m256i f = _mm256_and_si256(q, low8);
      // Entries i and i + 1 in one dword, weighted (256 - f, f) by a pairwise multiply.
      const __m256i t = _mm256_i32gather_epi32(shaper + 0, _mm256_add_epi32(_mm256_srli_epi32(q, 8),
                                                                            _mm256_set1_epi32(k * (kShaperSteps + 2))),
                                               2);
      const __m256i w = _mm256_or_si256(_mm256_sub_epi32(one, f), _mm256_slli_epi32(f, 16));
      const __m256i o = _mm256_srli_epi32(_mm256_add_epi32(_mm256_madd_epi16(t, w), half), kValueBits + 8);
      packed = _mm256_or_si256(packed, _mm256_slli_epi32(o, 8 * k));
    }
    const __m256i bytes = _mm256_shuffle_epi8(packed, shuffle);
    std::uint8_t* d = dst + i * out.bytes;
    const unsigned half_bytes = 4 * out.bytes;
    std::memcpy(d, &bytes, half_bytes);
    const __m128i hi = _mm256_extracti128_si256(bytes, 1);
    std::memcpy(d + half_bytes, &hi, half_bytes);
  }
  done = i;
}

}  // namespace

void RunSse2(const FastPath& p, const std::uint8_t* src, const PixelLayout& in, std::uint8_t* dst,
             const PixelLayout& out, std::size_t n) {
  RunPerPixel(p, src, in, dst, out, 0, n);
}

__attribute__((target("avx2"))) void RunAvx2(const FastPath& p, const std::uint8_t* src, const PixelLayout& in,
                                              std::uint8_t* dst, const PixelLayout& out, std::size_t n) {
  std::size_t done = 0;
  if (p.kind == Kind::Matrix) MatrixAvx2(p, src, in, dst, out, n, done);
  RunPerPixel(p, src, in, dst, out, done, n);
}

}  // namespace win32::icm::kernels::detail

#endif
