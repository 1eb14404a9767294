// Every member the plugin registers, called with hostile arguments made from its
// declaration: the limits of each type, huge strings and strings with zero bytes, nil
// and half-built objects, folder items where no profile lives (a folder, a FIFO, links
// to /dev/zero, to nothing and to themselves). The registry drives the sweep, so a
// member is swept from the day it is registered. Each member's calls must leave no
// object or string alive, no reference misuse and no file in the plugin's folders.
// Every folder item lies in the test's own folder: no /dev path is ever handed over,
// since a save must never get near a device node.
#include <dirent.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cstdint>
#include <cstdio>
#include <functional>
#include <initializer_list>
#include <limits>
#include <map>
#include <set>
#include <string>
#include <vector>

#include "plugin_fixture.h"
#include "profile_files.h"

namespace {

using host::Arg;
using host::ClassInfo;
using host::EqualsIgnoreCase;
using host::MethodInfo;
using host::Object;
using host::Parameter;
using host::Type;
using host::TypeKind;
using host::Value;

bool IsConstructor(const ClassInfo& cls, const MethodInfo& m) { return EqualsIgnoreCase(m.parsed.name, cls.name); }

bool IsFolderItem(const Type& type) {
  return type.kind == TypeKind::Object && EqualsIgnoreCase(type.className, "FolderItem");
}

// The host takes arguments as a braced list; this spreads a vector into one.
template <class Call>
Value Spread(const std::vector<Arg>& a, Call call) {
  switch (a.size()) {
    case 0: return call({});
    case 1: return call({a[0]});
    case 2: return call({a[0], a[1]});
    case 3: return call({a[0], a[1], a[2]});
    case 4: return call({a[0], a[1], a[2], a[3]});
    case 5: return call({a[0], a[1], a[2], a[3], a[4]});
    case 6: return call({a[0], a[1], a[2], a[3], a[4], a[5]});
    case 7: return call({a[0], a[1], a[2], a[3], a[4], a[5], a[6]});
    case 8: return call({a[0], a[1], a[2], a[3], a[4], a[5], a[6], a[7]});
  }
  throw host::HostError("more parameters than the sweep spreads: add a case");
}

// Calls with values for params, ByRef parameters through variables of their own.
template <class Call>
Value CallWith(const std::vector<Parameter>& params, const std::vector<Value>& values, Call call) {
  std::vector<Value> variables(values);
  std::vector<Arg> args;
  for (std::size_t i = 0; i < params.size(); ++i)
    args.push_back(params[i].byRef ? Arg::Ref(variables[i]) : Arg(values[i]));
  return Spread(args, call);
}

class SweepTest : public PluginTest {
 protected:
  void SetUp() override {
    PluginTest::SetUp();
    ASSERT_FALSE(profileBytes_.empty());
    while (longPath_.size() < 5000) longPath_ += "deep/";
    ResetFiles();
  }

  void TearDown() override {
    std::printf("sweep: %zu calls\n", calls_);
    RecordProperty("calls", static_cast<int>(calls_));
    struct stat st;
    for (const char* device : {"/dev/null", "/dev/zero"})
      EXPECT_TRUE(stat(device, &st) == 0 && S_ISCHR(st.st_mode)) << device << " is no longer a device";
    PluginTest::TearDown();
  }

  // Every class's objects are made as a scope opens, for its members' calls, and live
  // until it ends; then nothing may be left.
  void Scope(const std::string& name, const std::function<void()>& members) {
    debugger_ = Debugger();
    for (const ClassInfo* cls : rt->Classes()) Instances(*cls);
    members();
    pool_.clear();
    debugger_ = Object();
    rt->CallGlobal("halvoUnregisterDebugger");  // drops the plugin's own reference
    log.entries.clear();
    EXPECT_EQ(rt->LiveObjects(), 0u) << name << " left objects alive";
    EXPECT_EQ(rt->LiveStrings(), 0u) << name << " left strings alive";
  }

  // One member's calls; what is left after them is the member's doing.
  void Member(const std::string& member, const std::function<void()>& calls) {
    std::printf("sweep: %s\n", member.c_str());
    std::fflush(stdout);
    const std::size_t objects = rt->LiveObjects(), strings = rt->LiveStrings(), faults = rt->Faults().size();
    const std::set<std::string> before = PluginFiles();
    member_ = member;
    try {
      calls();
    } catch (const host::HostError& e) {
      ADD_FAILURE() << member << ": " << e.what();
    }
    // Fewer is allowed: a setter gives up the object its property held. A release too
    // many shows as a host fault, and the scope's end must come back to none.
    // A list keeps the items it is given; they go with it at the scope's end.
    const bool keepsItems = member.rfind("VectorF.Append", 0) == 0 || member.rfind("VectorF.Insert", 0) == 0;
    if (!keepsItems) {
      EXPECT_LE(rt->LiveObjects(), objects) << member << " left objects alive";
    }
    EXPECT_EQ(rt->LiveStrings(), strings) << member << " left strings alive";
    EXPECT_EQ(rt->Faults().size(), faults) << member << ": " << rt->Faults().back();
    for (const std::string& name : PluginFiles()) EXPECT_TRUE(before.count(name)) << member << " left " << name;
  }

  // One call; a refusal by the host means the sweep built arguments the declaration
  // does not take.
  void Call(const std::function<Value()>& call) {
    ResetFiles();
    // Every other call runs without a registered debugger, so both trace paths run.
    rt->CallGlobal("halvoUnregisterDebugger");
    if (calls_ % 2 == 0) rt->CallGlobal("halvoRegisterDebugger", {debugger_});
    ++calls_;
    try {
      call();
    } catch (const host::HostError& e) {
      ADD_FAILURE() << member_ << ": " << e.what();
    }
  }

  // Puts back the files a call may have written, made or replaced.
  void ResetFiles() {
    for (const std::string& file : {real_, readOnly_}) {
      chmod(file.c_str(), 0644);
      ProfileFiles::Write(file, profileBytes_);
    }
    chmod(readOnly_.c_str(), 0444);
    unlink(missing_.c_str());
    mkdir(folder_.c_str(), 0755);
    struct stat st;
    if (lstat(fifo_.c_str(), &st) != 0 || !S_ISFIFO(st.st_mode)) {
      unlink(fifo_.c_str());
      mkfifo(fifo_.c_str(), 0600);
    }
    for (const auto& [link, target] : {std::pair{zeroLink_, std::string("/dev/zero")},
                                       std::pair{danglingLink_, missing_}, std::pair{loopLink_, loopLink_}}) {
      char text[4096];
      const ssize_t n = readlink(link.c_str(), text, sizeof text);
      if (n >= 0 && target == std::string(text, static_cast<std::size_t>(n))) continue;
      unlink(link.c_str());
      if (symlink(target.c_str(), link.c_str()) != 0) ADD_FAILURE() << "cannot link " << link;
    }
  }

  // The files in this program's working folder (but its lock) and in the colour
  // directory. Other programs' working folders lie beside ours and change meanwhile.
  std::set<std::string> PluginFiles() const {
    std::set<std::string> names;
    const std::string own = ProfileFiles::PluginWorkingFolder();
    EXPECT_FALSE(own.empty()) << "the plugin holds no working folder";
    for (const std::string& folder : {own, files.colorDir() + "/"})
      if (DIR* dir = opendir(folder.c_str())) {
        while (const dirent* e = readdir(dir))
          if (e->d_name[0] != '.' && std::string(e->d_name) != "lock") names.insert(folder + e->d_name);
        closedir(dir);
      }
    return names;
  }

  const ClassInfo* FindClass(const std::string& name) const {
    for (const ClassInfo* c : rt->Classes())
      if (EqualsIgnoreCase(c->name, name)) return c;
    return nullptr;
  }

  Value Invoke(const Object& self, const MethodInfo& m, const std::vector<Value>& values) {
    return CallWith(m.parsed.parameters, values,
                    [&](std::initializer_list<Arg> args) { return rt->Call(self, m.parsed.name, args); });
  }

  Value Invoke(const MethodInfo& global, const std::vector<Value>& values) {
    return CallWith(global.parsed.parameters, values,
                    [&](std::initializer_list<Arg> args) { return rt->CallGlobal(global.parsed.name, args); });
  }

  Object New(const ClassInfo& cls, const MethodInfo& ctor, const std::vector<Value>& values) {
    return CallWith(ctor.parsed.parameters, values,
                    [&](std::initializer_list<Arg> args) { return Value(rt->New(cls.name, args)); })
        .AsObject();
  }

  // The scope's objects of a class, made once by Build.
  const std::vector<Object>& Instances(const ClassInfo& cls) {
    auto found = pool_.find(cls.name);
    if (found != pool_.end()) return found->second;  // while it is built: what there is so far
    Build(cls, pool_[cls.name]);
    return pool_[cls.name];
  }

  // Objects of a class: one from each constructor with benign arguments, one from each
  // constructor that takes objects with all of them nil (for Profile that leaves an
  // Empty object), or a plain new object where there is no constructor. Every event
  // gets a handler, for the object a call may register.
  void Build(const ClassInfo& cls, std::vector<Object>& made) {
    for (bool nilObjects : {false, true})
      for (const MethodInfo& m : cls.methods) {
        if (!IsConstructor(cls, m)) continue;
        bool takesObjects = false;
        std::vector<Value> values;
        for (const Parameter& p : m.parsed.parameters) {
          takesObjects |= p.type.kind == TypeKind::Object;
          values.push_back(nilObjects && p.type.kind == TypeKind::Object ? Value() : Benign(p.type));
        }
        if (!nilObjects || takesObjects) made.push_back(New(cls, m, values));
      }
    if (made.empty()) made.push_back(rt->New(cls.name));
    for (const Object& o : made)
      for (const auto& e : cls.events)
        rt->SetEventHandler(o, e.parsed.name, [](const Object&, const std::vector<Value>&) { return Value(); });
  }

  Value Benign(const Type& type) {
    switch (type.kind) {
      case TypeKind::Integer: return 1;
      case TypeKind::Double: return 0.5;
      case TypeKind::Boolean: return true;
      case TypeKind::Color: return host::Color{0x336699};
      case TypeKind::String: return "abcd";
      case TypeKind::Object: break;
    }
    if (IsFolderItem(type)) return rt->MakeFolderItem(real_);
    const ClassInfo* cls = FindClass(type.className);
    if (!cls) return Value();
    const std::vector<Object>& made = Instances(*cls);
    return made.empty() ? Value() : Value(made.front());
  }

  // Hostile values of a type; for objects of self's class, self among them.
  std::vector<Value> Hostile(const Type& type, const Object* self = nullptr) {
    constexpr double kInf = std::numeric_limits<double>::infinity();
    switch (type.kind) {
      case TypeKind::Integer: return {0, -1, INT32_MIN, INT32_MAX, 1};
      case TypeKind::Double: return {0.0, -1.0, std::numeric_limits<double>::quiet_NaN(), kInf, -kInf, 1e308, -1e308};
      case TypeKind::Boolean: return {false, true};
      case TypeKind::Color: return {host::Color{0}, host::Color{0xFFFFFFFF}, host::Color{0x80000000}};
      case TypeKind::String: {
        std::string path = "C:";
        while (path.size() < 5000) path += "\\folder";
        return {"", std::string(1 << 20, 'x'), std::string("\0\0ab\0cd\0", 8), path.substr(0, 5000)};
      }
      case TypeKind::Object: break;
    }
    std::vector<Value> values{Value()};
    if (IsFolderItem(type)) {
      for (const std::string& p :
           {longPath_, folder_, missing_, real_, readOnly_, fifo_, zeroLink_, danglingLink_, loopLink_})
        values.push_back(rt->MakeFolderItem(p));
      return values;
    }
    if (const ClassInfo* cls = FindClass(type.className)) {
      for (const Object& o : Instances(*cls)) values.push_back(o);
      if (self && EqualsIgnoreCase(self->ClassName(), cls->name)) values.push_back(*self);
    }
    return values;
  }

  // The benign list; each hostile value in each place with benign values elsewhere;
  // and lists where every place takes its k-th hostile value.
  std::vector<std::vector<Value>> ArgumentLists(const std::vector<Parameter>& params, const Object* self) {
    std::vector<Value> benign;
    std::vector<std::vector<Value>> hostile;
    std::size_t widest = 0;
    for (const Parameter& p : params) {
      benign.push_back(Benign(p.type));
      hostile.push_back(Hostile(p.type, self));
      widest = std::max(widest, hostile.back().size());
    }
    std::vector<std::vector<Value>> lists{benign};
    for (std::size_t i = 0; i < params.size(); ++i)
      for (const Value& v : hostile[i]) {
        lists.push_back(benign);
        lists.back()[i] = v;
      }
    for (std::size_t k = 0; k < widest && params.size() > 1; ++k) {
      lists.emplace_back();
      for (const auto& values : hostile) lists.back().push_back(values[k % values.size()]);
    }
    return lists;
  }

  ProfileFiles files;
  std::size_t calls_ = 0;

 private:
  const std::vector<char> profileBytes_ = ProfileFiles::Read(TINTWELL_ICC_DIR "/sRGB.icc");
  const std::string real_ = files.Path("real.icc"), missing_ = files.Path("missing.icc"),
                    readOnly_ = files.Path("read-only.icc"), folder_ = files.Path("folder"), fifo_ = files.Path("fifo"),
                    zeroLink_ = files.Path("zero"), danglingLink_ = files.Path("dangling"), loopLink_ = files.Path("loop");
  std::string longPath_ = files.Path("");
  std::map<std::string, std::vector<Object>> pool_;
  Object debugger_;
  std::string member_;
};

TEST_F(SweepTest, GlobalMethods) {
  Scope("the global methods", [&] {
    for (const MethodInfo* m : rt->Globals())
      Member("global " + m->declaration, [&] {
        for (const auto& values : ArgumentLists(m->parsed.parameters, nullptr))
          Call([&] { return Invoke(*m, values); });
      });
  });
}

TEST_F(SweepTest, ConstructorsAndMethods) {
  for (const ClassInfo* cls : rt->Classes())
    Scope(cls->name + "'s methods", [&] {
      for (const MethodInfo& m : cls->methods)
        Member(cls->name + "." + m.declaration, [&] {
          if (!IsConstructor(*cls, m)) {
            for (const Object& self : Instances(*cls))
              for (const auto& values : ArgumentLists(m.parsed.parameters, &self))
                Call([&] { return Invoke(self, m, values); });
            return;
          }
          const auto lists = ArgumentLists(m.parsed.parameters, nullptr);
          for (const auto& values : lists) Call([&] { return Value(New(*cls, m, values)); });
          // A constructor is a method too: a script may run it again on a built object,
          // here on objects of the member's own.
          std::vector<Object> built;
          Build(*cls, built);
          for (const Object& self : built) Call([&] { return Invoke(self, m, lists.front()); });
          for (const auto& values : ArgumentLists(m.parsed.parameters, &built.front()))
            Call([&] { return Invoke(built.front(), m, values); });
        });
    });
}

TEST_F(SweepTest, Properties) {
  for (const ClassInfo* cls : rt->Classes())
    Scope(cls->name + "'s properties", [&] {
      for (const host::PropertyInfo& p : cls->properties)
        Member(cls->name + "." + p.name, [&] {
          for (const Object& self : Instances(*cls)) {
            Call([&] { return rt->Get(self, p.name); });
            if (p.readOnly) continue;
            for (const Value& v : Hostile(p.type, &self))
              Call([&] {
                rt->Set(self, p.name, v);
                return Value();
              });
            Call([&] { return rt->Get(self, p.name); });  // what the hostile values left
          }
        });
      // The objects as the hostile values left them, to every method and global (but
      // the constructors, which would start them afresh), with benign arguments.
      const std::string after = " on " + cls->name + "s left by its properties";
      for (const ClassInfo* other : rt->Classes())
        for (const MethodInfo& m : other->methods) {
          if (IsConstructor(*other, m)) continue;
          Member(other->name + "." + m.declaration + after, [&] {
            const auto benign = ArgumentLists(m.parsed.parameters, nullptr).front();
            for (const Object& self : Instances(*other)) Call([&] { return Invoke(self, m, benign); });
          });
        }
      for (const MethodInfo* m : rt->Globals())
        Member("global " + m->declaration + after,
               [&] { Call([&] { return Invoke(*m, ArgumentLists(m->parsed.parameters, nullptr).front()); }); });
    });
}

}  // namespace
