// Agreement of CheckColors with an exact reference, on random Lab colours.
//
// Reference: a colour is inside a profile's gamut when some device value reproduces
// it, i.e. when min over d in [0,1]^n of dE76(Lab(d), colour) <= kInsideDeltaE, where
// Lab(d) is the profile's device -> Lab direction (relative colorimetric) evaluated by
// Little CMS in double precision. The minimum is found by starting from the nearest
// node of a dense grid over the device space and refining with a damped Gauss-Newton
// search kept inside the box. This never uses the Lab -> device direction that
// CheckColors relies on.
//
// Usage: gamut_agreement [samples] [seed]   (defaults 200000, 1)
#include <lcms2.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <random>
#include <string>
#include <unordered_map>
#include <vector>

#include "icm.h"
#include "win32_paths.h"

namespace {

constexpr double kInsideDeltaE = 0.1;

struct Lab3 {
  double L, a, b;
};

double Distance(const Lab3& p, const Lab3& q) {
  return std::sqrt((p.L - q.L) * (p.L - q.L) + (p.a - q.a) * (p.a - q.a) + (p.b - q.b) * (p.b - q.b));
}

class Reference {
 public:
  Reference(const std::string& path, int steps) {
    cmsHPROFILE device = cmsOpenProfileFromFile(path.c_str(), "r");
    cmsHPROFILE lab = cmsCreateLab4Profile(nullptr);
    channels_ = static_cast<int>(cmsChannelsOf(cmsGetColorSpace(device)));
    forward_ = cmsCreateTransform(device, FLOAT_SH(1) | CHANNELS_SH(channels_) | BYTES_SH(0), lab, TYPE_Lab_DBL,
                                  INTENT_RELATIVE_COLORIMETRIC, 0);
    cmsCloseProfile(device);
    cmsCloseProfile(lab);
    // Dense grid of the forward direction, hashed by Lab cell.
    size_t nodes = 1;
    for (int c = 0; c < channels_; ++c) nodes *= steps;
    std::vector<double> d(channels_);
    for (size_t i = 0; i < nodes; ++i) {
      size_t k = i;
      for (int c = 0; c < channels_; ++c) {
        d[c] = static_cast<double>(k % steps) / (steps - 1);
        k /= steps;
      }
      grid_device_.insert(grid_device_.end(), d.begin(), d.end());
      grid_lab_.push_back(Forward(d.data()));
    }
    // Cover radius: the largest step between neighbouring nodes bounds how far an
    // inside colour can be from its nearest node.
    for (size_t i = 0; i < nodes; ++i) {
      size_t stride = 1;
      for (int c = 0; c < channels_; ++c, stride *= steps) {
        if ((i / stride) % steps + 1 < static_cast<size_t>(steps)) {
          cell_ = std::max(cell_, Distance(grid_lab_[i], grid_lab_[i + stride]));
        }
      }
    }
    for (size_t i = 0; i < nodes; ++i) cells_[Key(grid_lab_[i])].push_back(i);
  }
  ~Reference() { cmsDeleteTransform(forward_); }

  // Smallest distance from the colour to the device gamut (capped at the cover radius).
  double DistanceToGamut(const Lab3& target) const {
    std::vector<std::pair<double, size_t>> near;
    const long kx = Cell(target.L), ky = Cell(target.a), kz = Cell(target.b);
    for (long x = kx - 1; x <= kx + 1; ++x)
      for (long y = ky - 1; y <= ky + 1; ++y)
        for (long z = kz - 1; z <= kz + 1; ++z) {
          auto it = cells_.find(Pack(x, y, z));
          if (it == cells_.end()) continue;
          for (size_t i : it->second) {
            const double dist = Distance(grid_lab_[i], target);
            if (dist <= cell_) near.emplace_back(dist, i);
          }
        }
    if (near.empty()) return cell_;
    std::sort(near.begin(), near.end());
    double best = near.front().first;
    for (size_t s = 0; s < std::min<size_t>(3, near.size()) && best > kInsideDeltaE; ++s) {
      best = std::min(best, Refine(target, &grid_device_[near[s].second * channels_]));
    }
    return best;
  }

 private:
  Lab3 Forward(const double* d) const {
    cmsCIELab lab;
    cmsDoTransform(forward_, d, &lab, 1);
    return {lab.L, lab.a, lab.b};
  }

  // Damped Gauss-Newton on |Lab(d) - target|^2 with d clamped to the unit box.
  double Refine(const Lab3& target, const double* start) const {
    std::array<double, 8> d{}, trial{};
    std::copy(start, start + channels_, d.begin());
    Lab3 at = Forward(d.data());
    double err = Distance(at, target);
    double damping = 1e-3;
    for (int iter = 0; iter < 60 && err > kInsideDeltaE * 0.5; ++iter) {
      double jac[3][8];
      for (int c = 0; c < channels_; ++c) {
        trial = d;
        // Tables hold 16-bit values, so a tiny step may not move the output at all.
        const double h = d[c] > 0.5 ? -4e-3 : 4e-3;
        trial[c] += h;
        const Lab3 moved = Forward(trial.data());
        jac[0][c] = (moved.L - at.L) / h;
        jac[1][c] = (moved.a - at.a) / h;
        jac[2][c] = (moved.b - at.b) / h;
      }
      const double r[3] = {target.L - at.L, target.a - at.a, target.b - at.b};
      // Normal equations (J^T J + damping * diag) step = J^T r, solved by Gauss elimination.
      double m[8][9] = {};
      for (int i = 0; i < channels_; ++i) {
        for (int j = 0; j < channels_; ++j) {
          for (int k = 0; k < 3; ++k) m[i][j] += jac[k][i] * jac[k][j];
        }
        m[i][i] += damping * (1.0 + m[i][i]);
        for (int k = 0; k < 3; ++k) m[i][channels_] += jac[k][i] * r[k];
      }
      for (int i = 0; i < channels_; ++i) {
        int pivot = i;
        for (int k = i + 1; k < channels_; ++k)
          if (std::fabs(m[k][i]) > std::fabs(m[pivot][i])) pivot = k;
        std::swap(m[i], m[pivot]);
        if (std::fabs(m[i][i]) < 1e-15) continue;
        for (int k = 0; k < channels_; ++k) {
          if (k == i) continue;
          const double f = m[k][i] / m[i][i];
          for (int j = i; j <= channels_; ++j) m[k][j] -= f * m[i][j];
        }
      }
      for (int c = 0; c < channels_; ++c) {
        const double step = std::fabs(m[c][c]) < 1e-15 ? 0.0 : m[c][channels_] / m[c][c];
        trial[c] = std::clamp(d[c] + step, 0.0, 1.0);
      }
      const Lab3 moved = Forward(trial.data());
      const double moved_err = Distance(moved, target);
      if (moved_err < err) {
        d = trial;
        at = moved;
        err = moved_err;
        damping = std::max(damping * 0.3, 1e-6);
      } else {
        damping *= 10.0;
        if (damping > 1e6) break;
      }
    }
    return err;
  }

  long Cell(double v) const { return static_cast<long>(std::floor(v / cell_)); }
  static long long Pack(long x, long y, long z) { return (x + 4096) * 100000000LL + (y + 4096) * 10000LL + (z + 4096); }
  long long Key(const Lab3& p) const { return Pack(Cell(p.L), Cell(p.a), Cell(p.b)); }

  cmsHTRANSFORM forward_ = nullptr;
  int channels_ = 0;
  double cell_ = 0.0;
  std::vector<double> grid_device_;
  std::vector<Lab3> grid_lab_;
  std::unordered_map<long long, std::vector<size_t>> cells_;
};

// Little CMS's own check, for comparison: out when every float output is -1.
class LcmsGamutCheck {
 public:
  explicit LcmsGamutCheck(const std::string& path) {
    cmsHPROFILE profiles[2] = {cmsCreateLab4Profile(nullptr), cmsOpenProfileFromFile(path.c_str(), "r")};
    cmsBool bpc[2] = {FALSE, FALSE};
    cmsUInt32Number intents[2] = {INTENT_RELATIVE_COLORIMETRIC, INTENT_RELATIVE_COLORIMETRIC};
    cmsFloat64Number adaptation[2] = {1.0, 1.0};
    channels_ = static_cast<int>(cmsChannelsOf(cmsGetColorSpace(profiles[1])));
    x_ = cmsCreateExtendedTransform(nullptr, 2, profiles, bpc, intents, adaptation, profiles[1], 1, TYPE_Lab_DBL,
                                    FLOAT_SH(1) | CHANNELS_SH(channels_) | BYTES_SH(4),
                                    cmsFLAGS_GAMUTCHECK | cmsFLAGS_NONEGATIVES);
    cmsCloseProfile(profiles[0]);
    cmsCloseProfile(profiles[1]);
  }
  ~LcmsGamutCheck() { cmsDeleteTransform(x_); }
  bool Inside(const Lab3& lab) const {
    const cmsCIELab in{lab.L, lab.a, lab.b};
    float out[8];
    cmsDoTransform(x_, &in, out, 1);
    return out[0] != -1.0f;
  }

 private:
  cmsHTRANSFORM x_;
  int channels_;
};

HPROFILE Open(const std::string& path) {
  const std::string windows = win32::WindowsPathFromPosix(path);
  PROFILE p{PROFILE_FILENAME, const_cast<char*>(windows.c_str()), static_cast<DWORD>(windows.size())};
  return OpenColorProfileA(&p, PROFILE_READ, FILE_SHARE_READ, OPEN_EXISTING);
}

void Measure(const std::string& name, int steps, size_t samples, unsigned seed) {
  const std::string path = std::string(TINTWELL_ICC_DIR) + "/" + name;
  HPROFILE srgb = Open(std::string(TINTWELL_ICC_DIR) + "/sRGB.icc");
  HPROFILE target = Open(path);
  HPROFILE chain[2] = {srgb, target};
  DWORD intents[2] = {INTENT_RELATIVE_COLORIMETRIC, INTENT_RELATIVE_COLORIMETRIC};
  HTRANSFORM x = CreateMultiProfileTransform(chain, 2, intents, 2, ENABLE_GAMUT_CHECKING, 0);
  if (!x) {
    std::printf("%s: no transform (error %u)\n", name.c_str(), GetLastError());
    return;
  }
  std::mt19937 rng(seed);
  std::uniform_int_distribution<int> l_word(0, 0xFF00), ab_word(0, 0xFFFF);
  std::vector<COLOR> colors(samples);
  for (COLOR& c : colors) c.Lab = {static_cast<WORD>(l_word(rng)), static_cast<WORD>(ab_word(rng)),
                                   static_cast<WORD>(ab_word(rng))};
  std::vector<BYTE> result(samples);
  if (!CheckColors(x, colors.data(), static_cast<DWORD>(samples), COLOR_Lab, result.data())) {
    std::printf("%s: CheckColors failed (error %u)\n", name.c_str(), GetLastError());
    return;
  }
  const Reference reference(path, steps);
  size_t agree = 0, missed = 0, false_alarm = 0, inside = 0;
  double worst_missed = 0.0;
  size_t lcms_agree = 0;
  LcmsGamutCheck lcms(path);
  for (size_t i = 0; i < samples; ++i) {
    const Lab3 lab{colors[i].Lab.L * 100.0 / 65280.0, colors[i].Lab.a / 256.0 - 128.0,
                   colors[i].Lab.b / 256.0 - 128.0};
    const double distance = reference.DistanceToGamut(lab);
    const bool truly_inside = distance <= kInsideDeltaE;
    const bool said_inside = result[i] == 0;
    inside += truly_inside;
    lcms_agree += lcms.Inside(lab) == truly_inside;
    if (truly_inside == said_inside) {
      ++agree;
    } else if (said_inside) {
      ++missed;
      worst_missed = std::max(worst_missed, distance);
    } else {
      ++false_alarm;
    }
  }
  std::printf("%-30s samples %zu, inside %zu (%.1f %%)\n  CheckColors agreement %.3f %% (missed %zu, up to %.2f dE "
              "outside; false alarms %zu)\n  Little CMS gamut check agreement %.3f %%\n",
              name.c_str(), samples, inside, 100.0 * inside / samples, 100.0 * agree / samples, missed,
              worst_missed, false_alarm, 100.0 * lcms_agree / samples);
  DeleteColorTransform(x);
  CloseColorProfile(target);
  CloseColorProfile(srgb);
}

}  // namespace

int main(int argc, char** argv) {
  const size_t samples = argc > 1 ? std::strtoul(argv[1], nullptr, 10) : 200000;
  const unsigned seed = argc > 2 ? static_cast<unsigned>(std::strtoul(argv[2], nullptr, 10)) : 1;
  std::printf("reference: inside when some device value comes within %.2f dE76 (grid start + Gauss-Newton)\n",
              kInsideDeltaE);
  Measure("sRGB.icc", 65, samples, seed);
  Measure("ghostscript/default_cmyk.icc", 21, samples, seed);
  return 0;
}
