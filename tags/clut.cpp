#include "clut.h"

#include "class_tables.h"
#include "debugger.h"
#include "host_bridge.h"
#include "vector.h"

namespace {

ClutData* Data(REALobject self) { return GetClutData(self); }

// Replaces the member in slot by object, taking a reference to the new one before
// giving up the old, so that storing the member already held keeps it alive.
void Store(REALobject* slot, REALobject object) {
  if (object) bridge::LockObject(object);
  REALobject old = *slot;
  *slot = object;
  if (old) bridge::UnlockObject(old);
}

// The new objects' references pass to the record. Run again on the same object (the
// script's Clut() after the host's own run), the members made first are given up, so
// each run leaves exactly four references held.
void Construct(REALobject self) {
  REALobject made[4] = {bridge::NewInstance("Vector"), bridge::NewInstance("Vector"), bridge::NewInstance("Vector"),
                        bridge::NewInstance("Matrix")};
  for (REALobject object : made) {
    if (object) continue;
    for (REALobject other : made) {
      if (other) bridge::UnlockObject(other);
    }
    return;
  }
  ClutData* d = Data(self);
  d->is16Bit = true;
  d->gridPointCount = 0;
  d->inChannelCount = 1;
  d->outChannelCount = 1;
  // Each new object's reference passes to the record; a member already held is given up.
  REALobject* const slots[4] = {&d->inCurve, &d->lut, &d->outCurve, &d->matrix3D};
  for (int n = 0; n < 4; ++n) {
    REALobject old = *slots[n];
    *slots[n] = made[n];
    if (old) bridge::UnlockObject(old);
  }
}

void Release(REALobject* slot) {
  if (!*slot) return;
  bridge::UnlockObject(*slot);
  *slot = nullptr;
}

void Destruct(REALobject self) {
  ClutData* d = Data(self);
  d->is16Bit = false;
  d->gridPointCount = 0;
  d->inChannelCount = 0;
  d->outChannelCount = 0;
  Release(&d->matrix3D);
  Release(&d->inCurve);
  Release(&d->outCurve);
  Release(&d->lut);
}

// Object properties: the getter hands the caller a reference of its own.
template <REALobject ClutData::*Member>
REALobject GetMember(REALobject self, intptr_t) {
  REALobject object = Data(self)->*Member;
  if (object) bridge::LockObject(object);
  return object;
}

template <REALobject ClutData::*Member>
void SetMember(REALobject self, intptr_t, REALobject object) {
  Store(&(Data(self)->*Member), object);
}

template <int32_t ClutData::*Member>
int32_t GetCount(REALobject self, intptr_t) {
  return Data(self)->*Member;
}

template <int32_t ClutData::*Member>
void SetCount(REALobject self, intptr_t, int32_t value) {
  Data(self)->*Member = value;
}

bool GetIs16Bit(REALobject self, intptr_t) { return Data(self)->is16Bit; }
void SetIs16Bit(REALobject self, intptr_t, bool value) { Data(self)->is16Bit = value; }

uint32_t CountOf(REALobject vector) { return vector ? GetVectorData(vector)->count : 0; }

int32_t GetInputEntries(REALobject self, intptr_t) {
  const ClutData* d = Data(self);
  return EntriesPerChannel(CountOf(d->inCurve), d->inChannelCount);
}

int32_t GetOutputEntries(REALobject self, intptr_t) {
  const ClutData* d = Data(self);
  return EntriesPerChannel(CountOf(d->outCurve), d->outChannelCount);
}

// The entry counts follow from the tables and channel counts; setting them changes nothing.
void IgnoreEntries(REALobject, intptr_t, int32_t) {}

void DebugTable(const char* label, REALobject vector) {
  SendDebugString(label);
  if (vector) VectorDebug(GetVectorData(vector));
}

void Debug(REALobject self) {
  const ClutData* d = Data(self);
  SendDebugString("---Debug Clut---");
  SendDebugString("Is16");
  SendDebugBoolean(d->is16Bit);
  SendDebugString("clutPts");
  SendDebugInteger(d->gridPointCount);
  SendDebugString("inChan");
  SendDebugInteger(d->inChannelCount);
  SendDebugString("outChan");
  SendDebugInteger(d->outChannelCount);
  SendDebugString("InputEntries");
  SendDebugInteger(EntriesPerChannel(CountOf(d->inCurve), d->inChannelCount));
  SendDebugString("OutputEntries");
  SendDebugInteger(EntriesPerChannel(CountOf(d->outCurve), d->outChannelCount));
  DebugTable("InCurve", d->inCurve);
  DebugTable("lut", d->lut);
  DebugTable("OutCurve", d->outCurve);
}

REALproperty properties[] = {
    {nullptr, "InCurve", "Vector", 0, AsProc(&GetMember<&ClutData::inCurve>), AsProc(&SetMember<&ClutData::inCurve>), 0,
     0, 0, 0},
    {nullptr, "OutCurve", "Vector", 0, AsProc(&GetMember<&ClutData::outCurve>), AsProc(&SetMember<&ClutData::outCurve>),
     0, 0, 0, 0},
    {nullptr, "Lut", "Vector", 0, AsProc(&GetMember<&ClutData::lut>), AsProc(&SetMember<&ClutData::lut>), 0, 0, 0, 0},
    {nullptr, "Matrix3D", "Matrix", 0, AsProc(&GetMember<&ClutData::matrix3D>), AsProc(&SetMember<&ClutData::matrix3D>),
     0, 0, 0, 0},
    {nullptr, "Is16Bit", "Boolean", 0, AsProc(&GetIs16Bit), AsProc(&SetIs16Bit), 0, 0, 0, 0},
    {nullptr, "GridPointCount", "Integer", 0, AsProc(&GetCount<&ClutData::gridPointCount>),
     AsProc(&SetCount<&ClutData::gridPointCount>), 0, 0, 0, 0},
    {nullptr, "InChannelCount", "Integer", 0, AsProc(&GetCount<&ClutData::inChannelCount>),
     AsProc(&SetCount<&ClutData::inChannelCount>), 0, 0, 0, 0},
    {nullptr, "OutChannelCount", "Integer", 0, AsProc(&GetCount<&ClutData::outChannelCount>),
     AsProc(&SetCount<&ClutData::outChannelCount>), 0, 0, 0, 0},
    {nullptr, "InputEntries", "Integer", 0, AsProc(&GetInputEntries), AsProc(&IgnoreEntries), 0, 0, 0, 0},
    {nullptr, "OutputEntries", "Integer", 0, AsProc(&GetOutputEntries), AsProc(&IgnoreEntries), 0, 0, 0, 0},
};

REALmethodDefinition methods[] = {
    {AsProc(&Construct), nullptr, "Clut()"},
    {AsProc(&Debug), nullptr, "Debug()"},
};

}  // namespace

int32_t EntriesPerChannel(uint32_t count, int32_t channels) {
  if (channels == 0) return 0;
  return static_cast<int32_t>(static_cast<int64_t>(count) / channels);
}

REALclassDefinition ClutClass =
    ClassDefinition("cLut", sizeof(ClutData), AsProc(&Construct), AsProc(&Destruct), properties, methods);
