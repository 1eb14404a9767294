// CMColor through the host: every view over the same 8 bytes, the store rule at its
// edges, and the colour type each setter records.
#include <array>
#include <cmath>
#include <limits>

#include "cmcolor.h"
#include "instance_data.h"
#include "plugin_fixture.h"

namespace {

using host::Object;
using host::Value;

class CMColorTest : public PluginTest {
 protected:
  CMColorTest() : PluginTest("") {}

  std::array<uint16_t, 4> Words(const Object& c) {
    std::array<uint16_t, 4> w{};
    for (int n = 0; n < 4; ++n)
      w[n] = static_cast<uint16_t>(rt->Call(c, "geteight", {2 * n + 1}).AsInteger() |
                                   rt->Call(c, "geteight", {2 * n + 2}).AsInteger() << 8);
    return w;
  }
  int TypeOf(const Object& c) { return GetInstanceData<CMColorData>(c.get(), CMColorClass)->colorType; }
  double D(const Object& c, const char* property) { return rt->Get(c, property).AsDouble(); }
};

TEST(StoreRule, TruncatesThenWrapsWithoutClamping) {
  const struct {
    double in;
    uint16_t word;
  } cases[] = {
      {0.0, 0},          {65535.0, 65535},     {65535.9, 65535}, {65536.0, 0},     {65792.0, 256},
      {-32767.5, 0x8001}, {-0.9, 0},           {-1.0, 0xFFFF},   {2147483647.0, 0xFFFF},
      {2147483648.0, 0}, {-2147483648.0, 0},   {-2147483649.0, 0}, {1e300, 0},
      {std::numeric_limits<double>::quiet_NaN(), 0}, {std::numeric_limits<double>::infinity(), 0},
  };
  for (const auto& c : cases) EXPECT_EQ(StoreRuleWord(c.in), c.word) << c.in;
}

TEST_F(CMColorTest, ANewColourReadsAsZeroInEveryView) {
  Object c = rt->New("CMColor");
  for (const char* p : {"cc", "cm", "cy", "ck", "rr", "rg", "rb", "ll", "hlsh", "hlsl", "hlss", "hsvh", "hsvs",
                        "hsvv", "luvl", "ycapy", "yx", "yy"})
    EXPECT_EQ(D(c, p), 0.0) << p;
  EXPECT_EQ(D(c, "gray"), 1.0);
  for (const char* p : {"la", "lb", "luvu", "luvv"}) EXPECT_EQ(D(c, p), -128.0) << p;
  EXPECT_EQ(rt->Get(c, "col").AsColor().rgb, 0u);
  EXPECT_EQ(rt->Get(c, "namedindex").AsInteger(), 0);
  EXPECT_EQ(TypeOf(c), 0);
}

TEST_F(CMColorTest, EachSetterStoresItsWordAndRecordsItsColourType) {
  const struct {
    const char* property;
    double value;
    int word;
    uint16_t stored;
    int type;
  } cases[] = {
      {"cc", 1.0, 0, 65535, COLOR_CMYK},      {"cm", 0.5, 1, 32767, COLOR_CMYK},
      {"cy", 0.25, 2, 16383, COLOR_CMYK},     {"ck", -0.5, 3, 0x8001, COLOR_CMYK},
      {"rr", 255.0, 0, 65535, COLOR_RGB},     {"rg", 128.0, 1, 32896, COLOR_RGB},
      {"rb", 256.0, 2, 256, COLOR_RGB},       {"ll", 100.0, 0, 65279, COLOR_Lab},
      {"ll", 50.0, 0, 32639, COLOR_Lab},      {"la", 0.0, 1, 0x8000, COLOR_Lab},
      {"lb", -128.0, 2, 0, COLOR_Lab},        {"la", 128.0, 1, 0, COLOR_Lab},
      {"gray", 1.0, 0, 0, COLOR_GRAY},        {"gray", 0.25, 0, 49151, COLOR_GRAY},
      {"hlsh", 1.0, 0, 65535, COLOR_3_CHANNEL}, {"hlsl", 0.5, 1, 32767, COLOR_3_CHANNEL},
      {"hlss", 0.1, 2, 6553, COLOR_3_CHANNEL}, {"hsvh", 0.2, 0, 13107, COLOR_3_CHANNEL},
      {"hsvs", 0.3, 1, 19660, COLOR_3_CHANNEL}, {"hsvv", 0.4, 2, 26214, COLOR_3_CHANNEL},
      {"luvl", 100.0, 0, 65535, COLOR_3_CHANNEL}, {"luvu", 0.0, 1, 0x8000, COLOR_3_CHANNEL},
      {"luvv", 127.99609375, 2, 65535, COLOR_3_CHANNEL}, {"ycapy", 1.0, 0, 65535, COLOR_Yxy},
      {"yx", 0.3127, 1, 20492, COLOR_Yxy},    {"yy", 0.329, 2, 21561, COLOR_Yxy},
  };
  for (const auto& c : cases) {
    Object color = rt->New("CMColor");
    rt->Set(color, c.property, c.value);
    const auto words = Words(color);
    EXPECT_EQ(words[c.word], c.stored) << c.property << " = " << c.value;
    for (int n = 0; n < 4; ++n) {
      if (n == c.word) continue;
      EXPECT_EQ(words[n], 0) << c.property << " touched word " << n;
    }
    EXPECT_EQ(TypeOf(color), c.type) << c.property;
  }
}

TEST_F(CMColorTest, GettersConvertTheSharedWords) {
  Object c = rt->New("CMColor");
  rt->Set(c, "ll", 100.0);
  EXPECT_DOUBLE_EQ(D(c, "ll"), 99.9984681372549);
  rt->Call(c, "seteight", {1, 0x00});
  rt->Call(c, "seteight", {2, 0xFF});  // word 0 = 0xFF00
  EXPECT_EQ(D(c, "ll"), 100.0);
  rt->Set(c, "cc", 1.0);
  EXPECT_EQ(D(c, "rr"), 255.0);
  EXPECT_EQ(D(c, "gray"), 0.0);
  EXPECT_EQ(D(c, "hlsh"), 1.0);
  EXPECT_EQ(D(c, "luvl"), 65535 / 655.35);
  rt->Set(c, "namedindex", -1);
  EXPECT_EQ(Words(c), (std::array<uint16_t, 4>{0xFFFF, 0xFFFF, 0, 0}));
  EXPECT_EQ(D(c, "cc"), 1.0);
  EXPECT_EQ(D(c, "cm"), 1.0);
  EXPECT_EQ(TypeOf(c), COLOR_NAMED);
}

TEST_F(CMColorTest, ColRoundTripsThroughTheRgbWords) {
  Object c = rt->New("CMColor");
  rt->Set(c, "rr", 255.0);
  rt->Set(c, "rg", 128.0);
  rt->Set(c, "rb", 0.0);
  EXPECT_EQ(rt->Get(c, "col").AsColor().rgb, 0xFF8000u);

  Object d = rt->New("CMColor");
  rt->Set(d, "ck", 0.5);  // word 3 and the colour type are left alone by col
  rt->Set(d, "col", host::Color{0xFF8000});
  EXPECT_EQ(D(d, "rr"), 255.0);
  EXPECT_EQ(D(d, "rg"), 128.0);
  EXPECT_EQ(D(d, "rb"), 0.0);
  EXPECT_EQ(Words(d)[3], 32767);
  EXPECT_EQ(TypeOf(d), COLOR_CMYK);
  // A top byte shifts arithmetically into word 0: (0x80FF8000 >> 16) is negative.
  rt->Set(d, "col", host::Color{0x80FF8000u});
  EXPECT_EQ(Words(d)[0], StoreRuleWord(static_cast<double>(static_cast<int32_t>(0x80FF8000u) >> 16) * 257.0));
}

TEST_F(CMColorTest, SetxyzClampsAboveOneAndGetxyzReadsWords) {
  Object c = rt->New("CMColor");
  rt->Call(c, "setxyz", {1.5, 1.0, -0.0});
  EXPECT_EQ(Words(c), (std::array<uint16_t, 4>{0xFFFF, 0xFFFF, 0, 0}));
  EXPECT_EQ(TypeOf(c), COLOR_XYZ);
  rt->Call(c, "setxyz", {0.9642, 1.0, 0.8249});
  EXPECT_EQ(Words(c), (std::array<uint16_t, 4>{63188, 65535, 54059, 0}));
  Value x, y, z;
  rt->Call(c, "getxyz", {host::ByRef(x), host::ByRef(y), host::ByRef(z)});
  EXPECT_EQ(x.AsDouble(), 63188 / 65535.0);
  EXPECT_EQ(y.AsDouble(), 1.0);
  EXPECT_EQ(z.AsDouble(), 54059 / 65535.0);
  rt->Call(c, "setxyz", {-0.5, std::nan(""), 0.5});
  EXPECT_EQ(Words(c), (std::array<uint16_t, 4>{0x8001, 0, 32767, 0}));
}

TEST_F(CMColorTest, ChannelAccessorsRespectTheirChannelCounts) {
  Object c = rt->New("CMColor");
  rt->Call(c, "setfive", {0, 9});
  rt->Call(c, "setfive", {6, 9});
  EXPECT_EQ(Words(c), (std::array<uint16_t, 4>{}));
  EXPECT_EQ(TypeOf(c), 0);  // out of range: nothing changes, not even the type
  rt->Call(c, "seteight", {6, 77});
  EXPECT_EQ(rt->Call(c, "getfive", {6}).AsInteger(), 0);
  EXPECT_EQ(rt->Call(c, "getsix", {6}).AsInteger(), 77);
  EXPECT_EQ(TypeOf(c), COLOR_8_CHANNEL);
  rt->Call(c, "seteight", {8, 255});
  EXPECT_EQ(rt->Call(c, "geteight", {8}).AsInteger(), 255);
  EXPECT_EQ(rt->Call(c, "geteight", {9}).AsInteger(), 0);
  rt->Call(c, "setsix", {2, 300});
  EXPECT_EQ(rt->Call(c, "getsix", {2}).AsInteger(), 44);
  EXPECT_EQ(TypeOf(c), COLOR_6_CHANNEL);
  rt->Call(c, "setseven", {7, 5});
  EXPECT_EQ(TypeOf(c), COLOR_7_CHANNEL);

  rt->Call(c, "setallsix", {1, 2, 3, 4, 5, 6});
  EXPECT_EQ(rt->Get(c, "namedindex").AsInteger(), 0x04030201);
  EXPECT_EQ(rt->Call(c, "getseven", {7}).AsInteger(), 5);  // byte 6 untouched
  EXPECT_EQ(TypeOf(c), COLOR_6_CHANNEL);
  Value n[6];
  rt->Call(c, "getallsix", {host::ByRef(n[0]), host::ByRef(n[1]), host::ByRef(n[2]), host::ByRef(n[3]),
                            host::ByRef(n[4]), host::ByRef(n[5])});
  for (int i = 0; i < 6; ++i) EXPECT_EQ(n[i].AsInteger(), i + 1);
  rt->Call(c, "setallsix", {-1, 256, 0, 0, 0, 0});
  EXPECT_EQ(rt->Call(c, "getsix", {1}).AsInteger(), 255);
  EXPECT_EQ(rt->Call(c, "getsix", {2}).AsInteger(), 0);
}

TEST_F(CMColorTest, ResetAndCopyMoveTheBytesButNotTheType) {
  Object a = rt->New("CMColor");
  rt->Set(a, "namedindex", 7);
  rt->Call(a, "reset");
  EXPECT_EQ(Words(a), (std::array<uint16_t, 4>{}));
  EXPECT_EQ(D(a, "la"), -128.0);
  EXPECT_EQ(TypeOf(a), COLOR_NAMED);

  Object src = rt->New("CMColor");
  rt->Set(src, "cc", 0.5);
  rt->Set(src, "ck", 1.0);
  Object copied = rt->New("CMColor", {src});
  EXPECT_EQ(Words(copied), Words(src));
  EXPECT_EQ(TypeOf(copied), 0);
  Object b = rt->New("CMColor");
  rt->Set(b, "gray", 0.0);
  rt->Call(b, "copy", {src});
  EXPECT_EQ(Words(b), Words(src));
  EXPECT_EQ(TypeOf(b), COLOR_GRAY);
  // A nil source leaves the object as it was.
  rt->Call(b, "copy", {nullptr});
  EXPECT_EQ(Words(b), Words(src));
  Object fromNil = rt->New("CMColor", {nullptr});
  EXPECT_EQ(Words(fromNil), (std::array<uint16_t, 4>{}));
}

}  // namespace
