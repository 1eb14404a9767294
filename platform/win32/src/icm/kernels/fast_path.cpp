// Building a fast path from a chain, and choosing the kernel that runs it.
#include "icm/kernels/fast_path.h"

#include <algorithm>
#include <atomic>
#include <chrono>
#include <cmath>
#include <cstring>
#include <system_error>
#include <thread>

#include "icm/color_codec.h"
#include "icm/transform.h"

namespace win32::icm::kernels {

namespace {

unsigned BitmapChannels(cmsColorSpaceSignature space) {
  switch (space) {
    case cmsSigGrayData: return 1;
    case cmsSigRgbData: return 3;
    case cmsSigCmykData:
    case cmsSigMCH4Data: return 4;
    default: return 0;
  }
}

std::int16_t Fixed(double unit) {
  return static_cast<std::int16_t>(std::lround(std::clamp(unit, 0.0, 1.0) * (255 << kValueBits)));
}

// Runs `count` points of `in_n` doubles through the exact transform; a large grid is
// shared with a second thread (Little CMS transforms may be used by several at once).
std::vector<double> Sample(cmsHTRANSFORM exact, const std::vector<double>& in, size_t count, unsigned out_n) {
  std::vector<double> out(count * out_n);
  const size_t in_n = in.size() / count;
  const auto part = [&](size_t from, size_t to) {
    if (from < to) cmsDoTransform(exact, &in[from * in_n], &out[from * out_n], static_cast<cmsUInt32Number>(to - from));
  };
  const size_t half = count >= (size_t{1} << 14) ? count / 2 : count;
  std::thread other;
  if (half < count) {
    try {
      other = std::thread(part, half, count);
    } catch (const std::system_error&) {
      part(half, count);
    }
  }
  part(0, half);
  if (other.joinable()) other.join();
  return out;
}

void BuildTable1(cmsHTRANSFORM exact, FastPath& fp) {
  std::vector<double> in(256);
  for (int v = 0; v < 256; ++v) in[v] = v / 255.0;
  const std::vector<double> out = Sample(exact, in, 256, fp.out_channels);
  fp.table.resize(out.size());
  for (size_t i = 0; i < out.size(); ++i) {
    fp.table[i] = static_cast<std::uint8_t>(std::lround(std::clamp(out[i], 0.0, 1.0) * 255));
  }
}

const cmsTagSignature kRgbTrc[3] = {cmsSigRedTRCTag, cmsSigGreenTRCTag, cmsSigBlueTRCTag};

bool Increasing(const std::vector<double>& curves, unsigned n) {
  for (unsigned a = 0; a < n; ++a) {
    const double* c = &curves[a * 256];
    if (!(c[255] > c[0])) return false;
    for (int v = 1; v < 256; ++v) {
      if (c[v] < c[v - 1]) return false;
    }
  }
  return true;
}

// The input curves of the first profile, sampled at the 256 levels of each channel,
// when they are non-decreasing and not flat: those that begin its device-to-PCS table,
// or the curves of an RGB matrix-shaper without one. A grid placed evenly along these
// curves puts its nodes where the profile's own table has them, or evenly in linear
// light, so the chain bends less inside each cell.
bool InputCurves(const Chain& chain, unsigned n, std::vector<double>& curves) {
  cmsHPROFILE p = chain.profiles().front();
  if (cmsIsTag(p, cmsSigDToB0Tag)) return false;  // float tables take precedence in Little CMS
  const cmsUInt32Number intent = chain.intents().front();
  cmsTagSignature tag = static_cast<cmsTagSignature>(cmsSigAToB0Tag + (intent == INTENT_ABSOLUTE_COLORIMETRIC ? 1 : intent));
  if (!cmsIsTag(p, tag)) tag = cmsSigAToB0Tag;
  curves.assign(n * 256, 0.0);
  if (!cmsIsTag(p, tag)) {
    if (n != 3 || !cmsIsMatrixShaper(p)) return false;
    for (unsigned a = 0; a < 3; ++a) {
      const auto* t = static_cast<const cmsToneCurve*>(cmsReadTag(p, kRgbTrc[a]));
      if (!t) return false;
      for (int v = 0; v < 256; ++v) curves[a * 256 + v] = cmsEvalToneCurveFloat(t, static_cast<cmsFloat32Number>(v / 255.0));
    }
    return Increasing(curves, n);
  }
  const auto* table = static_cast<const cmsPipeline*>(cmsReadTag(p, tag));
  if (!table) return false;
  cmsStage* first = cmsPipelineGetPtrToFirstStage(table);
  if (!first || cmsStageType(first) != cmsSigCurveSetElemType || cmsStageInputChannels(first) != n) return false;
  cmsPipeline* alone = cmsPipelineAlloc(chain.context(), n, n);
  cmsStage* copy = alone ? cmsStageDup(first) : nullptr;
  if (!copy || !cmsPipelineInsertStage(alone, cmsAT_END, copy)) {
    if (copy) cmsStageFree(copy);
    if (alone) cmsPipelineFree(alone);
    return false;
  }
  for (int v = 0; v < 256; ++v) {
    cmsFloat32Number in[cmsMAXCHANNELS], out[cmsMAXCHANNELS];
    for (unsigned a = 0; a < n; ++a) in[a] = static_cast<cmsFloat32Number>(v / 255.0);
    cmsPipelineEvalFloat(in, out, alone);
    for (unsigned a = 0; a < n; ++a) curves[a * 256 + v] = out[a];
  }
  cmsPipelineFree(alone);
  return Increasing(curves, n);
}

// Places the grid along each axis: node k where the axis' position reaches k, with
// positions in grid units for each input level (evenly spaced levels, or along the
// input curves), and the input value of each node for sampling.
void PlaceNodes(const std::vector<double>* curves, const std::vector<unsigned>& grids, std::vector<double>& level_pos,
                std::vector<double>& node_value) {
  const size_t n = grids.size();
  level_pos.assign(n * 256, 0.0);
  node_value.assign(n * 256, 0.0);
  for (unsigned a = 0; a < n; ++a) {
    const unsigned grid = grids[a];
    double* pos = &level_pos[a * 256];
    for (int v = 0; v < 256; ++v) {
      if (!curves) {
        pos[v] = v * static_cast<double>(grid - 1) / 255.0;
      } else {
        const double* c = &(*curves)[a * 256];
        pos[v] = (c[v] - c[0]) / (c[255] - c[0]) * (grid - 1);
      }
    }
    // The input value whose position is k, between the two levels around it.
    int v = 0;
    for (unsigned k = 0; k < grid; ++k) {
      while (v < 254 && pos[v + 1] < k) ++v;
      const double span = pos[v + 1] - pos[v];
      const double t = span > 0 ? std::clamp((k - pos[v]) / span, 0.0, 1.0) : 0.0;
      node_value[a * 256 + k] = (v + t) / 255.0;
    }
  }
}

// Lays out a grid of `grids[a]` nodes on axis a (axis 0 varies slowest) for `fp`: the
// node strides, each input level's node offset and weight, and the input values to
// sample, `in_channels` doubles a node. Nodes follow the input curves when asked and
// the first profile has them.
std::vector<double> LayGrid(const Chain& chain, const std::vector<unsigned>& grids, bool follow_curves, FastPath& fp) {
  const unsigned n = fp.in_channels, oc = fp.out_channels;
  std::vector<double> curves, level_pos, node_value;
  const bool along_curves = follow_curves && InputCurves(chain, n, curves);
  PlaceNodes(along_curves ? &curves : nullptr, grids, level_pos, node_value);
  size_t count = 1;
  for (unsigned g : grids) count *= g;
  std::vector<double> in(count * n);
  for (size_t i = 0; i < count; ++i) {
    size_t rest = i;
    for (unsigned a = n; a-- > 0;) {
      in[i * n + a] = node_value[a * 256 + rest % grids[a]];
      rest /= grids[a];
    }
  }
  fp.grid = grids.front();
  fp.stride.resize(n);
  std::int32_t s = static_cast<std::int32_t>(oc);
  for (unsigned a = n; a-- > 0;) {
    fp.stride[a] = s;
    s *= static_cast<std::int32_t>(grids[a]);
  }
  fp.offset.resize(n * 256);
  fp.weight.resize(n * 256);
  for (unsigned a = 0; a < n; ++a) {
    const int grid = static_cast<int>(grids[a]);
    for (int v = 0; v < 256; ++v) {
      const double pos = std::clamp(level_pos[a * 256 + v], 0.0, grid - 1.0);
      int cell = static_cast<int>(std::floor(pos));
      int w = static_cast<int>(std::lround((pos - cell) * (1 << kWeightBits)));
      if (w == 1 << kWeightBits) ++cell, w = 0;
      // The far end of an axis sits at the far corner of the last cell, so a node's
      // upper neighbour is always inside the grid.
      if (cell >= grid - 1) cell = grid - 2, w = 1 << kWeightBits;
      fp.weight[a * 256 + v] = static_cast<std::int16_t>(w);
      fp.offset[a * 256 + v] = cell * fp.stride[a];
    }
  }
  return in;
}

void BuildClut(const Chain& chain, cmsHTRANSFORM exact, FastPath& fp) {
  const unsigned n = fp.in_channels, oc = fp.out_channels;
  const std::vector<double> in = LayGrid(chain, std::vector<unsigned>(n, n == 3 ? kGrid3 : kGrid4), n == 4, fp);
  const size_t count = in.size() / n;
  const std::vector<double> out = Sample(exact, in, count, oc);
  fp.nodes.assign(count * oc + 4, 0);  // room to read the last node as four lanes
  for (size_t i = 0; i < count * oc; ++i) fp.nodes[i] = Fixed(out[i]);
}

// A copy of a matrix-shaper profile whose curves are the identity, so that a chain of
// such copies shows the linear map Little CMS puts between the two ends (the
// colorant matrices and the join the intents ask for).
cmsHPROFILE Linearised(cmsContext ctx, cmsHPROFILE p, bool gray) {
  cmsUInt32Number size = 0;
  if (!cmsSaveProfileToMem(p, nullptr, &size)) return nullptr;
  std::vector<std::uint8_t> bytes(size);
  if (!cmsSaveProfileToMem(p, bytes.data(), &size)) return nullptr;
  cmsHPROFILE copy = cmsOpenProfileFromMemTHR(ctx, bytes.data(), size);
  cmsToneCurve* one = cmsBuildGamma(ctx, 1.0);
  bool ok = copy && one;
  if (ok && gray) ok = cmsWriteTag(copy, cmsSigGrayTRCTag, one);
  if (ok && !gray) {
    ok = cmsWriteTag(copy, cmsSigRedTRCTag, one) && cmsWriteTag(copy, cmsSigGreenTRCTag, one) &&
         cmsWriteTag(copy, cmsSigBlueTRCTag, one);
  }
  if (one) cmsFreeToneCurve(one);
  if (!ok && copy) cmsCloseProfile(copy), copy = nullptr;
  return copy;
}

struct Curves {
  cmsToneCurve* c[3] = {};
  ~Curves() {
    for (cmsToneCurve* t : c) {
      if (t) cmsFreeToneCurve(t);
    }
  }
};

// The reverse of a matrix-shaper output profile's curves, as Little CMS makes them.
bool ReverseOutputCurves(cmsHPROFILE dst, unsigned oc, Curves& out) {
  for (unsigned k = 0; k < oc; ++k) {
    const auto* t = static_cast<const cmsToneCurve*>(cmsReadTag(dst, oc == 1 ? cmsSigGrayTRCTag : kRgbTrc[k]));
    if (!t || !(out.c[k] = cmsReverseToneCurve(t))) return false;
  }
  return true;
}

// The linear value whose float bits, shifted, are index i of the output tables.
double ShaperStep(std::uint32_t i) {
  const std::uint32_t bits = (static_cast<std::uint32_t>(kShaperBase) + i) << kShaperShift;
  float f;
  std::memcpy(&f, &bits, sizeof f);
  return f;
}

// The output tables: the reversed curves at the middle of each step.
void FillShaper(const Curves& out_curves, unsigned oc, FastPath& fp) {
  fp.limit = 1.0f;
  fp.shaper.assign(oc * (kShaperSize + 1) + 3, 0);  // the padding lets a gather read four bytes
  for (unsigned k = 0; k < oc; ++k) {
    for (unsigned i = 0; i <= kShaperSize; ++i) {
      const double l = i == kShaperSize ? 1.0 : (ShaperStep(i) + ShaperStep(i + 1)) / 2;
      const double y = cmsEvalToneCurveFloat(out_curves.c[k], static_cast<cmsFloat32Number>(l));
      fp.shaper[k * (kShaperSize + 1) + i] = static_cast<std::uint8_t>(std::lround(std::clamp(y, 0.0, 1.0) * 255));
    }
  }
}

cmsHTRANSFORM DoubleTransform(cmsContext ctx, std::vector<cmsHPROFILE> profiles, std::vector<cmsUInt32Number> intents,
                              unsigned in_n, unsigned out_n) {
  std::vector<cmsBool> bpc(profiles.size(), FALSE);
  std::vector<cmsFloat64Number> adaptation(profiles.size(), 1.0);
  return cmsCreateExtendedTransform(ctx, static_cast<cmsUInt32Number>(profiles.size()), profiles.data(), bpc.data(),
                                    intents.data(), adaptation.data(), nullptr, 0,
                                    FLOAT_SH(1) | CHANNELS_SH(in_n) | BYTES_SH(0),
                                    FLOAT_SH(1) | CHANNELS_SH(out_n) | BYTES_SH(0), cmsFLAGS_NOOPTIMIZE);
}

// A sampled chain that ends in a matrix-shaper RGB or gray profile, sampled in linear
// light: the chain with that profile's curves made the identity gives the linear
// values, unclipped, and the output tables apply the curves after interpolation. It
// is taken only when the model H(clamp(linear)) reproduces the exact transform at the
// nodes checked (Little CMS prefers a profile's tables to its curves, for one).
bool BuildShapedClut(const Chain& chain, cmsHTRANSFORM exact, FastPath& fp) {
  const unsigned n = fp.in_channels, oc = fp.out_channels;
  const ChainStep& last = chain.steps().back();
  cmsHPROFILE dst = chain.profiles().back();
  if (chain.profiles().size() < 2 || last.to_pcs || (oc != 3 && oc != 1)) return false;
  if (last.profile_class == cmsSigLinkClass || last.profile_class == cmsSigAbstractClass) return false;
  Curves out_curves;
  if (!cmsIsMatrixShaper(dst) || !ReverseOutputCurves(dst, oc, out_curves)) return false;
  std::vector<cmsHPROFILE> profiles = chain.profiles();
  profiles.back() = Linearised(chain.context(), dst, oc == 1);
  if (!profiles.back()) return false;
  cmsHTRANSFORM linear = DoubleTransform(chain.context(), profiles, chain.intents(), n, oc);
  cmsCloseProfile(profiles.back());
  if (!linear) return false;

  const std::vector<unsigned> grids =
      n == 3 ? std::vector<unsigned>(3, kShapedGrid3)
             : std::vector<unsigned>{kShapedGridCmy, kShapedGridCmy, kShapedGridCmy, kShapedGridK};
  const std::vector<double> in = LayGrid(chain, grids, true, fp);
  const size_t count = in.size() / n;
  const std::vector<double> lin = Sample(linear, in, count, oc);
  cmsDeleteTransform(linear);

  // The check: every 61st node (a prime stride, so every axis position is visited).
  std::vector<double> probe_in;
  for (size_t i = 0; i < count; i += 61) probe_in.insert(probe_in.end(), &in[i * n], &in[i * n] + n);
  const size_t probes = probe_in.size() / n;
  const std::vector<double> truth = Sample(exact, probe_in, probes, oc);
  for (size_t p = 0; p < probes; ++p) {
    for (unsigned k = 0; k < oc; ++k) {
      const double l = std::clamp(lin[p * 61 * oc + k], 0.0, 1.0);
      const double model = cmsEvalToneCurveFloat(out_curves.c[k], static_cast<cmsFloat32Number>(l));
      if (std::fabs(std::clamp(model, 0.0, 1.0) - std::clamp(truth[p * oc + k], 0.0, 1.0)) > 1e-4) return false;
    }
  }

  fp.kind = n == 3 ? Kind::ShapedClut3 : Kind::ShapedClut4;
  fp.linear_nodes.assign(count * oc + 8, 0.0f);  // room to read the last node as eight lanes
  for (size_t i = 0; i < count * oc; ++i) {
    // Far outside the gamut the value only needs to stay outside it.
    fp.linear_nodes[i] = static_cast<float>(std::clamp(lin[i], -4.0, 4.0));
  }
  FillShaper(out_curves, oc, fp);
  return true;
}

// The matrix-shaper model of a two-profile chain: out_k = H_k((A * lin(in) + b)_k).
// It is taken only when it reproduces the exact transform at every sample point.
bool BuildMatrix(const Chain& chain, cmsHTRANSFORM exact, FastPath& fp) {
  const auto& profiles = chain.profiles();
  const auto& steps = chain.steps();
  if (profiles.size() != 2 || !steps[0].to_pcs || steps[1].to_pcs) return false;
  const unsigned oc = fp.out_channels;
  if (fp.in_channels != 3 || (oc != 3 && oc != 1)) return false;
  for (const auto& s : steps) {
    if (s.profile_class == cmsSigLinkClass || s.profile_class == cmsSigAbstractClass) return false;
  }
  cmsHPROFILE src = profiles[0], dst = profiles[1];
  if (!cmsIsMatrixShaper(src) || !cmsIsMatrixShaper(dst)) return false;
  const cmsToneCurve* in_curves[3];
  for (int c = 0; c < 3; ++c) {
    in_curves[c] = static_cast<const cmsToneCurve*>(cmsReadTag(src, kRgbTrc[c]));
    if (!in_curves[c]) return false;
  }
  Curves out_curves;
  if (!ReverseOutputCurves(dst, oc, out_curves)) return false;

  // The linear map between the ends, measured through identity-curve copies.
  cmsContext ctx = chain.context();
  cmsHPROFILE lin[2] = {Linearised(ctx, src, false), Linearised(ctx, dst, oc == 1)};
  cmsHTRANSFORM middle = lin[0] && lin[1] ? DoubleTransform(ctx, {lin[0], lin[1]}, chain.intents(), 3, oc) : nullptr;
  for (cmsHPROFILE p : lin) {
    if (p) cmsCloseProfile(p);
  }
  if (!middle) return false;
  const double probes[][3] = {{0, 0, 0}, {1, 0, 0}, {0, 1, 0}, {0, 0, 1}, {0.25, 0.5, 0.75}, {1, 1, 1}, {0.9, 0.1, 0.4}};
  double flat[std::size(probes) * 3] = {};  // oc values a probe, packed
  cmsDoTransform(middle, probes, flat, static_cast<cmsUInt32Number>(std::size(probes)));
  const auto at = [&](size_t p, unsigned k) { return flat[p * oc + k]; };
  cmsDeleteTransform(middle);
  double a[3][3], b[3] = {};
  for (unsigned k = 0; k < oc; ++k) {
    b[k] = at(0, k);
    for (int c = 0; c < 3; ++c) a[k][c] = at(1 + c, k) - b[k];
  }
  const auto affine = [&](const double* x, unsigned k) { return b[k] + a[k][0] * x[0] + a[k][1] * x[1] + a[k][2] * x[2]; };
  for (size_t p = 4; p < std::size(probes); ++p) {
    for (unsigned k = 0; k < oc; ++k) {
      if (std::fabs(affine(probes[p], k) - at(p, k)) > 1e-5) return false;  // not linear: not a matrix-shaper
    }
  }

  // The model, level by level, against the exact transform on a grid of inputs.
  double linear[3][256];
  for (int c = 0; c < 3; ++c) {
    for (int v = 0; v < 256; ++v) linear[c][v] = cmsEvalToneCurveFloat(in_curves[c], static_cast<cmsFloat32Number>(v / 255.0));
  }
  const auto model = [&](const int* level, unsigned k) {
    const double x[3] = {linear[0][level[0]], linear[1][level[1]], linear[2][level[2]]};
    const double v = std::clamp(affine(x, k), 0.0, 1.0);
    return std::clamp(static_cast<double>(cmsEvalToneCurveFloat(out_curves.c[k], static_cast<cmsFloat32Number>(v))),
                      0.0, 1.0);
  };
  constexpr int kProbe = 9;
  std::vector<double> grid_in;
  std::vector<int> grid_levels;
  for (int i = 0; i < kProbe * kProbe * kProbe; ++i) {
    const int level[3] = {(i / (kProbe * kProbe)) * 255 / (kProbe - 1), (i / kProbe % kProbe) * 255 / (kProbe - 1),
                          (i % kProbe) * 255 / (kProbe - 1)};
    for (int c = 0; c < 3; ++c) grid_in.push_back(level[c] / 255.0), grid_levels.push_back(level[c]);
  }
  const size_t count = grid_in.size() / 3;
  const std::vector<double> truth = Sample(exact, grid_in, count, oc);
  for (size_t i = 0; i < count; ++i) {
    for (unsigned k = 0; k < oc; ++k) {
      if (std::fabs(model(&grid_levels[i * 3], k) - std::clamp(truth[i * oc + k], 0.0, 1.0)) > 1e-4) return false;
    }
  }

  fp.kind = Kind::Matrix;
  fp.lin.assign(3 * 256 * 4, 0.0f);
  for (int c = 0; c < 3; ++c) {
    for (int v = 0; v < 256; ++v) {
      for (unsigned k = 0; k < oc; ++k) {
        fp.lin[(c * 256 + v) * 4 + k] = static_cast<float>(a[k][c] * linear[c][v] + (c == 0 ? b[k] : 0.0));
      }
    }
  }
  FillShaper(out_curves, oc, fp);
  return true;
}

std::atomic<int> isa_cap{static_cast<int>(Isa::Avx2)};

Isa Detect() {
#ifdef TINTWELL_KERNELS_X86
  __builtin_cpu_init();
  if (__builtin_cpu_supports("avx2")) return Isa::Avx2;
  if (__builtin_cpu_supports("sse2")) return Isa::Sse2;
#endif
  return Isa::Scalar;
}

}  // namespace

std::unique_ptr<FastPath> Build(const Chain& chain, cmsHTRANSFORM exact) {
  if (chain.named() || !exact) return nullptr;
  const auto start = std::chrono::steady_clock::now();
  auto fp = std::make_unique<FastPath>();
  fp->in_channels = BitmapChannels(chain.input());
  fp->out_channels = BitmapChannels(chain.output());
  if (!fp->in_channels || !fp->out_channels) return nullptr;
  if (fp->in_channels == 1) {
    fp->kind = Kind::Table1;
    BuildTable1(exact, *fp);
  } else if (!BuildMatrix(chain, exact, *fp) && !BuildShapedClut(chain, exact, *fp) &&
             !(fp->in_channels == 3 && detail::BuildStaged(chain, exact, *fp))) {
    fp->kind = fp->in_channels == 3 ? Kind::Clut3 : Kind::Clut4;
    BuildClut(chain, exact, *fp);
  }
  fp->build_ms = std::chrono::duration<double, std::milli>(std::chrono::steady_clock::now() - start).count();
  return fp;
}

bool IsaAvailable(Isa isa) { return static_cast<int>(isa) <= static_cast<int>(Detect()); }

Isa ActiveIsa() {
  static const Isa best = Detect();
  return static_cast<Isa>(std::min(static_cast<int>(best), isa_cap.load(std::memory_order_relaxed)));
}

void ForceIsa(Isa cap) { isa_cap = static_cast<int>(cap); }

void Run(const FastPath& path, const std::uint8_t* src, const PixelLayout& in, std::uint8_t* dst,
         const PixelLayout& out, std::size_t n) {
  switch (ActiveIsa()) {
#ifdef TINTWELL_KERNELS_X86
    case Isa::Avx2: return detail::RunAvx2(path, src, in, dst, out, n);
    case Isa::Sse2: return detail::RunSse2(path, src, in, dst, out, n);
#endif
    default: return detail::RunScalar(path, src, in, dst, out, n);
  }
}

}  // namespace win32::icm::kernels
