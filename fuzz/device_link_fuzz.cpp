// Fuzz target for CreateDeviceLinkProfile: up to four profiles and intents from the
// input. A link that is made must fill its block exactly (the size field is the
// allocation's size), open as a device link between the chain's end spaces, and work
// on its own as a transform.
#include <sanitizer/allocator_interface.h>

#include <cstdint>
#include <vector>

#include "fuzz_profiles.h"

namespace {

std::uint32_t BigEndian(const BYTE* p) {
  return std::uint32_t{p[0]} << 24 | std::uint32_t{p[1]} << 16 | std::uint32_t{p[2]} << 8 | p[3];
}

// The link's data space is the chain's input; its connection space the output of the
// last profile (a link's own connection space, otherwise its data space).
void CheckLink(BYTE* block, std::vector<HPROFILE>& chain) {
  const std::uint32_t size = BigEndian(block);
  fuzz::Check(size >= 128 && size == __sanitizer_get_allocated_size(block));
  PROFILE p{PROFILE_MEMBUFFER, block, size};
  HPROFILE link = OpenColorProfileA(&p, PROFILE_READ, 0, OPEN_EXISTING);
  fuzz::Check(link != nullptr);
  PROFILEHEADER header, first;
  fuzz::Check(GetColorProfileHeader(link, &header) && GetColorProfileHeader(chain.front(), &first));
  fuzz::Check(header.phClass == CLASS_LINK && header.phDataColorSpace == first.phDataColorSpace);
  // The link ends where its chain does: after the first profile, a device profile that
  // receives the PCS gives its device space, and one that receives a device space gives
  // the PCS; links and abstract profiles always run forwards.
  DWORD space = first.phDataColorSpace;
  for (std::size_t i = 0; i < chain.size(); ++i) {
    PROFILEHEADER h;
    fuzz::Check(GetColorProfileHeader(chain[i], &h));
    const bool forwards = h.phClass == CLASS_LINK || h.phClass == CLASS_ABSTRACT;
    const bool pcs = space == SPACE_Lab || space == SPACE_XYZ;
    space = !forwards && i > 0 && pcs ? h.phDataColorSpace : h.phConnectionSpace;
  }
  fuzz::Check(header.phConnectionSpace == space);

  DWORD intent = INTENT_PERCEPTUAL;
  SetLastError(fuzz::kSentinel);
  HTRANSFORM x = CreateMultiProfileTransform(&link, 1, &intent, 1, BEST_MODE, INDEX_DONT_CARE);
  fuzz::CheckEnding(x != nullptr);
  fuzz::Check(x != nullptr && DeleteColorTransform(x));
  fuzz::Check(CloseColorProfile(link));
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  fuzz::Input in(data, size);
  fuzz::Profiles profiles(in);
  std::vector<HPROFILE>& handles = profiles.handles();
  std::vector<DWORD> intents = fuzz::ReadIntents(in, handles.size());

  BYTE* block = reinterpret_cast<BYTE*>(1);  // must be reset on failure too
  SetLastError(fuzz::kSentinel);
  const BOOL ok = CreateDeviceLinkProfile(handles.data(), static_cast<DWORD>(handles.size()), intents.data(),
                                          static_cast<DWORD>(intents.size()), 0, &block, INDEX_DONT_CARE);
  fuzz::CheckEnding(ok);
  fuzz::Check(ok ? block != nullptr : block == nullptr);
  if (!ok) return 0;
  CheckLink(block, handles);
  fuzz::Check(GlobalFree(block) == nullptr);
  return 0;
}
