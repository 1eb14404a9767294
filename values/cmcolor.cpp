#include "cmcolor.h"

#include <cmath>
#include <cstring>

#include "class_tables.h"
#include "instance_data.h"

namespace {

CMColorData* Data(REALobject self) { return GetInstanceData<CMColorData>(self, CMColorClass); }

uint8_t* Bytes(REALobject self) { return reinterpret_cast<uint8_t*>(&Data(self)->value); }

uint16_t Word(REALobject self, int n) {
  uint16_t w;
  std::memcpy(&w, Bytes(self) + 2 * n, sizeof w);
  return w;
}

void PutWord(REALobject self, int n, uint16_t w) { std::memcpy(Bytes(self) + 2 * n, &w, sizeof w); }

// Conversions between a script's Double and a stored word, one per kind of property.
struct Unit {  // CMYK, HLS, HSV, Yxy: 0 … 1
  static double Get(uint16_t w) { return w / 65535.0; }
  static double Set(double v) { return v * 65535.0; }
};
struct Rgb {  // 0 … 255
  static double Get(uint16_t w) { return w / 257.0; }
  static double Set(double v) { return v * 257.0; }
};
struct LabL {  // 0 … 100 against 0 … 0xFF00
  static double Get(uint16_t w) { return w / 652.8; }
  static double Set(double v) { return v * 652.8; }
};
struct Signed {  // Lab a, b and Luv u, v: −128 … 127.996, 0 at 0x8000
  static double Get(uint16_t w) { return w / 256.0 - 128.0; }
  static double Set(double v) { return (v + 128.0) * 256.0; }
};
struct Gray {  // 1.0 is stored as 0
  static double Get(uint16_t w) { return 1.0 - w / 65535.0; }
  static double Set(double v) { return (1.0 - v) * 65535.0; }
};
struct LuvL {  // 0 … 100 against 0 … 65535
  static double Get(uint16_t w) { return w / 655.35; }
  static double Set(double v) { return v * 655.35; }
};

template <class Conversion, int N>
double GetWord(REALobject self, intptr_t) {
  return Conversion::Get(Word(self, N));
}

template <class Conversion, int N, uint8_t Type>
void SetWord(REALobject self, intptr_t, double v) {
  PutWord(self, N, StoreRuleWord(Conversion::Set(v)));
  Data(self)->colorType = Type;
}

uint32_t GetCol(REALobject self, intptr_t) {
  return static_cast<uint32_t>(Word(self, 0) >> 8) << 16 | static_cast<uint32_t>(Word(self, 1) >> 8) << 8 |
         static_cast<uint32_t>(Word(self, 2) >> 8);
}

void SetCol(REALobject self, intptr_t, uint32_t color) {
  const int32_t c = static_cast<int32_t>(color);
  PutWord(self, 0, StoreRuleWord((c >> 16) * 257.0));
  PutWord(self, 1, StoreRuleWord(((c >> 8) & 0xFF) * 257.0));
  PutWord(self, 2, StoreRuleWord((c & 0xFF) * 257.0));
}

int32_t GetNamedIndex(REALobject self, intptr_t) {
  int32_t index;
  std::memcpy(&index, Bytes(self), sizeof index);
  return index;
}

void SetNamedIndex(REALobject self, intptr_t, int32_t index) {
  std::memcpy(Bytes(self), &index, sizeof index);
  Data(self)->colorType = COLOR_NAMED;
}

void ConstructEmpty(REALobject) {}

// Serves both the copying constructor and copy(): takes c's 8 bytes, not its type.
void CopyColor(REALobject self, REALobject c) {
  if (!c) return;
  std::memcpy(Bytes(self), Bytes(c), sizeof(COLOR));
}

void GetXYZ(REALobject self, double* x, double* y, double* z) {
  *x = Word(self, 0) / 65535.0;
  *y = Word(self, 1) / 65535.0;
  *z = Word(self, 2) / 65535.0;
}

uint16_t XYZWord(double v) { return v > 1.0 ? 0xFFFF : StoreRuleWord(v * 65535.0); }

void SetXYZ(REALobject self, double x, double y, double z) {
  Data(self)->colorType = COLOR_XYZ;
  PutWord(self, 0, XYZWord(x));
  PutWord(self, 1, XYZWord(y));
  PutWord(self, 2, XYZWord(z));
}

void Reset(REALobject self) { std::memset(Bytes(self), 0, sizeof(COLOR)); }

// Channel accessors for five to eight one-byte channels, numbered from 1.
template <int Channels>
int32_t GetChannel(REALobject self, int32_t num) {
  return num >= 1 && num <= Channels ? Bytes(self)[num - 1] : 0;
}

template <int Channels, uint8_t Type>
void SetChannel(REALobject self, int32_t num, int32_t value) {
  if (num < 1 || num > Channels) return;
  Data(self)->colorType = Type;
  Bytes(self)[num - 1] = static_cast<uint8_t>(value & 0xFF);
}

void GetAllSix(REALobject self, int32_t* n1, int32_t* n2, int32_t* n3, int32_t* n4, int32_t* n5, int32_t* n6) {
  int32_t* const out[] = {n1, n2, n3, n4, n5, n6};
  for (int i = 0; i < 6; ++i) *out[i] = Bytes(self)[i];
}

void SetAllSix(REALobject self, int32_t n1, int32_t n2, int32_t n3, int32_t n4, int32_t n5, int32_t n6) {
  Data(self)->colorType = COLOR_6_CHANNEL;
  const int32_t in[] = {n1, n2, n3, n4, n5, n6};
  for (int i = 0; i < 6; ++i) Bytes(self)[i] = static_cast<uint8_t>(in[i] & 0xFF);
}

// A Double property over one word, with the colour type its setter records.
template <class Conversion, int N, uint8_t Type>
REALproperty DoubleProperty(const char* name) {
  return {nullptr, name, "Double", 0, AsProc(&GetWord<Conversion, N>), AsProc(&SetWord<Conversion, N, Type>),
          0,       0,    0,        0};
}

REALproperty properties[] = {
    DoubleProperty<Unit, 0, COLOR_CMYK>("cc"),
    DoubleProperty<Unit, 1, COLOR_CMYK>("cm"),
    DoubleProperty<Unit, 2, COLOR_CMYK>("cy"),
    DoubleProperty<Unit, 3, COLOR_CMYK>("ck"),
    DoubleProperty<Rgb, 0, COLOR_RGB>("rr"),
    DoubleProperty<Rgb, 1, COLOR_RGB>("rg"),
    DoubleProperty<Rgb, 2, COLOR_RGB>("rb"),
    {nullptr, "col", "Color", 0, AsProc(&GetCol), AsProc(&SetCol), 0, 0, 0, 0},
    {nullptr, "namedindex", "Integer", 0, AsProc(&GetNamedIndex), AsProc(&SetNamedIndex), 0, 0, 0, 0},
    DoubleProperty<LabL, 0, COLOR_Lab>("ll"),
    DoubleProperty<Signed, 1, COLOR_Lab>("la"),
    DoubleProperty<Signed, 2, COLOR_Lab>("lb"),
    DoubleProperty<Gray, 0, COLOR_GRAY>("gray"),
    DoubleProperty<Unit, 0, COLOR_3_CHANNEL>("hlsh"),
    DoubleProperty<Unit, 1, COLOR_3_CHANNEL>("hlsl"),
    DoubleProperty<Unit, 2, COLOR_3_CHANNEL>("hlss"),
    DoubleProperty<Unit, 0, COLOR_3_CHANNEL>("hsvh"),
    DoubleProperty<Unit, 1, COLOR_3_CHANNEL>("hsvs"),
    DoubleProperty<Unit, 2, COLOR_3_CHANNEL>("hsvv"),
    DoubleProperty<LuvL, 0, COLOR_3_CHANNEL>("luvl"),
    DoubleProperty<Signed, 1, COLOR_3_CHANNEL>("luvu"),
    DoubleProperty<Signed, 2, COLOR_3_CHANNEL>("luvv"),
    DoubleProperty<Unit, 0, COLOR_Yxy>("ycapy"),
    DoubleProperty<Unit, 1, COLOR_Yxy>("yx"),
    DoubleProperty<Unit, 2, COLOR_Yxy>("yy"),
};

REALmethodDefinition methods[] = {
    {AsProc(&ConstructEmpty), nullptr, "CMColor()"},
    {AsProc(&CopyColor), nullptr, "CMColor(c as CMColor)"},
    {AsProc(&CopyColor), nullptr, "copy(c as CMColor)"},
    {AsProc(&GetXYZ), nullptr, "getxyz(byref x as double, byref y as double, byref z as double)"},
    {AsProc(&SetXYZ), nullptr, "setxyz(x as double, y as double, z as double)"},
    {AsProc(&Reset), nullptr, "reset()"},
    {AsProc(&GetChannel<5>), nullptr, "getfive(num as Integer) as Integer"},
    {AsProc(&SetChannel<5, COLOR_5_CHANNEL>), nullptr, "setfive(num as Integer, value as Integer)"},
    {AsProc(&GetChannel<6>), nullptr, "getsix(num as Integer) as Integer"},
    {AsProc(&SetChannel<6, COLOR_6_CHANNEL>), nullptr, "setsix(num as Integer, value as Integer)"},
    {AsProc(&GetChannel<7>), nullptr, "getseven(num as Integer) as Integer"},
    {AsProc(&SetChannel<7, COLOR_7_CHANNEL>), nullptr, "setseven(num as Integer, value as Integer)"},
    {AsProc(&GetChannel<8>), nullptr, "geteight(num as Integer) as Integer"},
    {AsProc(&SetChannel<8, COLOR_8_CHANNEL>), nullptr, "seteight(num as Integer, value as Integer)"},
    {AsProc(&GetAllSix), nullptr,
     "getallsix(byref n1 as integer, byref n2 as integer, byref n3 as integer, byref n4 as integer, "
     "byref n5 as integer, byref n6 as integer)"},
    {AsProc(&SetAllSix), nullptr,
     "setallsix(n1 as integer, n2 as integer, n3 as integer, n4 as integer, n5 as integer, n6 as integer)"},
};

}  // namespace

uint16_t StoreRuleWord(double v) {
  const double t = std::trunc(v);
  const int32_t i = (t >= -2147483648.0 && t <= 2147483647.0) ? static_cast<int32_t>(t) : INT32_MIN;
  return static_cast<uint16_t>(static_cast<uint32_t>(i) & 0xFFFFu);
}

REALclassDefinition CMColorClass =
    ClassDefinition("CMColor", sizeof(CMColorData), nullptr, nullptr, properties, methods);
