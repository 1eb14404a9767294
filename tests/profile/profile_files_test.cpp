// Profiles on files that are not plain, writable, single-named files, and the plugin's
// temporary folder across programs: nothing is lost, nothing hangs, nothing is left.
#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>

#include "plugin_fixture.h"
#include "profile_files.h"

namespace {

using host::Object;

class ProfileFileTest : public PluginTest {
 protected:
  Object Open(const std::string& path) { return rt->New("Profile", {rt->MakeFolderItem(path)}); }
  int32_t ModelOf(const std::string& path) { return rt->Get(Open(path), "Model").AsInteger(); }
  // The files in this program's working folder, its lock aside.
  int WorkingCopies() {
    int n = 0;
    const std::string folder = ProfileFiles::PluginWorkingFolder();
    DIR* dir = opendir(folder.c_str());
    while (const dirent* e = dir ? readdir(dir) : nullptr)
      if (e->d_name[0] != '.' && std::string(e->d_name) != "lock") ++n;
    if (dir) closedir(dir);
    return n;
  }
  ProfileFiles files;
};

TEST_F(ProfileFileTest, AReadOnlyProfileOpensAndRefusesASaveWithoutLosingTheEdit) {
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

TEST_F(ProfileFileTest, FilesThatAreNotFilesAreRefusedBeforeCopying) {
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
  EXPECT_EQ(WorkingCopies(), 0);
}

TEST_F(ProfileFileTest, ASaveThroughASymbolicLinkUpdatesItsTarget) {
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

TEST_F(ProfileFileTest, ANameWithABackslashIsRefusedRatherThanMisread) {
  files.Copy("sRGB.icc", "a");
  EXPECT_THROW(rt->MakeFolderItem(files.Path("a\\b.icc")), host::HostError);
}

// Folders of programs that have ended are removed at start-up; a live program's stay.
TEST_F(ProfileFileTest, StartUpSweepsTheFoldersOfEndedProgramsOnly) {
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

TEST_F(ProfileFileTest, EachConstructorReportsWhatFailedAndOnlyThat) {
  const std::string good = files.Copy("sRGB.icc", "good.icc"), bad = files.Path("bad.icc");
  ProfileFiles::Write(bad, std::vector<char>(200, 'x'));
  Object d = Debugger();
  const auto traced = [&](const char* text) {
    return std::find(log.entries.begin(), log.entries.end(), std::string("DebugString:") + text) != log.entries.end();
  };
  Object ok = Open(good);
  EXPECT_EQ(Error(), 0);
  EXPECT_FALSE(traced("Error opening copied profile"));
  Object unreadable = Open(bad);
  EXPECT_EQ(Error(), 2011);  // ERROR_INVALID_PROFILE
  EXPECT_TRUE(traced("Error opening copied profile"));
  log.entries.clear();
  // From a profile that has no working copy: the copy to f fails on its empty path.
  Object empty = rt->New("Profile", {Object(), Object()});
  Object copy = rt->New("Profile", {rt->MakeFolderItem(files.Path("copy.icc")), empty});
  EXPECT_EQ(Error(), 3);  // ERROR_PATH_NOT_FOUND
  EXPECT_TRUE(traced("Error copying profile to new path"));
  EXPECT_FALSE(ProfileFiles::Exists(files.Path("copy.icc")));
}

TEST_F(ProfileFileTest, SavesTraceTheirCopyAndRefuseAPathTooLongToHold) {
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

TEST_F(ProfileFileTest, DestroyingAnEmptyProfileReportsTheCopyItCannotDelete) {
  {
    Object empty = rt->New("Profile", {Object(), Object()});  // nil p: nothing made
    Object d = Debugger();
  }
  EXPECT_EQ(Error(), 3);  // ERROR_PATH_NOT_FOUND for the empty path
  EXPECT_NE(std::find(log.entries.begin(), log.entries.end(), "DebugString:Could not delete file"), log.entries.end());
}

TEST_F(ProfileFileTest, TheIntentConstructorsInstalledCopyGoesWithItsObject) {
  const std::string f = files.Copy("sRGB.icc", "a.icc");
  for (int i = 0; i < 3; ++i) {
    Object p = rt->New("Profile", {rt->MakeFolderItem(f), 1, 0, "lcms"});
    EXPECT_EQ(Error(), 0);
    // Run again on the same object: the first copy and installation go.
    rt->Call(p, "Profile", {rt->MakeFolderItem(f), 2, 0, "lcms"});
  }
  DIR* dir = opendir(files.colorDir().c_str());
  int installed = 0;
  while (const dirent* e = dir ? readdir(dir) : nullptr) installed += e->d_name[0] != '.';
  if (dir) closedir(dir);
  EXPECT_EQ(installed, 0);
  EXPECT_EQ(WorkingCopies(), 0);
}

}  // namespace
