// Building a staged fast path: RGB through a chain that ends in an output profile whose
// PCS-to-device table is [input curves, Lab-indexed CLUT, output curves]. The chain up
// to the PCS is smooth enough to sample on an RGB grid; the table is kept as it is,
// since Little CMS reads it cell by cell and no sampled grid follows its kinks.
#include <lcms2.h>
#include <lcms2_plugin.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdint>
#include <vector>

#include "icm/kernels/fast_path.h"
#include "icm/transform.h"

namespace win32::icm::kernels::detail {

namespace {

// Points per axis of the RGB grid. Where the first profile is a matrix-shaper the nodes
// are spaced evenly in the cube root of its linear light, in which L*a*b* bends least.
constexpr unsigned kStagedGrid = 33;
// A curve step is 256 units of the stage-1 value, so 255 steps span 0..kCurveTop.
constexpr std::int32_t kCurveTop = 255 * 256;
constexpr std::int32_t kCurveMid = kCurveTop / 2;
// The largest difference, as a share of full scale, between the composed model and the
// chain's exact transform on the probe inputs (a quarter of an output level).
constexpr double kAgreement = 0.25 / 255;
constexpr unsigned kProbes = 4096;

struct Table {
  std::array<const cmsToneCurve*, 3> in{};
  std::array<const cmsToneCurve*, 4> out{};
  const _cmsStageCLutData* clut = nullptr;
  unsigned size[3] = {};
  double pcs_scale = 1.0;  // 16-bit Lab tables read v2-encoded PCS values
};

std::uint32_t BigEndian(const std::uint8_t* b) {
  return (std::uint32_t{b[0]} << 24) | (std::uint32_t{b[1]} << 16) | (std::uint32_t{b[2]} << 8) | b[3];
}

bool Tabulated256(const cmsToneCurve* c) {
  return c && cmsGetToneCurveEstimatedTableEntries(c) == 256 && cmsGetToneCurveEstimatedTable(c);
}

// The PCS-to-device table Little CMS would use for the last profile, when it has the
// three-stage form this path reproduces.
bool ReadTable(cmsHPROFILE p, cmsUInt32Number intent, unsigned oc, Table& t) {
  static const cmsTagSignature kLut[4] = {cmsSigBToA0Tag, cmsSigBToA1Tag, cmsSigBToA2Tag, cmsSigBToA1Tag};
  static const cmsTagSignature kFloat[4] = {cmsSigBToD0Tag, cmsSigBToD1Tag, cmsSigBToD2Tag, cmsSigBToD1Tag};
  if (intent > 3 || cmsIsTag(p, kFloat[intent]) || cmsGetPCS(p) != cmsSigLabData) return false;
  cmsTagSignature tag = kLut[intent];
  if (!cmsIsTag(p, tag)) tag = cmsSigBToA0Tag;
  const auto* lut = static_cast<const cmsPipeline*>(cmsReadTag(p, tag));
  if (!lut) return false;
  // The tag's type: a 16-bit Lab table gets a v4-to-v2 scaling in front.
  const cmsUInt32Number size = cmsReadRawTag(p, tag, nullptr, 0);
  if (size < 4) return false;
  std::vector<std::uint8_t> raw(size);
  if (cmsReadRawTag(p, tag, raw.data(), size) != size) return false;
  const std::uint32_t type = BigEndian(raw.data());
  if (type == cmsSigLut16Type) {
    t.pcs_scale = 65280.0 / 65535.0;
  } else if (type != cmsSigLut8Type) {
    return false;
  }
  cmsStage* s[3] = {cmsPipelineGetPtrToFirstStage(lut), nullptr, nullptr};
  if (!s[0] || !(s[1] = cmsStageNext(s[0])) || !(s[2] = cmsStageNext(s[1])) || cmsStageNext(s[2])) return false;
  if (cmsStageType(s[0]) != cmsSigCurveSetElemType || cmsStageType(s[1]) != cmsSigCLutElemType ||
      cmsStageType(s[2]) != cmsSigCurveSetElemType)
    return false;
  if (cmsStageInputChannels(s[1]) != 3 || cmsStageOutputChannels(s[1]) != oc) return false;
  const auto* in = static_cast<const _cmsStageToneCurvesData*>(cmsStageData(s[0]));
  const auto* out = static_cast<const _cmsStageToneCurvesData*>(cmsStageData(s[2]));
  t.clut = static_cast<const _cmsStageCLutData*>(cmsStageData(s[1]));
  if (!in || in->nCurves != 3 || !out || out->nCurves != oc || !t.clut || t.clut->HasFloatValues || !t.clut->Tab.T ||
      !t.clut->Params)
    return false;
  for (unsigned a = 0; a < 3; ++a) {
    t.in[a] = in->TheCurves[a];
    t.size[a] = t.clut->Params->nSamples[a];
    if (!Tabulated256(t.in[a]) || t.size[a] < 2) return false;
  }
  for (unsigned k = 0; k < oc; ++k) {
    t.out[k] = out->TheCurves[k];
    if (!Tabulated256(t.out[k])) return false;
  }
  return true;
}

// Per axis, the grid's shape: the cube root of the matrix-shaper input's linear light,
// sampled at 4097 points; false when the first profile gives no usable curves.
bool LinearLight(const Chain& chain, std::vector<double>& h) {
  cmsHPROFILE p = chain.profiles().front();
  if (!chain.steps().front().to_pcs || !cmsIsMatrixShaper(p) || cmsGetColorSpace(p) != cmsSigRgbData) return false;
  const cmsTagSignature trc[3] = {cmsSigRedTRCTag, cmsSigGreenTRCTag, cmsSigBlueTRCTag};
  h.assign(3 * 4097, 0.0);
  for (unsigned a = 0; a < 3; ++a) {
    const auto* c = static_cast<const cmsToneCurve*>(cmsReadTag(p, trc[a]));
    if (!c) return false;
    for (int i = 0; i <= 4096; ++i) {
      const double y = cmsEvalToneCurveFloat(c, static_cast<cmsFloat32Number>(i / 4096.0));
      h[a * 4097 + i] = std::cbrt(std::max(y, 0.0));
      if (i > 0 && h[a * 4097 + i] < h[a * 4097 + i - 1]) return false;
    }
    if (!(h[a * 4097 + 4096] > h[a * 4097])) return false;
  }
  return true;
}

// Node input values and per-level grid positions of each axis.
void Place(const std::vector<double>* h, std::vector<double>& node, std::vector<double>& pos) {
  const unsigned g = kStagedGrid;
  node.assign(3 * g, 0.0);
  pos.assign(3 * 256, 0.0);
  for (unsigned a = 0; a < 3; ++a) {
    // Shape at x in [0, 1], read linearly between the 4097 samples.
    const auto shape = [&](double x) {
      if (!h) return x;
      const double* s = &(*h)[a * 4097];
      const double f = x * 4096;
      const int i = std::min(static_cast<int>(f), 4095);
      return ((s[i] + (s[i + 1] - s[i]) * (f - i)) - s[0]) / (s[4096] - s[0]);
    };
    for (int v = 0; v < 256; ++v) pos[a * 256 + v] = shape(v / 255.0) * (g - 1);
    for (unsigned k = 0; k < g; ++k) {
      double lo = 0, hi = 1;
      for (int it = 0; it < 48; ++it) {
        const double mid = (lo + hi) / 2;
        (shape(mid) * (g - 1) < k ? lo : hi) = mid;
      }
      node[a * g + k] = k == 0 ? 0.0 : k == g - 1 ? 1.0 : (lo + hi) / 2;
    }
  }
}

// Lab to the position along the table's input curves, 0..kCurveTop inside the PCS
// encoding's range and beyond it outside (the grid keeps such values so that the clip
// happens after interpolation, as in the chain).
void CurvePosition(const double* lab, double pcs_scale, double* t) {
  const double u[3] = {lab[0] / 100, (lab[1] + 128) / 255, (lab[2] + 128) / 255};
  for (int c = 0; c < 3; ++c) t[c] = u[c] * pcs_scale * kCurveTop;
}

// A 256-entry curve at position t (0..kCurveTop), as 0..1.
double CurveAt(const cmsToneCurve* c, double t) {
  const cmsUInt16Number* e = cmsGetToneCurveEstimatedTable(c);
  const double f = std::clamp(t, 0.0, 1.0 * kCurveTop) / 256;
  const int i = std::min(static_cast<int>(f), 254);
  return (e[i] + (e[i + 1] - e[i]) * (f - i)) / 65535.0;
}

// The table in double precision from the curve positions: what the kernel computes in
// fixed point, and what Little CMS computes in 16-bit steps. Little CMS reads Lab-indexed
// PCS-to-device tables trilinearly (it marks them CMS_LERP_FLAGS_TRILINEAR), so this
// does too; the probes below would catch a table read otherwise.
void Model(const Table& t, unsigned oc, const double* pos, double* out) {
  int cell[3];
  double w[3];
  for (int a = 0; a < 3; ++a) {
    const double p = CurveAt(t.in[a], pos[a]) * (t.size[a] - 1);
    cell[a] = std::min(static_cast<int>(p), static_cast<int>(t.size[a]) - 2);
    w[a] = p - cell[a];
  }
  const unsigned s1 = oc * t.size[2], s0 = s1 * t.size[1];
  const cmsUInt16Number* n = t.clut->Tab.T + cell[0] * s0 + cell[1] * s1 + cell[2] * oc;
  for (unsigned k = 0; k < oc; ++k) {
    double v = 0;
    for (int c = 0; c < 8; ++c) {
      const int x = c >> 2, y = (c >> 1) & 1, z = c & 1;
      v += n[x * s0 + y * s1 + z * oc + k] * (x ? w[0] : 1 - w[0]) * (y ? w[1] : 1 - w[1]) * (z ? w[2] : 1 - w[2]);
    }
    out[k] = CurveAt(t.out[k], v / 65535.0 * kCurveTop);
  }
}

}  // namespace

bool BuildStaged(const Chain& chain, cmsHTRANSFORM exact, FastPath& fp) {
  const auto& steps = chain.steps();
  const size_t count = chain.profiles().size();
  const unsigned oc = fp.out_channels;
  if (count < 2 || fp.in_channels != 3 || oc > 4 || chain.input() != cmsSigRgbData) return false;
  const ChainStep& last = steps.back();
  if (last.to_pcs || last.profile_class == cmsSigLinkClass || last.profile_class == cmsSigAbstractClass) return false;
  Table table;
  if (!ReadTable(chain.profiles().back(), chain.intents().back(), oc, table)) return false;

  cmsHTRANSFORM to_lab = chain.CreateToLab(count - 1);
  if (!to_lab) return false;
  // The grid's nodes and the probes in one run to Lab.
  const unsigned g = kStagedGrid;
  std::vector<double> shape, node, level_pos;
  const bool shaped = LinearLight(chain, shape);
  Place(shaped ? &shape : nullptr, node, level_pos);
  const size_t nodes = size_t{g} * g * g;
  std::vector<double> in((nodes + kProbes) * 3);
  for (size_t i = 0; i < nodes; ++i) {
    in[i * 3 + 0] = node[i / (g * g)];
    in[i * 3 + 1] = node[g + i / g % g];
    in[i * 3 + 2] = node[2 * g + i % g];
  }
  std::vector<int> probe_levels(kProbes * 3);
  std::uint32_t seed = 0x9E3779B9u;
  for (size_t i = 0; i < kProbes * 3; ++i) {
    seed = seed * 1664525u + 1013904223u;
    // The first probes are the cube's corners.
    probe_levels[i] = i < 24 ? ((i / 3) >> (2 - i % 3) & 1) * 255 : static_cast<int>(seed >> 24);
    in[nodes * 3 + i] = probe_levels[i] / 255.0;
  }
  std::vector<double> lab((nodes + kProbes) * 3);
  cmsDoTransform(to_lab, in.data(), lab.data(), static_cast<cmsUInt32Number>(nodes + kProbes));
  cmsDeleteTransform(to_lab);

  // Composition check: Lab -> table model against the whole chain.
  std::vector<double> truth(kProbes * oc);
  cmsDoTransform(exact, &in[nodes * 3], truth.data(), kProbes);
  for (size_t i = 0; i < kProbes; ++i) {
    double pos[3], model[4];
    CurvePosition(&lab[(nodes + i) * 3], table.pcs_scale, pos);
    Model(table, oc, pos, model);
    for (unsigned k = 0; k < oc; ++k) {
      if (!(std::fabs(model[k] - std::clamp(truth[i * oc + k], 0.0, 1.0)) <= kAgreement)) return false;
    }
  }

  // Stage 1: curve positions, halved about the middle, four lanes a node.
  std::vector<std::int16_t> grid_nodes(nodes * 4 + 4, 0);
  for (size_t i = 0; i < nodes; ++i) {
    double pos[3];
    CurvePosition(&lab[i * 3], table.pcs_scale, pos);
    for (int c = 0; c < 3; ++c) {
      const double half = std::clamp((pos[c] - kCurveMid) / 2, -32768.0, 32767.0);
      grid_nodes[i * 4 + c] = static_cast<std::int16_t>(std::lround(half));
    }
  }
  // The SSE2 kernel takes node differences along an axis in 16-bit lanes.
  const size_t axis_step[3] = {size_t{g} * g * 4, size_t{g} * 4, 4};
  for (size_t i = 0; i < nodes; ++i) {
    for (int a = 0; a < 3; ++a) {
      const size_t k = a == 0 ? i / (g * g) : a == 1 ? i / g % g : i % g;
      if (k + 1 == g) continue;
      for (int c = 0; c < 3; ++c) {
        if (std::abs(grid_nodes[i * 4 + c + axis_step[a]] - grid_nodes[i * 4 + c]) > 32767) return false;
      }
    }
  }

  fp.kind = Kind::Staged;
  fp.grid = g;
  fp.nodes = std::move(grid_nodes);
  fp.stride = {static_cast<std::int32_t>(axis_step[0]), static_cast<std::int32_t>(axis_step[1]), 4};
  fp.offset.resize(3 * 256);
  fp.weight.resize(3 * 256);
  fp.cell.resize(3 * 256);
  for (unsigned a = 0; a < 3; ++a) {
    for (int v = 0; v < 256; ++v) {
      const double p = std::clamp(level_pos[a * 256 + v], 0.0, g - 1.0);
      int cell = static_cast<int>(std::floor(p));
      int w = static_cast<int>(std::lround((p - cell) * (1 << kWeightBits)));
      if (w == 1 << kWeightBits) ++cell, w = 0;
      if (cell >= static_cast<int>(g) - 1) cell = static_cast<int>(g) - 2, w = 1 << kWeightBits;
      fp.weight[a * 256 + v] = static_cast<std::int16_t>(w);
      fp.offset[a * 256 + v] = cell * fp.stride[a];
      fp.cell[a * 256 + v] = (cell * fp.stride[a] / 4) << 15 | w;
    }
  }

  // Stage 2: the table's own points.
  fp.in_curve.assign(3 * 257, 0);
  for (unsigned a = 0; a < 3; ++a) {
    const cmsUInt16Number* e = cmsGetToneCurveEstimatedTable(table.in[a]);
    for (int i = 0; i < 257; ++i) {
      const double p = e[std::min(i, 255)] / 65535.0 * (table.size[a] - 1);
      fp.in_curve[a * 257 + i] = static_cast<std::int32_t>(std::lround(p * (1 << kClutFracBits)));
    }
    fp.clut_size[a] = static_cast<std::int32_t>(table.size[a]) + 1;
  }
  fp.clut_stride[2] = 4;
  fp.clut_stride[1] = 4 * fp.clut_size[2];
  fp.clut_stride[0] = fp.clut_stride[1] * fp.clut_size[1];
  const std::int32_t* size = fp.clut_size;
  fp.clut.assign(size_t(size[0]) * size[1] * size[2] * 4 + 8, 0);
  for (std::int32_t x = 0; x < size[0]; ++x) {
    for (std::int32_t y = 0; y < size[1]; ++y) {
      for (std::int32_t z = 0; z < size[2]; ++z) {
        // The repeated planes take the last real node.
        const size_t sx = std::min(x, size[0] - 2), sy = std::min(y, size[1] - 2), sz = std::min(z, size[2] - 2);
        const size_t from = ((sx * table.size[1] + sy) * table.size[2] + sz) * oc;
        std::int16_t* to = &fp.clut[x * fp.clut_stride[0] + y * fp.clut_stride[1] + z * fp.clut_stride[2]];
        for (unsigned k = 0; k < oc; ++k) {
          to[k] = static_cast<std::int16_t>(std::lround(table.clut->Tab.T[from + k] / 65535.0 * (255 << kValueBits)));
        }
      }
    }
  }
  // Each output curve read linearly between its points, at every value the table's
  // interpolation can give, rounded to a level.
  constexpr std::int32_t kTop = 255 << kValueBits;
  fp.out_level.assign(oc * (kTop + 1), 0);
  for (unsigned k = 0; k < oc; ++k) {
    const cmsUInt16Number* e = cmsGetToneCurveEstimatedTable(table.out[k]);
    std::int32_t pt[257];
    for (int i = 0; i < 257; ++i) pt[i] = static_cast<std::int32_t>(std::lround(e[std::min(i, 255)] / 65535.0 * kTop));
    for (std::int32_t v = 0; v <= kTop; ++v) {
      const std::int32_t* c = &pt[v >> kValueBits];
      const std::int32_t f = v & ((1 << kValueBits) - 1);
      fp.out_level[k * (kTop + 1) + v] = static_cast<std::uint8_t>(
          (c[0] * ((1 << kValueBits) - f) + c[1] * f + (1 << (2 * kValueBits - 1))) >> (2 * kValueBits));
    }
  }
  return true;
}

}  // namespace win32::icm::kernels::detail
