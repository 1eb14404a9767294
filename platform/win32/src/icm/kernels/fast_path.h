// Own 8-bit image kernels behind TranslateBitmapBits. A fast path is made once per
// colour transform from what Little CMS says about its chain, and then converts runs of
// pixels in any of the 8-bit layouts:
//   - gray input: a table of the exact result for each of the 256 levels;
//   - matrix-shaper chains (RGB -> RGB, RGB -> gray): per-channel linearisation folded
//     into the 3x3 matrix, then a dense output table indexed by the linear value's
//     float bits (steps as fine, relatively, near black, where output curves are
//     steepest, as near white);
//   - everything else (RGB or CMYK in): the whole chain sampled in double precision on
//     a grid, read with tetrahedral (3 inputs) or 4-D simplex (CMYK) interpolation in
//     fixed point. A CMYK grid is spaced along the input curves of the first profile's
//     table where it has them;
//   - sampled chains that end in a matrix-shaper RGB or gray profile are sampled in
//     linear light instead, as floats, and read through that profile's output tables
//     like the matrix-shaper path: the output curve is steep near black and the chain
//     clips where colours leave the output gamut, and neither bends between nodes
//     when it is applied after the interpolation. CMYK is interpolated as Little CMS
//     does, tetrahedrally in C, M, Y and linearly between two K planes, so a grid that
//     follows the input table's nodes reproduces it exactly;
//   - RGB into an output profile whose PCS-to-device table is a Lab-indexed CLUT
//     (staged): the smooth part up to that table's input curves sampled on an RGB grid
//     and read tetrahedrally, then the table's own curves, nodes and trilinear
//     interpolation, whose cell-by-cell kinks no sampled grid could follow.
// Every instruction set (portable scalar, SSE2, AVX2) computes the same integers and
// the same float operations in the same order, so all give identical bytes.
#ifndef TINTWELL_WIN32_ICM_KERNELS_FAST_PATH_H
#define TINTWELL_WIN32_ICM_KERNELS_FAST_PATH_H

#include <lcms2.h>

#include <cstddef>
#include <cstdint>
#include <memory>
#include <vector>

// The x86 kernels need SSE2 from the compiler (every x86-64 target has it); the AVX2
// kernel is compiled for its own functions and chosen at run time.
#if defined(__x86_64__) || (defined(__i386__) && defined(__SSE2__))
#define TINTWELL_KERNELS_X86 1
#endif

namespace win32::icm {
class Chain;
}

namespace win32::icm::kernels {

// Where the colour channels of one pixel sit in memory, in the chain's channel order
// (R,G,B; gray; C,M,Y,K).
struct PixelLayout {
  unsigned bytes;      // 1, 3 or 4 bytes a pixel
  std::uint8_t at[4];  // byte offset of each channel
  int x;               // offset of the filler byte; -1 when there is none
};

enum class Kind { Table1, Matrix, Clut3, Clut4, ShapedClut3, ShapedClut4, Staged };
enum class Isa { Scalar, Sse2, Avx2 };

// Output tables of the matrix-shaper and linear-light paths: the output byte for each
// step of a linear value between kShaperFloor and 1, indexed by the value's float bits
// shifted right by kShaperShift: 2^(23 - kShaperShift) steps an octave, each taken at
// its middle, so steps are relatively as fine near black, where output curves are
// steepest, as near white, and reading the table needs neither a square root nor
// interpolation. Entry kShaperSize is for 1.
constexpr int kShaperShift = 12;
constexpr int kShaperOctaves = 30;
constexpr float kShaperFloor = 1.0f / (1u << kShaperOctaves);
constexpr std::int32_t kShaperBase = (127 - kShaperOctaves) << (23 - kShaperShift);
constexpr unsigned kShaperSize = kShaperOctaves << (23 - kShaperShift);
// Grid points per axis of the sampled chains.
constexpr unsigned kGrid3 = 52;
constexpr unsigned kGrid4 = 17;
// In linear light: RGB grids along the input curves; CMYK grids with C, M and Y on
// three nodes for each cell of a 9-point input table, K on two.
constexpr unsigned kShapedGrid3 = 33;
constexpr unsigned kShapedGridCmy = 25;
constexpr unsigned kShapedGridK = 17;
// Fixed point: grid and table values carry 7 fractional bits of an output level (255
// fits a signed 16-bit lane), interpolation weights 14 bits.
constexpr int kValueBits = 7;
constexpr int kWeightBits = 14;

struct FastPath {
  Kind kind = Kind::Table1;
  unsigned in_channels = 0;
  unsigned out_channels = 0;

  // Table1: 256 entries of out_channels bytes.
  std::vector<std::uint8_t> table;

  // Matrix: lin[c][v] is column c of the matrix times the linearised level v, as
  // four floats (the last unused); the offset is folded into channel 0. The output
  // tables (and the clamp of the linear value) serve the ShapedClut kinds too.
  std::vector<float> lin;         // 3 * 256 * 4
  float limit = 0;
  std::vector<std::uint8_t> shaper;  // out_channels * (kShaperSize + 1), then 3 bytes of padding

  // Clut3 / Clut4: nodes of out_channels signed 16-bit values (padded at the end so
  // any node can be read as 8 bytes), and per input level its node offset on each
  // axis and its weight within the cell. ShapedClut3 / ShapedClut4 keep their nodes
  // as scaled linear values in linear_nodes (padded so any node reads as 32 bytes)
  // and end through `limit` and `shaper`.
  unsigned grid = 0;
  std::vector<std::int16_t> nodes;
  std::vector<float> linear_nodes;
  std::vector<std::int32_t> offset;  // in_channels * 256, in node values
  std::vector<std::int32_t> stride;  // in_channels
  std::vector<std::int16_t> weight;  // in_channels * 256

  // Milliseconds spent building, for the benchmark's report.
  double build_ms = 0;

  // Staged: grid, nodes, offset, stride and weight (as Clut3) give stage 1, the place
  // on each input curve of the output table (in 1/256 of a curve step, less the middle
  // 255 * 128 and halved, three of four lanes a node). Stage 2 is that table: per input
  // curve its 257 points (the last repeated) as positions in the table's grid with
  // kClutFracBits of fraction; its nodes (four int16 lanes a node, output levels with
  // kValueBits of fraction), each axis' last plane repeated so that the far end is a
  // cell corner like any other; per output curve the byte at every such value.
  std::vector<std::int32_t> in_curve;    // 3 * 257
  std::vector<std::int16_t> clut;        // clut_size[0..2] nodes * 4, plus padding
  std::int32_t clut_size[3] = {};        // nodes per axis, the repeated plane included
  std::int32_t clut_stride[3] = {};      // in int16 units
  std::vector<std::uint8_t> out_level;   // out_channels * ((255 << kValueBits) + 1)
  // Stage 1's node offset / 4 << 15 | weight, per axis and level: one read for both.
  std::vector<std::int32_t> cell;        // 3 * 256
};

// Staged paths: the fraction bits of a position in the output table's grid (the
// interpolation weight itself).
constexpr int kClutFracBits = kWeightBits;

// The fast path for a chain whose double-precision transform (device values 0..1 in
// and out) is `exact`; null when the chain's ends are not 8-bit bitmap spaces. Sampling
// runs through Little CMS and can take tens of milliseconds: callers cache the result.
std::unique_ptr<FastPath> Build(const Chain& chain, cmsHTRANSFORM exact);

// Converts n pixels from src to dst. The x byte of an output with one is copied from
// an input with one, and 0 otherwise. dst may be src when the output pixel is no larger
// than the input pixel: every pixel is read before it or any later one is written.
void Run(const FastPath& path, const std::uint8_t* src, const PixelLayout& in, std::uint8_t* dst,
         const PixelLayout& out, std::size_t n);

// The instruction set Run uses: the best this CPU has, unless capped by ForceIsa (for
// tests and benchmarks; a cap above what the CPU has is lowered).
Isa ActiveIsa();
void ForceIsa(Isa cap);
bool IsaAvailable(Isa isa);

// One kernel per instruction set; Run picks among them.
namespace detail {
// Makes `fp` a staged path when the chain allows one and the composition reproduces
// the exact transform; false (fp untouched but for scratch) otherwise.
bool BuildStaged(const Chain& chain, cmsHTRANSFORM exact, FastPath& fp);

void RunScalar(const FastPath& path, const std::uint8_t* src, const PixelLayout& in, std::uint8_t* dst,
               const PixelLayout& out, std::size_t n);
#ifdef TINTWELL_KERNELS_X86
void RunSse2(const FastPath& path, const std::uint8_t* src, const PixelLayout& in, std::uint8_t* dst,
             const PixelLayout& out, std::size_t n);
void RunAvx2(const FastPath& path, const std::uint8_t* src, const PixelLayout& in, std::uint8_t* dst,
             const PixelLayout& out, std::size_t n);
#endif
}  // namespace detail

}  // namespace win32::icm::kernels

#endif
