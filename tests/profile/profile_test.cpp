// Profile objects on real files: working copies, saving, the header properties, and
// files that are not plain, writable, single-named files; across programs the plugin's
// temporary folder loses nothing and leaves nothing.
#include <fcntl.h>
#include <stdio.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstdio>
#include <set>

#include "plugin_fixture.h"
#include "profile_files.h"

namespace {

using host::Object;
using host::Value;

class ProfileTest : public PluginTest {
 protected:
  int32_t ModelOf(const std::string& path) { return rt->Get(Open(path), "Model").AsInteger(); }
  // The files in this program's working folder, its lock aside.
  std::size_t WorkingCopies() { return ProfileFiles::Listing(ProfileFiles::PluginWorkingFolder()).size() - 1; }
  ProfileFiles files;
};

// Edits stay in each object's working copy until a save; a destroyed object's copy goes.
TEST_F(ProfileTest, EachObjectWorksOnItsOwnCopyAndTheLaterSaveWins) {
  const std::string f = files.Copy("sRGB.icc", "a.icc"), temp = ProfileFiles::PluginWorkingFolder();
  const auto original = ProfileFiles::Read(f);
  Object a = Open(f), b = Open(f);
  ASSERT_EQ(Error(), 0);
  ASSERT_FALSE(temp.empty());
  {
    Object c = Open(f);
    rt->Set(c, "Manufacturer", "XXXX");
    EXPECT_EQ(ProfileFiles::Listing(temp), (std::set<std::string>{"lock", "0", "1", "2"}));
  }
  EXPECT_EQ(ProfileFiles::Listing(temp), (std::set<std::string>{"lock", "0", "1"}));
  rt->Set(a, "Model", 111);
  rt->Set(b, "Model", 222);
  EXPECT_EQ(ProfileFiles::Read(f), original);
  rt->Call(a, "SaveProfile");
  rt->Call(b, "SaveProfile");
  EXPECT_EQ(Error(), 0);
  EXPECT_EQ(rt->Get(Open(f), "Model").AsInteger(), 222);
  EXPECT_EQ(rt->Get(a, "Model").AsInteger(), 111);  // a reopened its own copy
}

TEST_F(ProfileTest, ASaveWhoseWriteFailsIsReportedAndLeavesTheFileAlone) {
  const std::string f = files.Copy("sRGB.icc", "a.icc");
  const auto original = ProfileFiles::Read(f);
  const std::string temp = ProfileFiles::PluginWorkingFolder();
  const std::string folder = temp.substr(0, temp.size() - 1), blocker = folder + ".blocker";
  Object p = Open(f);
  rt->Set(p, "Model", 42);
  // With a plain file in its folder's place the working copy cannot be written back. The
  // two are exchanged in one step, so no program starting meanwhile finds the number free.
  ProfileFiles::Write(blocker, {});
  const auto exchange = [&] {
    return renameat2(AT_FDCWD, folder.c_str(), AT_FDCWD, blocker.c_str(), RENAME_EXCHANGE);
  };
  ASSERT_EQ(exchange(), 0);
  Object d = Debugger();
  rt->Call(p, "SaveProfile");
  const int32_t code = Error();
  ASSERT_EQ(exchange(), 0);
  std::remove(blocker.c_str());
  EXPECT_EQ(code, 3);  // ERROR_PATH_NOT_FOUND
  EXPECT_TRUE(Traced("Error writing profile"));
  EXPECT_FALSE(Traced("saveprofile"));
  EXPECT_EQ(ProfileFiles::Read(f), original);
}

TEST_F(ProfileTest, SaveProfileAsLeavesTheObjectOnItsOwnFile) {
  const std::string f = files.Copy("sRGB.icc", "a.icc");
  const std::string g = files.Path("g.icc");
  Object p = Open(f);
  rt->Set(p, "Model", 7);
  rt->Call(p, "SaveProfileAs", {rt->MakeFolderItem(g)});
  EXPECT_EQ(Error(), 0);
  EXPECT_EQ(rt->Get(Open(g), "Model").AsInteger(), 7);
  Object location = rt->Get(p, "Location").AsObject();
  EXPECT_EQ(rt->FolderItemPath(location), rt->FolderItemPath(rt->MakeFolderItem(f)));
  rt->Set(p, "Model", 8);
  rt->Call(p, "SaveProfile");
  EXPECT_EQ(rt->Get(Open(f), "Model").AsInteger(), 8);
  EXPECT_EQ(rt->Get(Open(g), "Model").AsInteger(), 7);
}

TEST_F(ProfileTest, CopyingConstructorTakesTheOthersWorkingCopyAsItIsOnDisk) {
  const std::string f = files.Copy("sRGB.icc", "a.icc");
  const std::string g = files.Copy("colord/AdobeRGB1998.icc", "g.icc");
  Object p = Open(f);
  rt->Set(p, "Model", 5);  // not yet on disk: the copy still has the old model
  Object q = rt->New("Profile", {rt->MakeFolderItem(g), p});
  EXPECT_EQ(Error(), 0);
  EXPECT_EQ(ProfileFiles::Read(g), ProfileFiles::Read(f));
  EXPECT_EQ(rt->Get(q, "Model").AsInteger(), 0);
  rt->Set(q, "Model", 9);  // q works on its own copy of g
  EXPECT_EQ(rt->Get(p, "Model").AsInteger(), 5);

  Object r = rt->New("Profile", {rt->MakeFolderItem(g), nullptr});
  EXPECT_EQ(Error(), -404);
  EXPECT_FALSE(rt->Call(r, "ValidProfile").AsBoolean());
}

TEST_F(ProfileTest, AMissingOrNilFileLeavesTheObjectEmpty) {
  Object d = Debugger();
  Object p = rt->New("Profile", {nullptr});
  EXPECT_NE(Error(), 0);
  EXPECT_TRUE(Traced("Error copying profile to new path"));
  EXPECT_FALSE(rt->Call(p, "ValidProfile").AsBoolean());
  EXPECT_TRUE(rt->Get(p, "Location").IsNil());
  EXPECT_EQ(Error(), -1);
  Object q = Open(files.Path("missing.icc"));
  EXPECT_EQ(Error(), 2);  // ERROR_FILE_NOT_FOUND
  rt->Call(q, "SaveProfile");
  EXPECT_EQ(Error(), -1);
  // A path too long for the object's storage is refused as a failed copy.
  Object r = Open("/tmp/" + std::string(300, 'x'));
  EXPECT_EQ(Error(), 206);
}

TEST_F(ProfileTest, IntentAndCmmFromTheConstructorSurviveASave) {
  const std::string f = files.Copy("sRGB.icc", "a.icc");
  Object d = Debugger();
  {
    Object p = rt->New("Profile", {rt->MakeFolderItem(f), 2, 0, "abcd"});
    ASSERT_EQ(Error(), 0);
    EXPECT_EQ(rt->Get(p, "RenderIntent").AsInteger(), 2);
    EXPECT_EQ(rt->Get(p, "CMM").AsString(), "abcd");
    rt->Call(p, "SaveProfile");
    EXPECT_EQ(Error(), 0);
    EXPECT_TRUE(ProfileFiles::Exists(files.colorDir() + "/0"));  // installed under its own name
  }
  ASSERT_GE(log.entries.size(), 5u);
  EXPECT_EQ(log.entries[0], "DebugString:TEMP PATH:");
  EXPECT_EQ(log.entries[2], "DebugString:TEMP NAME:");
  EXPECT_EQ(log.entries[3], "DebugString:0");
  EXPECT_EQ(log.entries[4], "DebugString:InstallColorProfile");
  EXPECT_FALSE(ProfileFiles::Exists(files.colorDir() + "/0"));  // the installed copy goes with its object
  Object reopened = Open(f);
  EXPECT_EQ(rt->Get(reopened, "RenderIntent").AsInteger(), 2);
  EXPECT_EQ(rt->Get(reopened, "CMM").AsString(), "abcd");
  // Run again on the same object: the first copy and installation go.
  rt->Call(reopened, "Profile", {rt->MakeFolderItem(f), 1, 0, "lcms"});
  rt->Call(reopened, "Profile", {rt->MakeFolderItem(f), 2, 0, "lcms"});
  EXPECT_EQ(Error(), 0);
  reopened = Object();
  EXPECT_TRUE(ProfileFiles::Listing(files.colorDir()).empty());
  EXPECT_EQ(WorkingCopies(), 0u);
}

// Each step sets a property (none: only reads) and then reads one, as Describe() shows it.
TEST_F(ProfileTest, HeaderPropertiesReadAndWriteTheirFields) {
  Object p = Open(files.Copy("sRGB.icc", "a.icc"));
  EXPECT_EQ(rt->Get(p, "Size").AsInteger(), int32_t(ProfileFiles::Read(TINTWELL_ICC_DIR "/sRGB.icc").size()));
  EXPECT_EQ(uint32_t(rt->Get(p, "Version").AsInteger()) >> 24, 2u);
  EXPECT_TRUE(rt->Call(p, "ValidProfile").AsBoolean());
  const int32_t flags = rt->Get(p, "Flags").AsInteger();
  const struct {
    const char* set;
    Value value;
    const char* get;
    Value expected;
  } steps[] = {
      {nullptr, 0, "Type", "mntr"}, {nullptr, 0, "ColorSpace", "RGB "}, {nullptr, 0, "ConnectionSpace", "XYZ "},
      {nullptr, 0, "Signature", "acsp"}, {nullptr, 0, "WhiteX", 63190 / 65536.0}, {nullptr, 0, "WhiteY", 1.0},
      {"Quality", 2, "Quality", 2}, {"Quality", 1, "Flags", (flags & ~0x30000) | 0x10000},
      {"Interpolation", false, "Interpolation", false}, {nullptr, 0, "Flags", (flags & ~0x30000) | 0x50000},
      {"Interpolation", true, "Flags", (flags & ~0x30000) | 0x10000},
      {"GamutCheck", false, "Flags", (flags & ~0x30000) | 0x90000},
      {"Embedded", true, "EmbeddedUse", false}, {"EmbeddedUse", true, "Flags", (flags & ~0x30000) | 0x90003},
      {"Attribute1", 0x12345, "Attribute1", 0x2345}, {"Transparent", true, "Attribute2", 1},
      {"Matte", true, "Attribute2", 3}, {"Matte", false, "Transparent", true},
      {nullptr, 0, "Attribute2", 1},
      {"WhiteX", 0.9642, "WhiteX", 63189 / 65536.0}, {"WhiteZ", -1.5, "WhiteZ", -1.5},
      {"Year", 2026, "Year", 2026}, {"Month", 12, "Year", 2026}, {"Year", 1999, "Month", 12},
      {"Day", 6, "Day", 6}, {"Hour", 23, "Hour", 23}, {"Minute", 59, "Minute", 59}, {"Second", 58, "Second", 58},
      {"Type", "prtr", "Type", "prtr"}, {"Platform", "AB", "Platform", std::string("AB\0\0", 4)},  // padded
      {"Signature", "xxxx", "Signature", "acsp"},  // changes nothing
      {nullptr, 0, "Modified", false}, {nullptr, 0, "LocationType", 0}, {nullptr, 0, "RefCount", 0},
  };
  for (const auto& s : steps) {
    if (s.set) rt->Set(p, s.set, s.value);
    EXPECT_EQ(rt->Get(p, s.get).Describe(), s.expected.Describe()) << (s.set ? s.set : "") << " then " << s.get;
  }
}

TEST_F(ProfileTest, HeaderEditsSurviveASaveAndAReopen) {
  const std::string f = files.Copy("colord/AdobeRGB1998.icc", "a.icc");
  const struct {
    const char* property;
    Value value;
  } edits[] = {
      {"Type", "scnr"},       {"CMM", "ABCD"},         {"Platform", "MSFT"}, {"Manufacturer", "TINT"},
      {"Creator", "twel"},    {"ConnectionSpace", "Lab "}, {"Model", 0x7FFFFFFF}, {"Version", 0x04200000},
      {"RenderIntent", 2},    {"Quality", 3},          {"Interpolation", false}, {"Matte", true},
      {"Attribute1", 0xBEEF}, {"WhiteX", 0.5},         {"WhiteY", 0.75},       {"WhiteZ", 1.25},
      {"Year", 2031},         {"Month", 2},            {"Day", 29},            {"Hour", 1},
      {"Minute", 2},          {"Second", 3},
  };
  {
    Object p = Open(f);
    for (const auto& e : edits) rt->Set(p, e.property, e.value);
    rt->Call(p, "SaveProfile");
    ASSERT_EQ(Error(), 0);
  }
  Object reopened = Open(f);
  ASSERT_EQ(Error(), 0);
  for (const auto& e : edits) {
    const Value v = rt->Get(reopened, e.property);
    EXPECT_EQ(v.Describe(), e.value.Describe()) << e.property;
  }
}

TEST_F(ProfileTest, AnEmptyProfileReportsAsEachPropertySays) {
  Object p = rt->New("Profile", {nullptr});
  Object d = Debugger();
  int errorEvents = 0;
  rt->SetEventHandler(d, "DebugError", [&](const Object&, const std::vector<Value>&) {
    ++errorEvents;
    return Value();
  });
  EXPECT_EQ(rt->Get(p, "CMM").AsString(), "");  // nil, which reads as empty text
  EXPECT_EQ(Error(), -1);
  EXPECT_EQ(errorEvents, 1);
  EXPECT_FALSE(rt->Get(p, "Embedded").AsBoolean());  // not tested: the read fails
  EXPECT_EQ(Error(), 6);                              // ERROR_INVALID_HANDLE from the platform
  EXPECT_EQ(rt->Get(p, "Attribute2").AsInteger(), 0);
  EXPECT_EQ(Error(), -1);
  rt->Set(p, "ColorSpace", "CMYK");
  EXPECT_EQ(Error(), -1);
  EXPECT_EQ(errorEvents, 2);  // Embedded raised one; Attribute2 and ColorSpace raise none
  EXPECT_EQ(rt->Get(p, "Modified").AsBoolean(), false);
  EXPECT_EQ(Error(), 0);
}

TEST_F(ProfileTest, AReadOnlyProfileOpensAndRefusesASaveWithoutLosingTheEdit) {
  const std::string f = files.Copy("sRGB.icc", "ro.icc");
  ASSERT_EQ(chmod(f.c_str(), 0444), 0);
  const auto original = ProfileFiles::Read(f);
  for (int run = 0; run < 2; ++run) {  // a read-only copy once poisoned every later open
    SCOPED_TRACE(run);
    Object p = Open(f);
    ASSERT_EQ(Error(), 0);
    rt->Set(p, "Model", 4242);
    rt->Call(p, "SaveProfile");
    EXPECT_EQ(Error(), 5);  // ERROR_ACCESS_DENIED
    EXPECT_EQ(rt->Get(p, "Model").AsInteger(), 4242);
    rt->Call(p, "SaveProfileAs", {rt->MakeFolderItem(files.Path("elsewhere.icc"))});
    EXPECT_EQ(Error(), 0);
  }
  EXPECT_EQ(ProfileFiles::Read(f), original);
  struct stat st;
  ASSERT_EQ(stat(f.c_str(), &st), 0);
  EXPECT_EQ(st.st_mode & 0777, 0444u);
  EXPECT_EQ(ModelOf(files.Path("elsewhere.icc")), 4242);
}

TEST_F(ProfileTest, FilesThatAreNotFilesAreRefusedBeforeCopying) {
  const std::string fifo = files.Path("pipe.icc");
  ASSERT_EQ(mkfifo(fifo.c_str(), 0666), 0);
  const std::string folder = files.Path("folder.icc");
  ASSERT_EQ(mkdir(folder.c_str(), 0777), 0);
  for (const std::string& path : {std::string("/dev/zero"), fifo, folder}) {
    SCOPED_TRACE(path);
    Object p = Open(path);
    EXPECT_EQ(Error(), 5);  // ERROR_ACCESS_DENIED, at once
    EXPECT_FALSE(rt->Call(p, "ValidProfile").AsBoolean());
  }
  EXPECT_EQ(WorkingCopies(), 0u);
}

TEST_F(ProfileTest, ASaveThroughASymbolicLinkUpdatesItsTarget) {
  const std::string real = files.Copy("sRGB.icc", "real.icc");
  const std::string link = files.Path("link.icc");
  ASSERT_EQ(symlink("real.icc", link.c_str()), 0);
  {
    Object p = Open(link);
    rt->Set(p, "Model", 77);
    rt->Call(p, "SaveProfile");
    EXPECT_EQ(Error(), 0);
  }
  struct stat st;
  ASSERT_EQ(lstat(link.c_str(), &st), 0);
  EXPECT_TRUE(S_ISLNK(st.st_mode));
  EXPECT_EQ(ModelOf(real), 77);
}

TEST_F(ProfileTest, ANameWithABackslashIsRefusedRatherThanMisread) {
  files.Copy("sRGB.icc", "a");
  EXPECT_THROW(rt->MakeFolderItem(files.Path("a\\b.icc")), host::HostError);
}

// Folders of programs that have ended are removed at start-up; a live program's stay.
TEST_F(ProfileTest, StartUpSweepsTheFoldersOfEndedProgramsOnly) {
  const std::string temp = ProfileFiles::PluginTempFolder();
  // Numbers of this run's own, far above any that programs claim.
  const std::string base = temp + std::to_string(1000000 + 2 * getpid());
  const std::string ended = base + "0/", live = base + "1/";
  // Each is filled under a name the sweep ignores and then moved into place, and the live
  // one is locked first, so that no program starting meanwhile takes either for its own.
  int held = -1;
  for (const std::string& folder : {ended, live}) {
    const std::string staging = folder.substr(0, folder.size() - 1) + ".new/";
    ASSERT_EQ(mkdir(staging.c_str(), 0777), 0);
    ProfileFiles::Write(staging + "lock", {});
    ProfileFiles::Write(staging + "0", {'x'});
    ProfileFiles::Write(staging + "z", {'x'});
    chmod((staging + "0").c_str(), 0444);
    if (folder == live) {
      held = open((staging + "lock").c_str(), O_RDWR);
      ASSERT_EQ(flock(held, LOCK_EX), 0);
    }
    ASSERT_EQ(rename(staging.c_str(), folder.c_str()), 0);
  }
  // This program's own lock admits nobody else, not even to share it.
  const int own = open((ProfileFiles::PluginWorkingFolder() + "lock").c_str(), O_RDONLY);
  EXPECT_NE(flock(own, LOCK_SH | LOCK_NB), 0);
  close(own);
  rt->CallGlobal("halvoUnregisterDebugger");
  rt.reset();
  rt = std::make_unique<host::Runtime>(TINTWELL_PLUGIN_PATH);
  EXPECT_FALSE(ProfileFiles::Exists(ended));
  EXPECT_TRUE(ProfileFiles::Exists(live + "0"));
  close(held);
  std::system(("rm -rf '" + live + "'").c_str());
}

TEST_F(ProfileTest, EachConstructorReportsWhatFailedAndOnlyThat) {
  const std::string good = files.Copy("sRGB.icc", "good.icc"), bad = files.Path("bad.icc");
  ProfileFiles::Write(bad, std::vector<char>(200, 'x'));
  Object d = Debugger();
  Object ok = Open(good);
  EXPECT_EQ(Error(), 0);
  EXPECT_FALSE(Traced("Error opening copied profile"));
  Object unreadable = Open(bad);
  EXPECT_EQ(Error(), 2011);  // ERROR_INVALID_PROFILE
  EXPECT_TRUE(Traced("Error opening copied profile"));
  log.entries.clear();
  // From a profile that has no working copy: the copy to f fails on its empty path.
  Object empty = rt->New("Profile", {Object(), Object()});
  Object copy = rt->New("Profile", {rt->MakeFolderItem(files.Path("copy.icc")), empty});
  EXPECT_EQ(Error(), 3);  // ERROR_PATH_NOT_FOUND
  EXPECT_TRUE(Traced("Error copying profile to new path"));
  EXPECT_FALSE(ProfileFiles::Exists(files.Path("copy.icc")));
  empty = Object();  // destroyed, it reports the copy it cannot delete: its empty path
  EXPECT_EQ(Error(), 3);
  EXPECT_TRUE(Traced("Could not delete file"));
}

TEST_F(ProfileTest, SavesTraceTheirCopyAndRefuseAPathTooLongToHold) {
  const std::string f = files.Copy("sRGB.icc", "a.icc");
  Object p = Open(f);
  Object d = Debugger();
  rt->Call(p, "SaveProfile");
  ASSERT_EQ(log.entries.size(), 3u);
  EXPECT_EQ(log.entries[0], "DebugString:saveprofile");
  EXPECT_EQ(log.entries[1].rfind("DebugString:Z:\\", 0), 0u);
  EXPECT_EQ(log.entries[1].substr(log.entries[1].size() - 2), "\\0");  // the working copy
  EXPECT_EQ(log.entries[2], "DebugString:" + rt->FolderItemPath(rt->MakeFolderItem(f)));
  log.entries.clear();
  rt->Call(p, "SaveProfileAs", {rt->MakeFolderItem(files.Path(std::string(300, 'n')))});
  EXPECT_EQ(Error(), 206);  // ERROR_FILENAME_EXCED_RANGE
  EXPECT_EQ(log.entries,
            (std::vector<std::string>{"DebugError:206,", "DebugString:Error copying profile to new path"}));
}

}  // namespace
