#include "blank_template.h"

#include <cmath>
#include <cstdio>
#include <cstring>

#include "tag_io.h"
#include "win32_api.h"

namespace {

constexpr char kTemplateName[] = "blank.icc";
constexpr uint32_t kTypeLut16 = 0x6D667432;  // 'mft2'
constexpr double kGamma = 2.2;
constexpr int kCurveEntries = 256;

// D50 and the sRGB primaries adapted to it: the colorant tags, and the columns of the
// matrix from linear RGB to XYZ that the lut tables follow.
constexpr double kWhite[3] = {0.9642, 1.0, 0.8249};
constexpr double kColorants[3][3] = {{0.4361, 0.2225, 0.0139}, {0.3851, 0.7169, 0.0971}, {0.1431, 0.0606, 0.7141}};

uint32_t Sig(const char (&s)[5]) {
  return static_cast<uint32_t>(static_cast<uint8_t>(s[0])) << 24 | static_cast<uint32_t>(static_cast<uint8_t>(s[1])) << 16 |
         static_cast<uint32_t>(static_cast<uint8_t>(s[2])) << 8 | static_cast<uint8_t>(s[3]);
}

uint16_t Word(double unit) {
  const double clamped = unit < 0 ? 0 : unit > 1 ? 1 : unit;
  return static_cast<uint16_t>(std::lround(clamped * 65535.0));
}

// One tag's bytes, appended piece by piece in big-endian order.
class Bytes {
 public:
  void U8(uint8_t v) { b_.push_back(v); }
  void U16(uint16_t v) {
    b_.resize(b_.size() + 2);
    StoreU16(&b_[b_.size() - 2], v);
  }
  void U32(uint32_t v) {
    b_.resize(b_.size() + 4);
    StoreU32(&b_[b_.size() - 4], v);
  }
  void S15(double v) {
    b_.resize(b_.size() + 4);
    StoreS15Fixed16(&b_[b_.size() - 4], v);
  }
  void Text(const char* text) { b_.insert(b_.end(), text, text + std::strlen(text) + 1); }
  void Zeros(std::size_t n) { b_.resize(b_.size() + n, 0); }
  std::vector<uint8_t>& bytes() { return b_; }

 private:
  std::vector<uint8_t> b_;
};

Bytes Description(const char* text) {
  Bytes t;
  t.U32(kTypeDesc);
  t.U32(0);
  t.U32(static_cast<uint32_t>(std::strlen(text) + 1));
  t.Text(text);
  t.U32(0);  // Unicode language code
  t.U32(0);  // Unicode count
  t.U16(0);  // ScriptCode code
  t.U8(0);   // ScriptCode count
  t.Zeros(67);
  return t;
}

Bytes Copyright(const char* text) {
  Bytes t;
  t.U32(kTypeText);
  t.U32(0);
  t.Text(text);
  return t;
}

Bytes XYZ(const double (&xyz)[3]) {
  Bytes t;
  t.U32(kTypeXYZ);
  t.U32(0);
  for (double v : xyz) t.S15(v);
  return t;
}

Bytes Gamma() {
  Bytes t;
  t.U32(kTypeCurve);
  t.U32(0);
  t.U32(1);
  t.U16(static_cast<uint16_t>(std::lround(kGamma * 256)));  // u8Fixed8
  return t;
}

// The lut16 frame shared by both directions: 3 channels in and out, a 2-point grid.
void LutHeader(Bytes& t, const double (&matrix)[3][3], uint16_t inEntries, uint16_t outEntries) {
  t.U32(kTypeLut16);
  t.U32(0);
  t.U8(3);
  t.U8(3);
  t.U8(2);
  t.U8(0);
  for (const auto& row : matrix)
    for (double e : row) t.S15(e);
  t.U16(inEntries);
  t.U16(outEntries);
}

void Curves(Bytes& t, int entries, double exponent) {
  for (int c = 0; c < 3; ++c)
    for (int i = 0; i < entries; ++i) t.U16(Word(std::pow(i / double(entries - 1), exponent)));
}

void IdentityCurves(Bytes& t) {
  for (int c = 0; c < 3; ++c) {
    t.U16(0);
    t.U16(65535);
  }
}

// Device RGB to PCS XYZ: gamma decoding in the input tables, the colorant matrix in the
// grid (exact at its corners, as the mixture is linear), XYZ words as u1Fixed15.
Bytes AToB() {
  static const double identity[3][3] = {{1, 0, 0}, {0, 1, 0}, {0, 0, 1}};
  Bytes t;
  LutHeader(t, identity, kCurveEntries, 2);
  Curves(t, kCurveEntries, kGamma);
  for (int r = 0; r < 2; ++r)
    for (int g = 0; g < 2; ++g)
      for (int b = 0; b < 2; ++b)
        for (int c = 0; c < 3; ++c) {
          const double v = r * kColorants[0][c] + g * kColorants[1][c] + b * kColorants[2][c];
          t.U16(static_cast<uint16_t>(std::lround(std::fmin(v * 32768.0, 65535.0))));
        }
  IdentityCurves(t);
  return t;
}

// PCS XYZ to device RGB: the inverse colorant matrix in the lut's matrix (which works on
// the encoded XYZ, hence the factor from u1Fixed15 to the unit range), an identity grid,
// and gamma encoding in the output tables.
Bytes BToA() {
  const double (&m)[3][3] = kColorants;  // m[column][row]: colorant c's X, Y, Z
  const double a = m[0][0], b = m[1][0], c = m[2][0];
  const double d = m[0][1], e = m[1][1], f = m[2][1];
  const double g = m[0][2], h = m[1][2], k = m[2][2];
  const double det = a * (e * k - f * h) - b * (d * k - f * g) + c * (d * h - e * g);
  const double scale = 65535.0 / 32768.0 / det;
  const double inverse[3][3] = {{(e * k - f * h) * scale, (c * h - b * k) * scale, (b * f - c * e) * scale},
                                {(f * g - d * k) * scale, (a * k - c * g) * scale, (c * d - a * f) * scale},
                                {(d * h - e * g) * scale, (b * g - a * h) * scale, (a * e - b * d) * scale}};
  Bytes t;
  LutHeader(t, inverse, 2, kCurveEntries);
  IdentityCurves(t);
  for (int r = 0; r < 2; ++r)
    for (int gr = 0; gr < 2; ++gr)
      for (int bl = 0; bl < 2; ++bl) {
        t.U16(r ? 65535 : 0);
        t.U16(gr ? 65535 : 0);
        t.U16(bl ? 65535 : 0);
      }
  Curves(t, kCurveEntries, 1.0 / kGamma);
  return t;
}

struct Tag {
  uint32_t signature;
  Bytes data;
};

}  // namespace

std::vector<uint8_t> BlankTemplateBytes() {
  Tag tags[] = {
      {Sig("desc"), Description("Blank RGB profile")},
      {Sig("cprt"), Copyright("No copyright, use freely")},
      {Sig("wtpt"), XYZ(kWhite)},
      {Sig("rXYZ"), XYZ(kColorants[0])},
      {Sig("gXYZ"), XYZ(kColorants[1])},
      {Sig("bXYZ"), XYZ(kColorants[2])},
      {Sig("rTRC"), Gamma()},
      {Sig("gTRC"), Gamma()},
      {Sig("bTRC"), Gamma()},
      {Sig("A2B0"), AToB()},
      {Sig("B2A0"), BToA()},
  };
  const uint32_t count = sizeof tags / sizeof tags[0];
  Bytes file;
  file.Zeros(128);
  file.U32(count);
  file.Zeros(12 * count);
  std::vector<uint8_t>& out = file.bytes();
  for (uint32_t i = 0; i < count; ++i) {
    const std::vector<uint8_t>& data = tags[i].data.bytes();
    uint8_t* entry = &out[132 + 12 * i];
    StoreU32(entry, tags[i].signature);
    StoreU32(entry + 4, static_cast<uint32_t>(out.size()));
    StoreU32(entry + 8, static_cast<uint32_t>(data.size()));
    out.insert(out.end(), data.begin(), data.end());
    out.resize((out.size() + 3) & ~std::size_t{3}, 0);  // every tag starts on a 4-byte boundary
  }
  uint8_t* h = out.data();
  StoreU32(h + 0, static_cast<uint32_t>(out.size()));
  StoreU32(h + 8, 0x02100000u);  // version 2.1
  StoreU32(h + 12, Sig("mntr"));
  StoreU32(h + 16, Sig("RGB "));
  StoreU32(h + 20, Sig("XYZ "));
  const uint16_t date[6] = {2000, 1, 1, 0, 0, 0};  // fixed, so every build makes the same bytes
  for (int i = 0; i < 6; ++i) StoreU16(h + 24 + 2 * i, date[i]);
  StoreU32(h + 36, Sig("acsp"));
  for (int i = 0; i < 3; ++i) StoreS15Fixed16(h + 68 + 4 * i, kWhite[i]);
  return out;
}

bool PlaceBlankTemplate(const char* folder, const char* stagingFolder) {
  char target[MAX_PATH];
  char staged[MAX_PATH];
  const int n = std::snprintf(target, sizeof target, "%s%s", folder, kTemplateName);
  const int m = std::snprintf(staged, sizeof staged, "%s%s", stagingFolder, kTemplateName);
  if (!folder[0] || !stagingFolder[0] || n <= 0 || m <= 0 || static_cast<std::size_t>(n) >= sizeof target ||
      static_cast<std::size_t>(m) >= sizeof staged)
    return false;
  WIN32_FIND_DATAA found;
  HANDLE existing = FindFirstFileA(target, &found);
  if (existing != INVALID_HANDLE_VALUE) {
    FindClose(existing);
    return true;
  }
  const std::vector<uint8_t> bytes = BlankTemplateBytes();
  HANDLE h = CreateFileA(staged, GENERIC_WRITE, 0, nullptr, CREATE_ALWAYS, FILE_ATTRIBUTE_NORMAL, nullptr);
  if (h == INVALID_HANDLE_VALUE) return false;
  DWORD written = 0;
  const bool whole = WriteFile(h, bytes.data(), static_cast<DWORD>(bytes.size()), &written, nullptr) &&
                     written == bytes.size();
  // Without replacing: a template that appeared meanwhile is the user's, and wins.
  if (CloseHandle(h) && whole && MoveFileExA(staged, target, MOVEFILE_WRITE_THROUGH)) return true;
  DeleteFileA(staged);
  return false;
}
