// Conformance of GlobalAlloc and GlobalFree.
#include <gtest/gtest.h>

#include <cstdint>
#include <cstring>

#include "windows.h"

namespace {

constexpr DWORD kSentinel = 0xDEADBEEF;

TEST(GlobalAlloc, RefusesMoveableUnknownFlagsAndAbsurdSizes) {
  const struct {
    UINT flags;
    SIZE_T bytes;
    DWORD error;
  } cases[] = {
      {GMEM_MOVEABLE, 16, ERROR_NOT_SUPPORTED},      {GMEM_MOVEABLE | GMEM_ZEROINIT, 16, ERROR_NOT_SUPPORTED},
      {0x8000, 16, ERROR_INVALID_PARAMETER},         {GMEM_MODIFY, 16, ERROR_INVALID_PARAMETER},
      {GPTR, ~SIZE_T{0}, ERROR_NOT_ENOUGH_MEMORY},   {GMEM_FIXED, ~SIZE_T{0} / 2, ERROR_NOT_ENOUGH_MEMORY},
  };
  for (const auto& c : cases) {
    SetLastError(kSentinel);
    EXPECT_EQ(GlobalAlloc(c.flags, c.bytes), nullptr) << c.flags;
    EXPECT_EQ(GetLastError(), c.error) << c.flags;
  }
}

TEST(GlobalAlloc, GivesAlignedWritableBlocksZeroedOnRequest) {
  for (UINT flags : {UINT{GMEM_FIXED}, UINT{GPTR}, UINT{GMEM_FIXED | GMEM_NODISCARD | GMEM_SHARE}}) {
    for (SIZE_T bytes : {SIZE_T{0}, SIZE_T{13}, SIZE_T{4096}}) {
      SetLastError(kSentinel);
      auto* p = static_cast<unsigned char*>(GlobalAlloc(flags, bytes));
      ASSERT_NE(p, nullptr);
      EXPECT_EQ(GetLastError(), ERROR_SUCCESS);
      EXPECT_EQ(reinterpret_cast<std::uintptr_t>(p) % 8, 0u);
      for (SIZE_T i = 0; (flags & GMEM_ZEROINIT) && i < bytes; ++i) ASSERT_EQ(p[i], 0) << i;
      std::memset(p, 0xA5, bytes);
      SetLastError(kSentinel);
      EXPECT_EQ(GlobalFree(p), nullptr);
      EXPECT_EQ(GetLastError(), ERROR_SUCCESS);
    }
  }
}

TEST(GlobalFree, ReturnsTheHandleWhenItIsNotALiveBlock) {
  void* p = GlobalAlloc(GPTR, 32);
  ASSERT_EQ(GlobalFree(p), nullptr);
  int on_stack = 0;
  for (void* bad : {p, static_cast<void*>(&on_stack)}) {  // freed twice; never allocated
    SetLastError(kSentinel);
    EXPECT_EQ(GlobalFree(bad), bad);
    EXPECT_EQ(GetLastError(), ERROR_INVALID_HANDLE);
  }
  SetLastError(kSentinel);
  EXPECT_EQ(GlobalFree(nullptr), nullptr);
  EXPECT_EQ(GetLastError(), ERROR_SUCCESS);
}

}  // namespace
