// Profiles in PNG, JPEG and TIFF files through the plugin: counting, the space,
// embedding without touching the pixels, extracting to a Profile, and hostile files.
#include <zlib.h>

#include <set>

#include "image_files.h"
#include "plugin_fixture.h"
#include "profile_files.h"
#include "win32_paths.h"

namespace {

using host::Object;
using testimage::Bytes;
using testimage::Kind;

constexpr int32_t kNotAnImage = -30, kHasProfile = -32, kNotEmbedded = -33;

Bytes SystemProfile(const std::string& name) { return testimage::ReadFile(std::string(TINTWELL_ICC_DIR) + "/" + name); }

class ImageProfiles : public PluginTest {
 protected:
  Object Item(const std::string& name) { return rt->MakeFolderItem(files.Path(name)); }
  int32_t Count(const std::string& name) { return rt->CallGlobal("ImageProfileCount", {Item(name)}).AsInteger(); }
  host::Value Space(const std::string& name) { return rt->CallGlobal("GetImageSpace", {Item(name)}); }
  bool Embed(const std::string& from, const std::string& to, bool replace, const Object& p) {
    return rt->CallGlobal("EmbedImage", {Item(from), Item(to), replace, p}).AsBoolean();
  }
  std::set<std::string> Listing() { return ProfileFiles::Listing(files.Path("")); }

  ProfileFiles files;
};

struct Case {
  Kind kind;
  const char* name;
  int channels;
  const char* space;    // the image's, and its profile's
  const char* profile;  // fits the image's space
};
const Case kCases[] = {
    {Kind::Png, "rgb.png", 3, "RGB ", "sRGB.icc"},
    {Kind::Png, "gray.png", 1, "GRAY", "Gray.icc"},
    {Kind::Jpeg, "rgb.jpg", 3, "RGB ", "sRGB.icc"},
    {Kind::Jpeg, "gray.jpg", 1, "GRAY", "Gray.icc"},
    {Kind::Jpeg, "cmyk.jpg", 4, "CMYK", "ghostscript/default_cmyk.icc"},
    {Kind::Tiff, "rgb.tif", 3, "RGB ", "sRGB.icc"},
    {Kind::Tiff, "cmyk.tif", 4, "CMYK", "ghostscript/default_cmyk.icc"},
    {Kind::BigTiff, "gray.btf", 1, "GRAY", "Gray.icc"},
};

// Embedding keeps the pixels and writes the profile byte for byte; a second embedding
// without replace writes nothing; GetImageProfile's copy goes with its object.
TEST_F(ImageProfiles, EmbedReadBackAndExtractInEachFormat) {
  const Bytes lab = SystemProfile("ITULab.icc");  // large: spans several JPEG markers
  for (const Case& c : kCases) {
    SCOPED_TRACE(c.name);
    const std::string plain = std::string("plain-") + c.name, with = std::string("with-") + c.name;
    testimage::Make(c.kind, files.Path(plain), 37, 23, c.channels, {});
    EXPECT_EQ(Count(plain), 0);
    EXPECT_EQ(Error(), 0);
    EXPECT_EQ(Space(plain).AsString(), c.space);

    const Bytes profileBytes = SystemProfile(c.profile);
    Object p = rt->New("Profile", {rt->MakeFolderItem(files.Copy(c.profile, "p.icc"))});
    ASSERT_TRUE(Embed(plain, with, false, p));
    EXPECT_EQ(Error(), 0);
    const testimage::Image before = testimage::Read(c.kind, files.Path(plain));
    const testimage::Image after = testimage::Read(c.kind, files.Path(with));
    ASSERT_TRUE(after.ok);
    EXPECT_EQ(after.icc, profileBytes);
    EXPECT_EQ(after.samples, before.samples);
    EXPECT_EQ(Count(with), 1);
    EXPECT_EQ(Space(with).AsString(), c.space);

    // Without replace: False, and the file is left as it is.
    const Bytes written = testimage::ReadFile(files.Path(with));
    EXPECT_FALSE(Embed(with, with, false, p));
    EXPECT_EQ(Error(), kHasProfile);
    EXPECT_EQ(testimage::ReadFile(files.Path(with)), written);

    // Extracting: a Profile on a copy of the embedded bytes, deleted with the object.
    Object got = rt->CallGlobal("GetImageProfile", {Item(with), 1}).AsObject();
    EXPECT_EQ(rt->Get(got, "ColorSpace").AsString(), c.space);
    const std::string copy = *win32::PosixPathFromWindows(rt->FolderItemPath(rt->Get(got, "Location").AsObject()));
    EXPECT_EQ(testimage::ReadFile(copy), profileBytes);
    got = Object();
    EXPECT_FALSE(ProfileFiles::Exists(copy)) << "deleted with its object";
    for (int index : {0, 2, -1}) EXPECT_TRUE(rt->CallGlobal("GetImageProfile", {Item(with), index}).IsNil());
    EXPECT_TRUE(rt->CallGlobal("GetImageProfile", {Item(plain), 1}).IsNil());

    // Replacing, with a profile that fits every space: the new one alone is embedded.
    if (c.kind != Kind::Png) {
      Object q = rt->New("Profile", {rt->MakeFolderItem(files.Copy("ITULab.icc", "lab.icc"))});
      ASSERT_TRUE(Embed(with, with, true, q));
      const testimage::Image replaced = testimage::Read(c.kind, files.Path(with));
      EXPECT_EQ(replaced.icc, lab);
      EXPECT_EQ(replaced.samples, before.samples);
    }
  }
  EXPECT_EQ(Listing().count("p.icc"), 1u);
  for (const std::string& name : Listing()) EXPECT_EQ(name.find(".tmp"), std::string::npos) << name;
}

// A PNG reader drops a profile of another space than the image's: such an embedding
// fails and writes nothing. So does one with no usable profile.
TEST_F(ImageProfiles, EmbeddingRefusesWhatCouldNotBeReadBackAndWritesNothing) {
  testimage::Make(Kind::Png, files.Path("gray.png"), 8, 8, 1, {});
  testimage::WriteFile(files.Path("out.png"), Bytes{'k', 'e', 'e', 'p'});
  Object rgb = rt->New("Profile", {rt->MakeFolderItem(files.Copy("sRGB.icc", "s.icc"))});
  EXPECT_FALSE(Embed("gray.png", "out.png", false, rgb));
  EXPECT_EQ(Error(), kNotEmbedded);
  EXPECT_FALSE(rt->CallGlobal("EmbedImage", {Item("gray.png"), Item("out.png"), true, nullptr}).AsBoolean());
  Object empty = rt->New("Profile", {Item("missing.icc")});
  EXPECT_FALSE(Embed("gray.png", "out.png", true, empty));
  testimage::Make(Kind::Png, files.Path("rgb.png"), 8, 8, 3, {});
  EXPECT_FALSE(Embed("rgb.png", "nofolder/out.png", true, rgb));
  EXPECT_EQ(Error(), 3);  // ERROR_PATH_NOT_FOUND
  EXPECT_EQ(testimage::ReadFile(files.Path("out.png")), (Bytes{'k', 'e', 'e', 'p'}));
  EXPECT_EQ(Listing(), (std::set<std::string>{"gray.png", "rgb.png", "out.png", "s.icc"}));
}

// JPEG profile pieces: any order is joined by sequence number; a set with a piece
// missing, repeated, numbered past its count or with differing counts is refused.
TEST_F(ImageProfiles, JpegPiecesAreJoinedInOrderAndInconsistentSetsRefused) {
  const Bytes profile = SystemProfile("sRGB.icc");
  const std::size_t half = profile.size() / 2;
  auto piece = [&](int sequence, int count, std::size_t from, std::size_t to) {
    Bytes m = {'I', 'C', 'C', '_', 'P', 'R', 'O', 'F', 'I', 'L', 'E', 0};
    m.push_back(static_cast<std::uint8_t>(sequence));
    m.push_back(static_cast<std::uint8_t>(count));
    m.insert(m.end(), profile.begin() + from, profile.begin() + to);
    return m;
  };
  const Bytes first = piece(1, 2, 0, half), second = piece(2, 2, half, profile.size());
  const struct {
    std::vector<Bytes> markers;
    int32_t count;
  } cases[] = {
      {{second, first}, 1},
      {{first}, -1},
      {{first, first, second}, -1},
      {{first, piece(2, 3, half, profile.size())}, -1},
      {{piece(0, 1, 0, profile.size())}, -1},
      {{first, piece(3, 2, half, profile.size())}, -1},
      {{piece(1, 0, 0, profile.size())}, -1},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.markers.size());
    testimage::Make(Kind::Jpeg, files.Path("m.jpg"), 16, 16, 3, {}, c.markers);
    EXPECT_EQ(Count("m.jpg"), c.count);
    if (c.count == 1) {
      Object got = rt->CallGlobal("GetImageProfile", {Item("m.jpg"), 1}).AsObject();
      const auto copy = win32::PosixPathFromWindows(rt->FolderItemPath(rt->Get(got, "Location").AsObject()));
      EXPECT_EQ(testimage::ReadFile(*copy), profile);
    } else {
      EXPECT_EQ(Error(), kNotAnImage);
      EXPECT_EQ(Space("m.jpg").AsString(), "");  // nil reads as empty
    }
  }
}

Bytes PngChunk(const char* type, const Bytes& data) {
  Bytes out;
  for (int s = 24; s >= 0; s -= 8) out.push_back(static_cast<std::uint8_t>(data.size() >> s));
  out.insert(out.end(), type, type + 4);
  out.insert(out.end(), data.begin(), data.end());
  const uLong crc = crc32(0, out.data() + 4, static_cast<uInt>(data.size() + 4));
  for (int s = 24; s >= 0; s -= 8) out.push_back(static_cast<std::uint8_t>(crc >> s));
  return out;
}

// Damaged and hostile files: each is refused whole, by every entry, and an embedding
// from one leaves its destination as it was.
TEST_F(ImageProfiles, HostileFilesAreRefusedCleanly) {
  const Bytes srgb = SystemProfile("sRGB.icc");
  testimage::Make(Kind::Png, files.Path("a.png"), 40, 40, 3, srgb);
  testimage::Make(Kind::Jpeg, files.Path("a.jpg"), 40, 40, 3, srgb);
  testimage::Make(Kind::Tiff, files.Path("a.tif"), 40, 40, 3, srgb);
  const Bytes png = testimage::ReadFile(files.Path("a.png"));
  const Bytes jpg = testimage::ReadFile(files.Path("a.jpg"));
  const Bytes tif = testimage::ReadFile(files.Path("a.tif"));

  // A PNG whose iCCP inflates to 64 MiB, and claims 4 GB in its profile header.
  Bytes bomb(std::size_t{64} << 20, 0);
  bomb[0] = bomb[1] = bomb[2] = 0xFF;
  uLongf packedSize = compressBound(static_cast<uLong>(bomb.size()));
  Bytes packed(packedSize);
  compress2(packed.data(), &packedSize, bomb.data(), static_cast<uLong>(bomb.size()), 1);
  packed.resize(packedSize);
  Bytes iccp = {'i', 'c', 'c', 0, 0};
  iccp.insert(iccp.end(), packed.begin(), packed.end());
  Bytes pngBomb(png.begin(), png.begin() + 33);  // signature and IHDR
  const Bytes chunk = PngChunk("iCCP", iccp);
  pngBomb.insert(pngBomb.end(), chunk.begin(), chunk.end());
  std::vector<std::uint8_t> rest;
  for (std::size_t at = 33; at + 8 <= png.size();) {  // the other chunks, without the original iCCP
    const std::size_t length = (std::size_t{png[at]} << 24) | (png[at + 1] << 16) | (png[at + 2] << 8) | png[at + 3];
    if (std::string(png.begin() + at + 4, png.begin() + at + 8) != "iCCP")
      pngBomb.insert(pngBomb.end(), png.begin() + at, png.begin() + at + 12 + length);
    at += 12 + length;
  }

  // A JPEG marker whose length runs past the end of the file.
  Bytes jpgLong(jpg.begin(), jpg.begin() + 2);
  jpgLong.insert(jpgLong.end(), {0xFF, 0xE2, 0xFF, 0xF0, 'I', 'C', 'C'});

  // A TIFF whose profile tag claims 2^31 bytes.
  Bytes tifHuge = tif;
  const std::uint32_t ifd = tif[4] | (tif[5] << 8) | (tif[6] << 16) | (std::uint32_t{tif[7]} << 24);
  const unsigned entries = tif[ifd] | (tif[ifd + 1] << 8);
  bool patched = false;
  for (unsigned i = 0; i < entries; ++i) {
    std::uint8_t* e = &tifHuge[ifd + 2 + 12 * i];
    if ((e[0] | (e[1] << 8)) == 34675) {
      e[4] = e[5] = e[6] = 0;
      e[7] = 0x80;
      patched = true;
    }
  }
  ASSERT_TRUE(patched);

  Bytes pngBadCrc = png;
  pngBadCrc[40] ^= 1;
  const struct {
    const char* name;
    Bytes bytes;
  } cases[] = {
      {"png-truncated", Bytes(png.begin(), png.end() - 5)},
      {"png-bad-crc", pngBadCrc},
      {"png-bomb", pngBomb},
      {"jpg-truncated-header", Bytes(jpg.begin(), jpg.begin() + 300)},
      {"jpg-long-marker", jpgLong},
      {"tif-truncated", Bytes(tif.begin(), tif.begin() + 100)},
      {"tif-huge-count", tifHuge},
      {"empty", Bytes()},
      {"text", Bytes{'h', 'e', 'l', 'l', 'o'}},
  };
  Object p = rt->New("Profile", {rt->MakeFolderItem(files.Copy("sRGB.icc", "p.icc"))});
  testimage::WriteFile(files.Path("dest"), Bytes{'k', 'e', 'e', 'p'});
  for (const auto& c : cases) {
    SCOPED_TRACE(c.name);
    testimage::WriteFile(files.Path(c.name), c.bytes);
    EXPECT_EQ(Count(c.name), -1);
    EXPECT_EQ(Error(), kNotAnImage);
    EXPECT_EQ(Space(c.name).AsString(), "");  // nil reads as empty
    EXPECT_TRUE(rt->CallGlobal("GetImageProfile", {Item(c.name), 1}).IsNil());
    EXPECT_FALSE(Embed(c.name, "dest", true, p));
    EXPECT_EQ(testimage::ReadFile(files.Path("dest")), (Bytes{'k', 'e', 'e', 'p'}));
  }
  EXPECT_EQ(Count("missing.png"), -1);

  // Images whose metadata are whole but whose data is not read, and are not embedded
  // into: a JPEG cut short in its scan, a TIFF with a strip of no bytes.
  Bytes tifEmptyStrip = tif;
  for (unsigned i = 0; i < entries; ++i) {
    const std::uint8_t* e = &tif[ifd + 2 + 12 * i];
    if ((e[0] | (e[1] << 8)) != 279) continue;  // StripByteCounts: LONG values, out of line
    const std::uint32_t at = e[8] | (e[9] << 8) | (e[10] << 16) | (std::uint32_t{e[11]} << 24);
    tifEmptyStrip[at] = tifEmptyStrip[at + 1] = tifEmptyStrip[at + 2] = tifEmptyStrip[at + 3] = 0;
  }
  testimage::WriteFile(files.Path("cut.jpg"), Bytes(jpg.begin(), jpg.end() - 200));
  testimage::WriteFile(files.Path("strip.tif"), tifEmptyStrip);
  for (const char* name : {"cut.jpg", "strip.tif"}) {
    SCOPED_TRACE(name);
    EXPECT_EQ(Count(name), 1);
    EXPECT_FALSE(Embed(name, "dest", true, p));
    EXPECT_EQ(Error(), kNotEmbedded);
    EXPECT_EQ(testimage::ReadFile(files.Path("dest")), (Bytes{'k', 'e', 'e', 'p'}));
  }
}

}  // namespace
