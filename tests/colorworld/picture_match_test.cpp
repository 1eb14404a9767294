// MatchPicture through the host: pixels against Little CMS (red and blue must not trade
// places), the row padding of odd widths, areas larger than the picture, and the
// failure table with its traces and codes.
#include <cstdint>
#include <cstdlib>
#include <random>
#include <tuple>

#include "lcms_reference.h"
#include "plugin_fixture.h"
#include "profile_files.h"

namespace {

using host::Color;
using host::Object;
using host::Value;

const char* const kWide = "colord/ProPhotoRGB.icc";

class PictureMatchTest : public PluginTest {
 protected:
  Object World() {
    return rt->New("ColorWorld", {Open(TINTWELL_ICC_DIR "/sRGB.icc"), Open(TINTWELL_ICC_DIR "/" + std::string(kWide))});
  }
  Value Match(const Object& world, const Value& picture, int w, int h, int depth = 32, bool transparent = false) {
    return rt->Call(world, "MatchPicture", {picture, w, h, depth, transparent});
  }
  ProfileFiles files;
};

// Little CMS on the same pixel, each profile with its header's intent, as the colour
// world builds its transform. Pixels are &h00RRGGBB.
std::uint32_t Expected(std::uint32_t rgb) {
  static const LcmsChain chain({"sRGB.icc", kWide}, TYPE_RGB_8, TYPE_RGB_8);
  const std::uint8_t in[3] = {std::uint8_t(rgb >> 16), std::uint8_t(rgb >> 8), std::uint8_t(rgb)};
  std::uint8_t out[3] = {};
  chain.Run(in, out);
  return std::uint32_t(out[0]) << 16 | out[1] << 8 | out[2];
}

// Channel by channel within one step of 8 bits: the engine's 8-bit path may round
// differently from a lone transform.
::testing::AssertionResult Near(std::uint32_t got, std::uint32_t want) {
  for (int shift : {16, 8, 0}) {
    const int a = static_cast<int>(got >> shift & 0xFF), b = static_cast<int>(want >> shift & 0xFF);
    if (std::abs(a - b) > 1)
      return ::testing::AssertionFailure() << std::hex << "got " << got << ", Little CMS gives " << want;
  }
  return ::testing::AssertionSuccess();
}

TEST_F(PictureMatchTest, MatchesLittleCmsWithRedAndBlueInTheirPlaces) {
  Object world = World();
  // Widths 4 (rows of 12 bytes, drawn straight) and 5 (15 bytes, drawn from a copy with
  // 16-byte rows); the first pixels are pure red, pure blue and pure green.
  for (const int width : {4, 5}) {
    SCOPED_TRACE(width);
    const int height = 3;
    Object source = rt->NewPicture(width, height);
    std::mt19937 rng(width);
    std::vector<std::uint32_t> given;
    for (int y = 0; y < height; ++y)
      for (int x = 0; x < width; ++x) {
        const std::uint32_t first[] = {0xFF0000, 0x0000FF, 0x00FF00};
        const std::size_t i = given.size();
        given.push_back(i < 3 ? first[i] : rng() & 0xFFFFFF);
        rt->SetPixel(source, x, y, Color{given.back()});
      }
    rt->CallGlobal("halvoUnregisterDebugger");
    Object d = Debugger();
    rt->Call(world, "MatchCMcolor", {Value()});  // leaves -1, which success keeps
    log.entries.clear();
    const Value result = Match(world, source, width, height);
    ASSERT_TRUE(result.IsObject());
    EXPECT_EQ(Error(), -1);
    EXPECT_EQ(log.entries, std::vector<std::string>{"DebugString:BuildImageDataFromPicture"});
    const Object& picture = result.AsObject();
    const auto size = rt->SizeOfPicture(picture);
    EXPECT_EQ(std::tie(size.width, size.height, size.depth), std::make_tuple(width, height, 32));
    for (int y = 0, i = 0; y < height; ++y)
      for (int x = 0; x < width; ++x, ++i) {
        EXPECT_TRUE(Near(rt->GetPixel(picture, x, y).rgb, Expected(given[i]))) << x << "," << y;
        EXPECT_EQ(rt->GetPixel(source, x, y).rgb, given[i]);  // the source is only read
      }
    // Pure red and pure blue land far apart in a wide gamut: a swap cannot pass as rounding.
    EXPECT_GT(rt->GetPixel(picture, 0, 0).rgb >> 16 & 0xFF, 0xA0u);
    EXPECT_GT(rt->GetPixel(picture, 1, 0).rgb & 0xFF, 0xE0u);
  }
}

TEST_F(PictureMatchTest, AreaBeyondThePictureReadsAsWhiteAndDepthIsAlways32) {
  Object world = World();
  Object source = rt->NewPicture(2, 2);
  for (int y = 0; y < 2; ++y)
    for (int x = 0; x < 2; ++x) rt->SetPixel(source, x, y, Color{0x102030});
  // depth and transparent change nothing.
  const Value result = Match(world, source, 3, 4, 8, true);
  ASSERT_TRUE(result.IsObject());
  const Object& picture = result.AsObject();
  const auto size = rt->SizeOfPicture(picture);
  EXPECT_EQ(std::tie(size.width, size.height, size.depth), std::make_tuple(3, 4, 32));
  const std::uint32_t inside = Expected(0x102030);
  const std::uint32_t white = Expected(0xFFFFFF);
  for (int y = 0; y < 4; ++y)
    for (int x = 0; x < 3; ++x)
      EXPECT_TRUE(Near(rt->GetPixel(picture, x, y).rgb, x < 2 && y < 2 ? inside : white)) << x << "," << y;
}

TEST_F(PictureMatchTest, FailuresReturnNilWithTheirCodeAndTrace) {
  Object source = rt->NewPicture(2, 2);
  Object world = World();
  Object empty = rt->New("ColorWorld");
  Object d = Debugger();
  const std::string size = "DebugString:Error: Picture size out of range";
  const std::string build = "DebugString:BuildImageDataFromPicture";
  const struct {
    const Object* world;
    Value picture;
    int width, height;
    int32_t error;  // 0: the operating system's code, whatever it is
    std::vector<std::string> trace;
  } cases[] = {
      {&world, Value(), 2, 2, -1, {build, "DebugString:REALGetPictureGraphics fail", "DebugError:-1,"}},
      {&empty, Value(source), 2, 2, 0, {build, "DebugString:TranslateBitmapBits fail"}},
      {&world, Value(source), 0, 2, -3, {size, "DebugError:-3,"}},
      {&world, Value(source), 2, -1, -3, {size, "DebugError:-3,"}},
      {&world, Value(source), 0x7FFFFFFF, 0x7FFFFFFF, -3, {size, "DebugError:-3,"}},
      {&world, Value(source), 30000, 30000, -3, {size, "DebugError:-3,"}},  // 2.7 GB of pixels
  };
  for (std::size_t i = 0; i < std::size(cases); ++i) {
    SCOPED_TRACE(i);
    const auto& c = cases[i];
    log.entries.clear();
    EXPECT_TRUE(Match(*c.world, c.picture, c.width, c.height).IsNil());
    if (c.error) {
      EXPECT_EQ(Error(), c.error);
      EXPECT_EQ(log.entries, c.trace);
    } else {
      EXPECT_GT(Error(), 0);
      ASSERT_EQ(log.entries.size(), c.trace.size() + 1);
      EXPECT_EQ(std::vector<std::string>(log.entries.begin(), log.entries.end() - 1), c.trace);
      EXPECT_EQ(log.entries.back(), "DebugError:" + std::to_string(Error()) + ",");
    }
  }
}

// A host lacking an entry: the row of the failure table it belongs to.
class PictureWithoutEntryTest : public PictureMatchTest {};

TEST_F(PictureWithoutEntryTest, EachMissingEntryHasItsRow) {
  const struct {
    const char* entry;
    int32_t error;
    std::vector<std::string> trace;
  } cases[] = {
      {"pluginPictureGraphicsGetter", -1,
       {"DebugString:BuildImageDataFromPicture", "DebugString:REALGetPictureGraphics fail", "DebugError:-1,"}},
      {"REALGraphicsDC", -2,
       {"DebugString:BuildImageDataFromPicture", "DebugString:REALGraphicsDC fail", "DebugError:-2,"}},
      {"newPicture", 0, {"DebugString:BuildImageDataFromPicture"}},  // the error is left as it was
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.entry);
    // A fresh plugin, so that no entry is cached from an earlier case.
    log.entries.clear();
    rt.reset();
    options.withheld = {c.entry};
    rt = std::make_unique<host::Runtime>(TINTWELL_PLUGIN_PATH, options);
    Object source = rt->NewPicture(2, 2);
    Object world = World();
    Object d = Debugger();
    // A failure first, whose code a missing new picture must leave alone.
    rt->Call(world, "MatchCMcolor", {Value()});
    log.entries.clear();
    EXPECT_TRUE(Match(world, source, 2, 2).IsNil());
    EXPECT_EQ(log.entries, c.trace);
    EXPECT_EQ(Error(), c.error ? c.error : -1);
    rt->CallGlobal("halvoUnregisterDebugger");
  }
}

}  // namespace
