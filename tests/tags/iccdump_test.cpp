// Tags the plugin writes, as an independent reader of ICC profiles (Argyll's iccdump)
// decodes them from the saved file.
#include <cstdio>

#include "plugin_fixture.h"
#include "profile_files.h"

namespace {

using host::Object;

std::string Output(const std::string& command) {
  std::string out;
  FILE* pipe = popen(command.c_str(), "r");
  char buffer[4096];
  while (pipe && std::fgets(buffer, sizeof buffer, pipe)) out += buffer;
  if (pipe) pclose(pipe);
  return out;
}

class IccdumpTest : public PluginTest {
 protected:
  Object VectorOf(std::initializer_list<double> values) {
    Object v = rt->New("Vector");
    for (double x : values) rt->Call(v, "Append", {x});
    return v;
  }
  ProfileFiles files;
};

TEST_F(IccdumpTest, ReadsEveryTagTypeThePluginWrites) {
  const std::string f = files.Copy("sRGB.icc", "written.icc");
  {
    Object p = rt->New("Profile", {rt->MakeFolderItem(f)});
    rt->Call(p, "SetTRC", {"rTRC", VectorOf({2.2})});
    rt->Call(p, "SetTRC", {"gTRC", VectorOf({0.0, 0.5, 1.0})});
    rt->Call(p, "SetXYZTag", {"wtpt", 0.9642, 1.0, 0.8249});
    rt->Set(p, "Name", "A description");
    rt->Set(p, "Copyright", "A copyright");
    Object list = rt->New("VectorNC");
    rt->Set(list, "devicecount", 3);
    rt->Set(list, "prefix", "pre ");
    rt->Call(list, "Append", {"first", VectorOf({50.0, 10.0, -20.0}), VectorOf({0.25, 0.5, 1.0})});
    rt->Call(p, "SetNC", {"ncl2", list});
    rt->Call(p, "SaveProfile");
    ASSERT_EQ(Error(), 0);
  }
  const struct {
    const char* tag;
    std::vector<std::string> lines;
  } cases[] = {
      {"rTRC", {"Curve is gamma of 2.19921875"}},  // 563 / 256
      {"gTRC", {"No. elements = 3", "1:  0.49999237", "2:  1.00000000"}},
      {"wtpt", {"0.96418762, 1.00000000, 0.82489014"}},
      {"desc", {"ASCII data, length 14 chars", "A description", "No Unicode data", "No ScriptCode data"}},
      {"cprt", {"No. chars = 12", "A copyright"}},
      {"ncl2", {"No. colors  = 1", "No. dev. coords = 3", "Name prefix = 'pre '", "Name root = 'first'",
                "Device Coords = 0.24998856, 0.49999237, 1.00000000"}},
  };
  for (const auto& c : cases) {
    const std::string dump = Output("iccdump -v3 -t " + std::string(c.tag) + " '" + f + "' 2>&1");
    EXPECT_EQ(dump.find("Error"), std::string::npos) << c.tag << ":\n" << dump;
    for (const std::string& line : c.lines) EXPECT_NE(dump.find(line), std::string::npos) << c.tag << ":\n" << dump;
  }
}

}  // namespace
