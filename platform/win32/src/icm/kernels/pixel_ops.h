// Per-pixel steps shared by every kernel: the vector kernels use them for the pixels
// at the end of a run, so each pixel gets the same bytes whichever kernel reads it.
#ifndef TINTWELL_WIN32_ICM_KERNELS_PIXEL_OPS_H
#define TINTWELL_WIN32_ICM_KERNELS_PIXEL_OPS_H

#include <cstdint>
#include <cstring>

#include "icm/kernels/fast_path.h"

namespace win32::icm::kernels::ops {

inline std::uint8_t FillerOf(const std::uint8_t* s, const PixelLayout& in) { return in.x >= 0 ? s[in.x] : 0; }

// Output table k read at the linear value v, clamped to kShaperFloor..limit.
inline std::uint8_t Shape(const FastPath& p, unsigned k, float v) {
  v = v > kShaperFloor ? v : kShaperFloor;
  v = v < p.limit ? v : p.limit;
  std::uint32_t bits;
  std::memcpy(&bits, &v, sizeof bits);
  return p.shaper[k * (kShaperSize + 1) + ((bits >> kShaperShift) - kShaperBase)];
}

inline void MatrixPixel(const FastPath& p, const std::uint8_t* s, const PixelLayout& in, std::uint8_t* d,
                        const PixelLayout& out) {
  const float* a = &p.lin[s[in.at[0]] * 4];
  const float* b = &p.lin[(256 + s[in.at[1]]) * 4];
  const float* c = &p.lin[(512 + s[in.at[2]]) * 4];
  const std::uint8_t x = FillerOf(s, in);
  std::uint8_t o[3];
  for (unsigned k = 0; k < p.out_channels; ++k) {
    o[k] = Shape(p, k, (a[k] + b[k]) + c[k]);
  }
  for (unsigned k = 0; k < p.out_channels; ++k) d[out.at[k]] = o[k];
  if (out.x >= 0) d[out.x] = x;
}

// The corners of the simplex holding a point and the weights of its steps: the axes
// sorted by weight, largest first (ties by axis order, so the ranks are a permutation).
template <unsigned N>
struct Simplex {
  std::int32_t step[N];  // node offset of each step along the sorted axes
  std::int32_t w[N];     // sorted weights
};

template <unsigned N>
inline Simplex<N> Sort(const std::int32_t* w, const std::int32_t* s) {
  Simplex<N> r;
  for (unsigned i = 0; i < N; ++i) {
    unsigned rank = 0;
    for (unsigned j = 0; j < N; ++j) rank += j < i ? (w[j] >= w[i]) : (w[j] > w[i]);
    r.w[rank] = w[i];
    r.step[rank] = s[i];
  }
  return r;
}

// The grid cell that holds a pixel: the offset of its lower corner into the nodes, and
// the simplex (weights in falling order, with the steps between its corners).
template <unsigned N>
inline Simplex<N> Locate(const FastPath& p, const std::uint8_t* s, const PixelLayout& in, std::int32_t& base) {
  std::int32_t w[N], st[N];
  base = 0;
  for (unsigned a = 0; a < N; ++a) {
    const std::uint8_t v = s[in.at[a]];
    base += p.offset[a * 256 + v];
    w[a] = p.weight[a * 256 + v];
    st[a] = p.stride[a];
  }
  return Sort<N>(w, st);
}

template <unsigned N>
inline void ClutPixel(const FastPath& p, const std::uint8_t* s, const PixelLayout& in, std::uint8_t* d,
                      const PixelLayout& out) {
  std::int32_t base;
  const Simplex<N> sx = Locate<N>(p, s, in, base);
  const std::uint8_t x = FillerOf(s, in);
  const std::int16_t* c[N + 1];
  c[0] = &p.nodes[base];
  for (unsigned i = 0; i < N; ++i) c[i + 1] = c[i] + sx.step[i];
  std::uint8_t o[4];
  for (unsigned k = 0; k < p.out_channels; ++k) {
    std::int32_t sum = c[0][k] * (1 << kWeightBits);
    for (unsigned i = 0; i < N; ++i) sum += (c[i + 1][k] - c[i][k]) * sx.w[i];
    o[k] = static_cast<std::uint8_t>((sum + (1 << (kWeightBits + kValueBits - 1))) >> (kWeightBits + kValueBits));
  }
  for (unsigned k = 0; k < p.out_channels; ++k) d[out.at[k]] = o[k];
  if (out.x >= 0) d[out.x] = x;
}

// Tetrahedral interpolation of channel k of float nodes from corner c0 along the
// sorted steps, with weights scaled to 0..1; every kernel adds in this order.
inline float Tetra(const float* c0, const Simplex<3>& sx, const float* w, unsigned k) {
  const float* c1 = c0 + sx.step[0];
  const float* c2 = c1 + sx.step[1];
  const float* c3 = c2 + sx.step[2];
  return ((c0[k] + (c1[k] - c0[k]) * w[0]) + (c2[k] - c1[k]) * w[1]) + (c3[k] - c2[k]) * w[2];
}

constexpr float kUnitWeight = 1.0f / (1 << kWeightBits);

// A sampled chain in linear light: tetrahedral in the first three channels and, for
// CMYK, linear between the two K planes; then clamped and shaped.
template <unsigned N>
inline void ShapedClutPixel(const FastPath& p, const std::uint8_t* s, const PixelLayout& in, std::uint8_t* d,
                            const PixelLayout& out) {
  std::int32_t base;
  const Simplex<3> sx = Locate<3>(p, s, in, base);
  const float w[3] = {sx.w[0] * kUnitWeight, sx.w[1] * kUnitWeight, sx.w[2] * kUnitWeight};
  const std::uint8_t x = FillerOf(s, in);
  std::int32_t k_step = 0;
  float k_weight = 0.0f;
  if constexpr (N == 4) {
    const std::uint8_t k_level = s[in.at[3]];
    base += p.offset[3 * 256 + k_level];
    k_step = p.stride[3];
    k_weight = p.weight[3 * 256 + k_level] * kUnitWeight;
  }
  const float* c = &p.linear_nodes[base];
  std::uint8_t o[3];
  for (unsigned k = 0; k < p.out_channels; ++k) {
    float v = Tetra(c, sx, w, k);
    if constexpr (N == 4) v = v + (Tetra(c + k_step, sx, w, k) - v) * k_weight;
    o[k] = Shape(p, k, v);
  }
  for (unsigned k = 0; k < p.out_channels; ++k) d[out.at[k]] = o[k];
  if (out.x >= 0) d[out.x] = x;
}

// Staged, stage 1: the position along each of the output table's input curves (0 to
// 255 steps of 256), read tetrahedrally from the RGB grid and clipped to the curves.
inline void CurvePositions(const FastPath& p, const std::uint8_t* s, const PixelLayout& in, std::int32_t* t) {
  std::int32_t base;
  const Simplex<3> sx = Locate<3>(p, s, in, base);
  const std::int16_t* c0 = &p.nodes[base];
  const std::int16_t* c1 = c0 + sx.step[0];
  const std::int16_t* c2 = c1 + sx.step[1];
  const std::int16_t* c3 = c2 + sx.step[2];
  constexpr std::int32_t kMid = 255 * 128;
  for (unsigned k = 0; k < 3; ++k) {
    const std::int32_t sum = c0[k] * (1 << kWeightBits) + (c1[k] - c0[k]) * sx.w[0] + (c2[k] - c1[k]) * sx.w[1] +
                             (c3[k] - c2[k]) * sx.w[2];
    const std::int32_t v = (sum + (1 << (kWeightBits - 2))) >> (kWeightBits - 1);  // nodes are halved
    t[k] = (v < -kMid ? -kMid : v > kMid ? kMid : v) + kMid;
  }
}

// Staged, stage 2: input curve k at t, as a position in the table's grid: the cell's
// node offset along the axis and the weight of its upper node.
inline void ClutAxis(const FastPath& p, unsigned k, std::int32_t t, std::int32_t& offset, std::int32_t& w) {
  const std::int32_t* c = &p.in_curve[k * 257 + (t >> 8)];
  const std::int32_t pos = c[0] + (((c[1] - c[0]) * (t & 255) + 128) >> 8);
  w = pos & ((1 << kClutFracBits) - 1);
  offset = (pos >> kClutFracBits) * p.clut_stride[k];
}

inline std::int32_t Lerp(std::int32_t lo, std::int32_t hi, std::int32_t w) {
  return (lo * (1 << kWeightBits) + (hi - lo) * w + (1 << (kWeightBits - 1))) >> kWeightBits;
}

// Output curve k at v (output levels with kValueBits of fraction, 0..255 << kValueBits),
// as a byte, from a table of the curve read linearly between its points.
inline std::uint8_t OutLevel(const FastPath& p, unsigned k, std::int32_t v) {
  return p.out_level[k * ((255 << kValueBits) + 1) + v];
}

inline void StagedPixel(const FastPath& p, const std::uint8_t* s, const PixelLayout& in, std::uint8_t* d,
                        const PixelLayout& out) {
  std::int32_t t[3], at[3], w[3];
  CurvePositions(p, s, in, t);
  const std::uint8_t x = FillerOf(s, in);
  for (unsigned a = 0; a < 3; ++a) ClutAxis(p, a, t[a], at[a], w[a]);
  // Trilinear, as Little CMS reads these tables: along x, then y, then z.
  const std::int16_t* n = &p.clut[at[0] + at[1] + at[2]];
  const std::int32_t sx = p.clut_stride[0], sy = p.clut_stride[1], sz = p.clut_stride[2];
  std::uint8_t o[4];
  for (unsigned k = 0; k < p.out_channels; ++k) {
    const std::int16_t* c = n + k;
    const std::int32_t x00 = Lerp(c[0], c[sx], w[0]), x01 = Lerp(c[sz], c[sx + sz], w[0]);
    const std::int32_t x10 = Lerp(c[sy], c[sx + sy], w[0]), x11 = Lerp(c[sy + sz], c[sx + sy + sz], w[0]);
    const std::int32_t v = Lerp(Lerp(x00, x10, w[1]), Lerp(x01, x11, w[1]), w[2]);
    o[k] = OutLevel(p, k, v);
  }
  for (unsigned k = 0; k < p.out_channels; ++k) d[out.at[k]] = o[k];
  if (out.x >= 0) d[out.x] = x;
}

inline void Table1Pixel(const FastPath& p, const std::uint8_t* s, const PixelLayout& in, std::uint8_t* d,
                        const PixelLayout& out) {
  const std::uint8_t* t = &p.table[s[in.at[0]] * p.out_channels];
  const std::uint8_t x = FillerOf(s, in);
  for (unsigned k = 0; k < p.out_channels; ++k) d[out.at[k]] = t[k];
  if (out.x >= 0) d[out.x] = x;
}

}  // namespace win32::icm::kernels::ops

#endif
