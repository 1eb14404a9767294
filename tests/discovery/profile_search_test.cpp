// The colour directory and the search of its profiles, through the host as a script
// calls them: which files each criterion finds, what the list holds afterwards, and the
// entries that answer constants.
#include <sys/stat.h>

#include <algorithm>
#include <set>

#include "plugin_fixture.h"
#include "profile_files.h"
#include "win32_paths.h"

namespace {

using host::Object;
using host::Value;

class ProfileSearchTest : public PluginTest {
 protected:
  void SetUp() override {
    PluginTest::SetUp();
    mkdir(files.colorDir().c_str(), 0755);
    Put("sRGB.icc", "srgb.icc");
    // sRGB again, with its CMM, manufacturer and model changed.
    std::vector<char> one = ProfileFiles::Read(TINTWELL_ICC_DIR "/sRGB.icc");
    std::copy_n("ABCD", 4, one.begin() + 4);
    std::copy_n("MANU", 4, one.begin() + 48);
    std::copy_n("\0\0\0\7", 4, one.begin() + 52);
    ProfileFiles::Write(files.colorDir() + "/one.icc", one);
    Put("ghostscript/default_cmyk.icc", "cmyk.ICM");
    Put("LCMSLABI.ICM", "lab.ic");
    // Not found: other extensions, a file that is no profile, a folder.
    Put("sRGB.icc", "x.pf");
    Put("sRGB.icc", "d.ic.bak");
    ProfileFiles::Write(files.colorDir() + "/junk.icc", {'n', 'o', 'p', 'e'});
    mkdir((files.colorDir() + "/sub.icc").c_str(), 0755);
  }
  void Put(const std::string& from, const std::string& name) {
    ProfileFiles::Write(files.colorDir() + "/" + name, ProfileFiles::Read(std::string(TINTWELL_ICC_DIR) + "/" + from));
  }

  // The file names in the list, in its order; "" for nil.
  std::vector<std::string> Names(const Object& list) {
    std::vector<std::string> names;
    for (int32_t i = 0; i < rt->Call(list, "Count").AsInteger(); ++i) {
      const Value item = rt->Call(list, "Get", {i});
      if (item.IsNil()) {
        names.emplace_back();
        continue;
      }
      const std::string path = rt->FolderItemPath(item.AsObject());
      EXPECT_EQ(path.substr(0, path.rfind('\\')), win32::WindowsPathFromPosix(files.colorDir()));
      names.push_back(path.substr(path.rfind('\\') + 1));
    }
    return names;
  }
  std::set<std::string> Search(const std::vector<std::string>& codes, int model, const Object& list) {
    rt->CallGlobal("ProfileSearch", {codes[0], codes[1], codes[2], codes[3], codes[4], model, list});
    const std::vector<std::string> names = Names(list);
    return {names.begin(), names.end()};
  }

  ProfileFiles files;
};

TEST_F(ProfileSearchTest, EachCriterionFindsExactlyTheProfilesWhoseHeaderHoldsIt) {
  const std::set<std::string> all = {"srgb.icc", "one.icc", "cmyk.ICM", "lab.ic"};
  const struct {
    std::vector<std::string> codes;  // cmm, class, data space, connection space, manufacturer
    int model;
    std::set<std::string> found;
  } cases[] = {
      {{"", "", "", "", ""}, 0, all},
      {{"", "", "", "", ""}, -5, all},  // a model of 0 or less is no criterion
      {{"ABCD", "", "", "", ""}, 0, {"one.icc"}},
      {{"lcms", "", "", "", ""}, 0, {"srgb.icc", "lab.ic"}},
      {{"", "mntr", "", "", ""}, 0, {"srgb.icc", "one.icc", "lab.ic"}},
      {{"", "prtr", "", "", ""}, 0, {"cmyk.ICM"}},
      {{"", "", "CMYK", "", ""}, 0, {"cmyk.ICM"}},
      {{"", "", "", "Lab ", ""}, 0, {"cmyk.ICM", "lab.ic"}},
      {{"", "", "", "", "MANU"}, 0, {"one.icc"}},
      {{"", "", "", "", ""}, 7, {"one.icc"}},
      {{"", "", "", "", ""}, 0x30303030, {"lab.ic"}},
      {{"", "mntrXYZ", "RGB and more", "", ""}, 0, {"srgb.icc", "one.icc"}},  // compared by the first four
      {{"", "mntr", "", "", ""}, 7, {"one.icc"}},                             // every criterion in force
      {{"", "prtr", "", "", ""}, 7, {}},
      {{"", "mnt", "", "", ""}, 0, {}},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.codes[0] + "|" + c.codes[1] + "|" + c.codes[2] + "|" + c.codes[3] + "|" + c.codes[4] + "|" +
                 std::to_string(c.model));
    Object list = rt->New("VectorF");
    EXPECT_EQ(Search(c.codes, c.model, list), c.found);
    EXPECT_EQ(rt->Call(list, "Count").AsInteger(), static_cast<int>(c.found.size()));  // each once
    EXPECT_EQ(Error(), 0);
  }
}

TEST_F(ProfileSearchTest, ResultsAppendToTheListAndAreHeldOnceEach) {
  const std::size_t before = rt->LiveObjects();
  Object list = rt->New("VectorF");
  rt->Call(list, "Append", {Value()});  // what the list held stays first
  Search({"", "", "", "", ""}, 0, list);
  Search({"", "", "", "", ""}, 0, list);  // a second search appends again
  const std::vector<std::string> names = Names(list);
  ASSERT_EQ(names.size(), 9u);
  EXPECT_EQ(names[0], "");
  EXPECT_EQ(std::vector<std::string>(names.begin() + 1, names.begin() + 5),
            std::vector<std::string>(names.begin() + 5, names.end()));
  EXPECT_EQ(rt->LiveObjects(), before + 1 + 8);
  // One reference per listed item: deleting one lets it go, and the rest go with the list.
  rt->Call(list, "Delete", {1});
  EXPECT_EQ(rt->LiveObjects(), before + 1 + 7);
  list = Object();
  EXPECT_EQ(rt->LiveObjects(), before);
  // A nil list: nothing happens, nothing is reported.
  rt->CallGlobal("ProfileSearch", {"", "mntr", "", "", "", 0, Value()});
  EXPECT_EQ(Error(), 0);
  EXPECT_EQ(rt->LiveObjects(), before);
}

TEST_F(ProfileSearchTest, TheColourDirectoryAndItsFailure) {
  Value folder = rt->CallGlobal("TintwellFolder");
  ASSERT_TRUE(folder.IsObject());
  EXPECT_EQ(rt->FolderItemPath(folder.AsObject()), win32::WindowsPathFromPosix(files.colorDir()));
  folder = Value();
  // A directory that cannot be made (a file stands in its way): the system's code.
  const std::string blocked = files.Path("blocked");
  ProfileFiles::Write(blocked, {'x'});
  setenv("TINTWELL_COLOR_DIR", (blocked + "/icc").c_str(), 1);
  EXPECT_TRUE(rt->CallGlobal("TintwellFolder").IsNil());
  EXPECT_EQ(Error(), 3);  // ERROR_PATH_NOT_FOUND
  rt->CallGlobal("CMError");
  Object list = rt->New("VectorF");
  rt->CallGlobal("ProfileSearch", {"", "", "", "", "", 0, list});
  EXPECT_EQ(rt->Call(list, "Count").AsInteger(), 0);
  EXPECT_EQ(Error(), 3);
}

TEST_F(ProfileSearchTest, ConstantEntriesAnswerWithoutTouchingTheErrorState) {
  Object p = rt->New("Profile", {rt->MakeFolderItem(files.Path("none.icc"))});
  rt->Call(p, "Profile", {rt->MakeFolderItem(files.Path("none.icc")), Value()});  // the nil-profile code
  ASSERT_EQ(Error(), -404);
  EXPECT_EQ(rt->CallGlobal("TintwellVersion").AsInteger(), 0);
  EXPECT_EQ(rt->CallGlobal("CMMcount").AsInteger(), 0);
  EXPECT_EQ(rt->CallGlobal("CreateProfileIdentifier", {p, 1, 16}).AsInteger(), -1);
  EXPECT_TRUE(rt->CallGlobal("GetMonitorProfile").IsNil());
  EXPECT_TRUE(rt->CallGlobal("GetSystemProfile").IsNil());
  EXPECT_TRUE(rt->CallGlobal("GetProfileByUse", {"mntr"}).IsNil());
  EXPECT_TRUE(rt->CallGlobal("getProfileBySpace", {"RGB "}).IsNil());
  EXPECT_EQ(Error(), -404);
}

}  // namespace
