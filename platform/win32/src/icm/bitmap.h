// TranslateBitmapBits internals that tests and benchmarks reach.
#ifndef TINTWELL_WIN32_ICM_BITMAP_H
#define TINTWELL_WIN32_ICM_BITMAP_H

#include <cstddef>

namespace win32::icm {

// Images of at least this many pixels are shared between worker threads: starting
// and joining a thread costs some 30-60 us, what the kernels take for about 10 000
// pixels on one core, so from here half the image on a second core saves more than
// the thread costs (bitmap_kernel_bench: BM_ThreadStartJoin, BM_SmallImage).
constexpr size_t kBitmapThreadingPixels = size_t{1} << 16;

// Caps the worker threads TranslateBitmapBits uses (0 = one per core, the default).
// For tests and benchmarks that compare the single- and multi-threaded paths.
void SetBitmapThreadLimit(unsigned limit);

}  // namespace win32::icm

#endif
