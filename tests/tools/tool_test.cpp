// The command-line tool as a user runs it: output, exit status and messages.
#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <iterator>
#include <string>
#include <vector>

#include "image_files.h"
#include "lcms_reference.h"

namespace {

struct Result {
  int status;
  std::string out, err;
};

std::string Slurp(const std::string& path) {
  const testimage::Bytes b = testimage::ReadFile(path);
  return std::string(b.begin(), b.end());
}

// A file of this process's own: tool tests run side by side.
std::string Temp(const std::string& name) { return ::testing::TempDir() + "tw_" + std::to_string(getpid()) + "_" + name; }

// Runs the tool with args (shell words) and the given standard input.
Result RunTool(const std::string& args, const std::string& input = "") {
  const std::string in = Temp("in"), out = Temp("out"), err = Temp("err");
  std::ofstream(in) << input;
  const int raw = std::system((std::string("'") + TINTWELL_TOOL + "' " + args + " <" + in + " >" + out + " 2>" + err).c_str());
  return {WIFEXITED(raw) ? WEXITSTATUS(raw) : -1, Slurp(out), Slurp(err)};
}

TEST(Tool, HelpAndUsageErrors) {
  Result r = RunTool("--help");
  EXPECT_EQ(r.status, 0);
  EXPECT_NE(r.out.find("usage: tintwell"), std::string::npos);
  EXPECT_NE(r.out.find("srgb"), std::string::npos);
  for (const char* bad : {"", "frobnicate", "--bogus info", "convert srgb", "--intent 7 convert srgb lab 1 2 3",
                          "convert srgb lab 1 2", "convert srgb lab 1 2 x", "gamut srgb 50 0", "gamut srgb 120 0 0",
                          "gamut srgb 50 0 128", "list extra", "search extra", "search --model 0",
                          "search --model x", "search --class toolong", "info --class mntr", "link out srgb",
                          "link a b c d e f", "blank", "copy srgb"}) {
    r = RunTool(bad);
    EXPECT_EQ(r.status, 2) << bad;
    EXPECT_TRUE(r.out.empty()) << bad;
    EXPECT_NE(r.err.find("tintwell: "), std::string::npos) << bad;
  }
}

TEST(Tool, ConvertsColoursFromArgumentsAndInput) {
  Result r = RunTool("convert srgb lab 255 255 255 0 0 0");
  ASSERT_EQ(r.status, 0) << r.err;
  EXPECT_EQ(r.out, "100 0 0\n0 0 0\n");
  r = RunTool("convert lab srgb", "50 0 0\n\n100, 0, 0\n");
  ASSERT_EQ(r.status, 0) << r.err;
  // L 100 is stored as 65279 of 65280, a hair under white.
  double red = 0, green = 0, blue = 0;
  ASSERT_EQ(std::sscanf(r.out.substr(r.out.find('\n') + 1).c_str(), "%lf %lf %lf", &red, &green, &blue), 3);
  EXPECT_NEAR(red, 255, 0.05);
  EXPECT_NEAR(green, 255, 0.05);
  EXPECT_NEAR(blue, 255, 0.05);
  r = RunTool("--json convert srgb cmyk 255 255 255");
  ASSERT_EQ(r.status, 0) << r.err;
  EXPECT_EQ(r.out, "[\n  {\"in\": [255, 255, 255], \"out\": [0, 0, 0, 0]}\n]\n");
  // A named-colour profile takes colour indexes: x11's first colour is LightPink.
  r = RunTool("convert " TINTWELL_ICC_DIR "/colord/x11-colors.icc srgb 1");
  ASSERT_EQ(r.status, 0) << r.err;
  EXPECT_EQ(r.out.substr(0, 8), "255 182.");
  // Through a profile between, and with another intent: white stays white, which the
  // gray accessor reads as 0 (it counts darkness).
  r = RunTool("--via lab --intent 1 convert srgb gray 255 255 255");
  ASSERT_EQ(r.status, 0) << r.err;
  EXPECT_EQ(r.out, "0\n");
}

// Values the plugin would store wrapped, or as another colour: refused before anything
// is converted (exit 2, nothing on standard output), naming the value and its range.
TEST(Tool, RefusesValuesOutsideTheirChannelsRange) {
  const std::string x11 = "convert " TINTWELL_ICC_DIR "/colord/x11-colors.icc srgb ";
  const struct {
    std::string args, input;
    std::vector<std::string> said;
  } cases[] = {
      {"convert srgb lab 255.5 0 0", "", {"R ", "0 to 255", "not 255.5"}},
      {"convert srgb lab 0 256 0", "", {"G ", "not 256"}},
      {"convert srgb lab 0 0 -1", "", {"B ", "not -1"}},
      {"convert srgb lab nan 0 0", "", {"not nan"}},
      {"convert srgb lab 0 inf 0", "", {"not inf"}},
      {"convert srgb lab 0 0 1e999", "", {"not 1e999"}},
      {"convert srgb lab 0x 0 0", "", {"not 0x"}},
      {"convert lab srgb 101 0 0", "", {"L ", "0 to 100", "not 101"}},
      {"convert lab srgb 50 128 0", "", {"a ", "-128 to under 128", "not 128"}},
      {"convert lab srgb 50 0 -128.5", "", {"b ", "not -128.5"}},
      {"convert cmyk srgb 0 0 0 1.5", "", {"K ", "0 to 1", "not 1.5"}},
      {"convert gray srgb -0.1", "", {"gray ", "not -0.1"}},
      {x11 + "4294967297", "", {"index ", "whole number from 1 to 4294967295", "not 4294967297"}},
      {x11 + "0", "", {"not 0"}},
      {x11 + "1.5", "", {"not 1.5"}},
      {"gamut srgb 100.2 0 0", "", {"L ", "not 100.2"}},
      {"gamut srgb 50 -inf 0", "", {"a ", "not -inf"}},
      {"--json gamut srgb 50 0 128", "", {"b ", "not 128"}},
      {"--json convert srgb lab 255.5 0 0", "", {"not 255.5"}},
      // From the input: every line is checked before the first colour is printed.
      {"--json convert srgb lab", "0 0 0\n\n1 2 nan\n", {"line 3: ", "B ", "not nan"}},
      {"convert srgb lab", "0 0 0\n1 2\n", {"line 2: ", "expected 3 values", "got 2"}},
      {"convert srgb lab", "0 0 0 0\n", {"line 1: ", "got 4"}},
  };
  for (const auto& c : cases) {
    const Result r = RunTool(c.args, c.input);
    EXPECT_EQ(r.status, 2) << c.args;
    EXPECT_TRUE(r.out.empty()) << c.args << ": " << r.out;
    for (const std::string& text : c.said) EXPECT_NE(r.err.find(text), std::string::npos) << c.args << ": " << r.err;
  }
  // A huge value is named, but not in full.
  const Result r = RunTool("convert srgb lab " + std::string(5000, '9') + " 0 0");
  EXPECT_EQ(r.status, 2);
  EXPECT_LT(r.err.size(), 200u) << r.err;
}

TEST(Tool, TakesTheEndsOfEachRangeAndLinesOfAnyLength) {
  for (const char* args : {"convert srgb lab 255 255 255 0 0 0", "convert lab srgb 100 -128 127.999 0 0 0",
                           "convert cmyk srgb 1 1 1 1 0 0 0 0", "convert gray srgb 1 0", "gamut srgb 100 -128 127.999",
                           "gamut srgb 0 0 0"}) {
    const Result r = RunTool(args);
    EXPECT_EQ(r.status, 0) << args << ": " << r.err;
  }
  // Below 128 every a lands on the top word; none may wrap round to -128.
  Result r = RunTool("convert lab srgb 50 127.999 -128");
  EXPECT_EQ(r.out, RunTool("convert lab srgb 50 127.99609375 -128").out);
  EXPECT_NE(r.out, RunTool("convert lab srgb 50 -128 -128").out);
  // The top named index passes the tool; the plugin then finds no such colour.
  r = RunTool("convert " TINTWELL_ICC_DIR "/colord/x11-colors.icc srgb 4294967295");
  EXPECT_EQ(r.status, 1) << r.err;
  // A line far longer than any buffer is still one colour.
  const std::string red = "255." + std::string(5000, '0') + std::string(5000, ' ') + "0, 0\n";
  r = RunTool("convert srgb lab", "0 0 0\n" + red);
  ASSERT_EQ(r.status, 0) << r.err;
  EXPECT_EQ(r.out, RunTool("convert srgb lab 0 0 0 255 0 0").out);
}

TEST(Tool, InfoAndGamut) {
  Result r = RunTool("info");
  ASSERT_EQ(r.status, 0) << r.err;
  EXPECT_NE(r.out.find("class              'mntr'"), std::string::npos);
  EXPECT_NE(r.out.find("valid              yes"), std::string::npos);
  r = RunTool("--json info lab " TINTWELL_ICC_DIR "/ghostscript/default_cmyk.icc");
  ASSERT_EQ(r.status, 0) << r.err;
  EXPECT_NE(r.out.find("\"ColorSpace\": \"Lab \""), std::string::npos);
  EXPECT_NE(r.out.find("\"ColorSpace\": \"CMYK\""), std::string::npos);
  EXPECT_EQ(r.out.front(), '[');
  r = RunTool("gamut srgb 50 0 0");
  EXPECT_EQ(r.out, "in gamut\n");
  r = RunTool("--json gamut cmyk 50 80 -80");
  EXPECT_EQ(r.out, "{\"L\": 50, \"a\": 80, \"b\": -80, \"inGamut\": false}\n");
}

TEST(Tool, FailedJobsExitOneWithTheReason) {
  Result r = RunTool("info /nonexistent/x.icc");
  EXPECT_EQ(r.status, 1);
  EXPECT_NE(r.err.find("cannot read profile /nonexistent/x.icc"), std::string::npos);
  // A file that is no profile: the plugin's code and, verbosely, its trace.
  const std::string junk = Temp("junk.icc");
  std::ofstream(junk) << "not a profile at all";
  r = RunTool("--verbose convert " + junk + " srgb 1 2 3");
  EXPECT_EQ(r.status, 1);
  EXPECT_NE(r.err.find("(CMError 2011)"), std::string::npos) << r.err;
  EXPECT_NE(r.err.find("trace: PROFILE - FILE CONSTRUCTOR"), std::string::npos) << r.err;
}


// A private copy of a system profile for the edit commands.
std::string CopyProfile(const std::string& systemPath, const std::string& name) {
  const std::string to = Temp(name);
  std::ifstream in(systemPath, std::ios::binary);
  std::ofstream(to, std::ios::binary) << in.rdbuf();
  return to;
}

bool Has(const std::string& text, const std::string& part) { return text.find(part) != std::string::npos; }

TEST(Tool, EditsThenListsAndDecodesTags) {
  const std::string in = CopyProfile(TINTWELL_ICC_DIR "/sRGB.icc", "in.icc");
  const std::string out = CopyProfile(TINTWELL_ICC_DIR "/sRGB.icc", "out.icc");
  const std::string original = Slurp(in);
  Result r = RunTool("edit " + in + " --copy-tag lumi=wtpt --remove cprt --desc 'Edited here' --copyright '(c) me'"
                     " --remove dmdd -o " + out);
  ASSERT_EQ(r.status, 0) << r.err;
  EXPECT_EQ(Slurp(in), original) << "-o leaves the profile itself alone";
  r = RunTool("tags " + out);
  ASSERT_EQ(r.status, 0) << r.err;
  EXPECT_FALSE(Has(r.out, "dmdd"));
  EXPECT_TRUE(Has(r.out, "lumi  XYZ ")) << r.out;
  EXPECT_TRUE(Has(r.out, "shared with wtpt")) << r.out;
  EXPECT_TRUE(Has(r.out, "shared with lumi")) << r.out;
  const struct {
    std::string args, out;
  } decoded[] = {
      {"tag " + out + " desc", "Edited here\n"},
      {"tag " + out + " cprt", "(c) me\n"},
      {"--json tag " + out + " cprt", "{\"tag\": \"cprt\", \"text\": \"(c) me\"}\n"},
      {"--raw tag " + out + " cprt", "00000000  74 65 78 74 00 00 00 00  28 63 29 20 6d 65 00     |text....(c) me.|\n"},
      {"tag " + out + " lumi", RunTool("tag " + out + " wtpt").out},
      {"tag gray kTRC", "gamma 2.2\n"},  // a pure parametric curve
      {"tag " TINTWELL_ICC_DIR "/colord/AdobeRGB1998.icc gTRC", "gamma 2.1992\n"},  // 0x0233 / 256
  };
  for (const auto& d : decoded) {
    r = RunTool(d.args);
    EXPECT_EQ(r.status, 0) << d.args << ": " << r.err;
    EXPECT_EQ(r.out, d.out) << d.args;
  }
  r = RunTool("tag " + out + " rTRC");
  EXPECT_EQ(r.out.substr(0, r.out.find('\n')), "1024 entries");
  r = RunTool("--json tags " + out);
  EXPECT_TRUE(Has(r.out, "\"tag\": \"lumi\", \"type\": \"XYZ \"")) << r.out;
  r = RunTool("tag " TINTWELL_ICC_DIR "/colord/x11-colors.icc ncl2");
  ASSERT_EQ(r.status, 0) << r.err;
  EXPECT_TRUE(Has(r.out, "     1  Light pink  ")) << r.out.substr(0, 300);

  // In place: the profile's own file changes.
  r = RunTool("edit " + in + " --remove cprt");
  ASSERT_EQ(r.status, 0) << r.err;
  EXPECT_NE(Slurp(in), original);
  EXPECT_EQ(RunTool("tag " + in + " cprt").status, 1);
}

TEST(Tool, TagCommandsRefuseBadRequests) {
  const std::string copy = CopyProfile(TINTWELL_ICC_DIR "/sRGB.icc", "bad.icc");
  const std::string original = Slurp(copy);
  const struct {
    std::string args;
    int status;
    std::string said;
  } cases[] = {
      {"tag srgb zzzz", 1, "no tag 'zzzz'"},
      {"tag srgb abcde", 2, "1 to 4 characters"},
      {"tag srgb", 2, "tag needs"},
      {"tags", 2, "tags needs"},
      {"--raw tags srgb", 2, "--raw"},
      {"info srgb -o x.icc", 2, "edit command"},
      {"edit srgb --desc x", 2, "-o OUT"},
      {"edit " + copy, 2, "edit needs"},
      {"edit " + copy + " --copy-tag lumi", 2, "NEW=EXISTING"},
      {"edit " + copy + " --remove zzzz", 1, "cannot remove tag 'zzzz' (CMError 2012)"},
      {"edit " + copy + " --copy-tag lumi=zzzz", 1, "(CMError 2012)"},
  };
  for (const auto& c : cases) {
    const Result r = RunTool(c.args);
    EXPECT_EQ(r.status, c.status) << c.args;
    EXPECT_TRUE(Has(r.err, c.said)) << c.args << ": " << r.err;
  }
  EXPECT_EQ(Slurp(copy), original) << "a failed edit saves nothing";
}


std::string Replaced(std::string text, const std::string& from, const std::string& to) {
  const std::size_t at = text.find(from);
  EXPECT_NE(at, std::string::npos) << from;
  if (at != std::string::npos) text.replace(at, from.size(), to);
  return text;
}

std::string WriteFile(const std::string& name, const std::string& text) {
  const std::string path = Temp(name);
  std::ofstream(path, std::ios::binary) << text;
  return path;
}

std::string Values(std::size_t n, int value) {
  std::string out;
  for (std::size_t i = 0; i < n; ++i) out += (i ? ", " : "") + std::to_string(value + static_cast<int>(i % 200));
  return out;
}

// Every number of a lut dump from its matrix on: the values, whatever their spelling.
std::vector<double> LutNumbers(const std::string& json) {
  std::vector<double> values;
  const char* p = json.c_str() + json.find("\"matrix\"");
  while (*p) {
    if (*p == '-' || (*p >= '0' && *p <= '9')) values.push_back(std::strtod(p, const_cast<char**>(&p)));
    else ++p;
  }
  return values;
}

// A lut dumped with --json, edited, written back with --lut-from and dumped again: the
// new dump holds the edited values, and the saved bytes hold them where the tag layout
// puts them.
TEST(Tool, DumpsEditsAndWritesBackLuts) {
  Result r = RunTool("tag cmyk A2B0");
  ASSERT_EQ(r.status, 0) << r.err;
  EXPECT_EQ(r.out.substr(0, r.out.find('\n')), "lut16 ('mft2'): 4 inputs, 3 outputs, 9 grid points");
  EXPECT_TRUE(Has(r.out, "clut           19683 entries (9^4 grid points x 3)")) << r.out;
  r = RunTool("--json tag cmyk A2B0");
  ASSERT_EQ(r.status, 0) << r.err;
  std::string lut16 = Replaced(r.out, "\"matrix\": [1, 0,", "\"matrix\": [1, -1.5,");
  // The first three CLUT entries replaced, spelt as a hand edit might spell them.
  const std::size_t first = lut16.find("\"lut\": [") + 8;
  std::size_t fourth = first;
  for (int k = 0; k < 3; ++k) fourth = lut16.find(", ", fourth) + 2;
  lut16.replace(first, fourth - first, "65535, 0.0e0, 12e2, ");
  const std::string mft1 =
      "{\"type\": \"mft1\", \"inputChannels\": 3, \"outputChannels\": 3, \"gridPoints\": 2,\n"
      " \"matrix\": [1, 0, 0, 0.0000152587890625, 0.25, 0, 0, 0, -3.5], \"inCurve\": [" + Values(768, 0) + "],\n"
      " \"lut\": [" + Values(24, 55) + "], \"outCurve\": [" + Values(768, 50) + "]}";
  const struct {
    std::string json;
    std::size_t size;  // the tag's bytes, as Little CMS reads them
    std::vector<std::pair<std::size_t, std::vector<std::uint8_t>>> bytes;  // edited values where they sit
  } cases[] = {
      // Header 52 bytes, input tables 4 x 256 entries of 2 bytes: the CLUT starts at 2100.
      {lut16, 52 + 2 * (1024 + 19683 + 6), {{16, {0xFF, 0xFE, 0x80, 0x00}}, {2100, {0xFF, 0xFF, 0, 0, 0x04, 0xB0}}}},
      {mft1, 1608, {{24, {0, 0, 0, 1}}, {28, {0, 0, 0x40, 0}}, {44, {0xFF, 0xFC, 0x80, 0}}, {48 + 768, {55, 56, 57}}, {1607, {217}}}},
  };
  const std::string copy = CopyProfile(TINTWELL_ICC_DIR "/ghostscript/default_cmyk.icc", "lut.icc");
  const std::string out = Temp("lut_out.icc");
  for (const auto& c : cases) {
    const std::string file = WriteFile("lut.json", c.json);
    r = RunTool("edit " + copy + " --lut-from " + file + " A2B1 -o " + out);
    ASSERT_EQ(r.status, 0) << r.err;
    const std::vector<std::uint8_t> raw = LcmsFile(out).Raw("A2B1");
    ASSERT_EQ(raw.size(), c.size);
    for (const auto& [at, bytes] : c.bytes)
      EXPECT_EQ(std::vector<std::uint8_t>(raw.begin() + static_cast<long>(at),
                                          raw.begin() + static_cast<long>(at + bytes.size())), bytes) << "at " << at;
    r = RunTool("--json tag " + out + " A2B1");
    ASSERT_EQ(r.status, 0) << r.err;
    EXPECT_TRUE(LutNumbers(r.out) == LutNumbers(c.json)) << "the values read back as written";
  }
}

TEST(Tool, RefusesMalformedLutFiles) {
  const std::string dump = RunTool("--json tag cmyk A2B0").out;
  ASSERT_TRUE(Has(dump, "\"type\": \"mft2\""));
  const std::string copy = CopyProfile(TINTWELL_ICC_DIR "/ghostscript/default_cmyk.icc", "badlut.icc");
  const std::string original = Slurp(copy);
  const struct {
    std::string json, said;
  } cases[] = {
      {dump.substr(0, dump.size() / 2), "not valid JSON: line "},
      {dump + "x", "text after the value"},
      {"", "unexpected end of text"},
      {std::string(100000, '['), "nested deeper than"},
      {"{\"a\": 1, \"a\": 2}", "a key repeated"},
      {"{\"type\": 0x10}", "expected '}'"},
      {"[1e999]", "a number too large"},
      {"[\"\\q\"]", "unknown escape"},
      {"[1, 2]", "a lut is a JSON object"},
      {Replaced(dump, "\"type\": \"mft2\"", "\"type\": \"mft3\""), "\"type\" is \"mft1\" or \"mft2\""},
      {Replaced(dump, "\"type\": \"mft2\"", "\"type\": \"mft1\""), "\"inCurve\"[1] is 548, not a whole number from 0 to 255"},
      {Replaced(dump, "\"gridPoints\": 9", "\"gridPoints\": 8"), "\"lut\" holds 19683 values, not 8^4 grid points x 3"},
      {Replaced(dump, "\"inputChannels\": 4", "\"inputChannels\": 16"), "\"inputChannels\" is a whole number from 1 to 15"},
      {Replaced(dump, "\"inCurve\": [0,", "\"inCurve\": ["), "\"inCurve\" holds 1023 values; 4 channels need"},
      {Replaced(dump, "\"outCurve\": [0,", "\"outCurve\": [0.5,"), "\"outCurve\"[0] is 0.5"},
      {Replaced(dump, "\"outCurve\": [0,", "\"outCurve\": [65536,"), "\"outCurve\"[0] is 65536"},
      {Replaced(dump, "\"outCurve\": [0,", "\"outCurve\": [\"0\","), "\"outCurve\"[0] is not a number"},
      {Replaced(dump, "\"matrix\": [1,", "\"matrix\": ["), "\"matrix\" holds 9 numbers"},
      {Replaced(dump, "\"matrix\": [1,", "\"matrix\": [40000,"), "\"matrix\"[0] is 40000"},
      {Replaced(dump, "\"tag\"", "\"tog\""), "unknown key \"tog\""},
      {Replaced(dump, "\"lut\"", "\"tag2\""), "unknown key"},
  };
  for (const auto& c : cases) {
    const std::string file = WriteFile("bad.json", c.json);
    const Result r = RunTool("edit " + copy + " --desc first --lut-from " + file + " A2B0");
    EXPECT_EQ(r.status, 2) << c.said;
    EXPECT_TRUE(Has(r.err, c.said)) << c.said << ": " << r.err;
  }
  EXPECT_EQ(RunTool("edit " + copy + " --lut-from /nonexistent.json A2B0").status, 2);
  EXPECT_EQ(RunTool("edit " + copy + " --lut-from x.json").status, 2);
  EXPECT_EQ(Slurp(copy), original) << "a refused lut file saves nothing, not even the edits before it";
}

// search, link, blank and copy over a colour directory of the test's own.
TEST(Tool, FindsAndMakesProfilesThroughThePlugin) {
  const std::string dir = Temp("find");
  std::system(("rm -rf '" + dir + "' && mkdir -p '" + dir + "/icc'").c_str());
  std::system(("cp /usr/share/color/icc/sRGB.icc /usr/share/color/icc/ghostscript/default_cmyk.icc '" + dir +
               "/icc/'").c_str());
  setenv("TINTWELL_COLOR_DIR", (dir + "/icc").c_str(), 1);

  Result r = RunTool("search --class prtr --json");
  ASSERT_EQ(r.status, 0) << r.err;
  EXPECT_EQ(r.out, "[\n  {\"path\": \"" + dir + "/icc/default_cmyk.icc\", \"class\": \"prtr\", \"description\": "
                   "\"Artifex CMYK SWOP Profile\"}\n]\n");
  r = RunTool("search --space RGB");
  ASSERT_EQ(r.status, 0) << r.err;
  EXPECT_EQ(r.out, dir + "/icc/sRGB.icc  mntr  sRGB\n");
  EXPECT_EQ(RunTool("search --model 7 --json").out, "[]\n");
  EXPECT_EQ(RunTool("search").out.find("sRGB.icc"), RunTool("search").out.rfind("sRGB.icc"));  // listed once

  const std::string link = dir + "/link.icc", blank = dir + "/blank.icc", copy = dir + "/copy.icc";
  r = RunTool("link " + link + " srgb cmyk --intent 1");
  ASSERT_EQ(r.status, 0) << r.err;
  cmsHPROFILE p = cmsOpenProfileFromFile(link.c_str(), "r");
  ASSERT_NE(p, nullptr);
  EXPECT_EQ(cmsGetDeviceClass(p), cmsSigLinkClass);
  cmsCloseProfile(p);
  r = RunTool("blank " + blank);
  ASSERT_EQ(r.status, 0) << r.err;
  p = cmsOpenProfileFromFile(blank.c_str(), "r");
  ASSERT_NE(p, nullptr);
  EXPECT_TRUE(cmsIsTag(p, cmsSigRedTRCTag));
  EXPECT_FALSE(cmsIsTag(p, cmsSigAToB0Tag));
  cmsCloseProfile(p);
  r = RunTool("copy " + link + " " + copy);
  ASSERT_EQ(r.status, 0) << r.err;
  EXPECT_EQ(Slurp(copy), Slurp(link));

  // Failed jobs: exit 1, the plugin's code.
  r = RunTool("link " + dir + "/missing/x.icc srgb cmyk");
  EXPECT_EQ(r.status, 1);
  EXPECT_NE(r.err.find("CMError -1"), std::string::npos) << r.err;
  EXPECT_EQ(RunTool("copy " + dir + "/none.icc " + copy).status, 1);
  EXPECT_EQ(Slurp(copy), Slurp(link));
  unsetenv("TINTWELL_COLOR_DIR");
  std::system(("rm -rf '" + dir + "'").c_str());
}

#if TINTWELL_IMAGE_FILES

TEST(Tool, EmbedsAndExtractsImageProfiles) {
  const std::string dir = Temp("img_");
  const std::string icc = std::string(TINTWELL_ICC_DIR) + "/sRGB.icc", lab = std::string(TINTWELL_ICC_DIR) + "/ITULab.icc";
  testimage::Make(testimage::Kind::Png, dir + "a.png", 9, 7, 3, {});
  Result r = RunTool("embed " + dir + "a.png " + icc + " -o " + dir + "b.png");
  ASSERT_EQ(r.status, 0) << r.err;
  r = RunTool("extract " + dir + "b.png -o " + dir + "p.icc");
  ASSERT_EQ(r.status, 0) << r.err;
  EXPECT_EQ(testimage::ReadFile(dir + "p.icc"), testimage::ReadFile(icc));

  testimage::Make(testimage::Kind::Jpeg, dir + "c.jpg", 9, 7, 3, testimage::ReadFile(icc));
  r = RunTool("embed " + dir + "c.jpg " + lab + " -o " + dir + "d.jpg");
  EXPECT_EQ(r.status, 1);
  EXPECT_NE(r.err.find("already carries a profile"), std::string::npos) << r.err;
  r = RunTool("embed --replace " + dir + "c.jpg " + lab + " -o " + dir + "d.jpg");
  ASSERT_EQ(r.status, 0) << r.err;
  EXPECT_EQ(testimage::Read(testimage::Kind::Jpeg, dir + "d.jpg").icc, testimage::ReadFile(lab));

  const struct {
    std::string args;
    int status;
    const char* message;
  } failures[] = {
      {"extract " + dir + "a.png -o " + dir + "q.icc", 1, "carries no profile"},
      {"extract " + icc + " -o " + dir + "q.icc", 1, "not a readable PNG, JPEG or TIFF"},
      {"extract " + dir + "missing.png -o " + dir + "q.icc", 1, "cannot read"},
      {"embed " + dir + "a.png " + icc, 2, "embed takes IMAGE PROFILE -o OUT"},
      {"extract " + dir + "a.png", 2, "extract takes IMAGE -o OUT.icc"},
      {"info srgb --replace", 2, "--replace belongs to the embed command"},
  };
  for (const auto& f : failures) {
    r = RunTool(f.args);
    EXPECT_EQ(r.status, f.status) << f.args;
    EXPECT_NE(r.err.find(f.message), std::string::npos) << r.err;
  }
  EXPECT_NE(access((dir + "q.icc").c_str(), F_OK), 0);
  for (const char* name : {"a.png", "b.png", "p.icc", "c.jpg", "d.jpg"}) std::remove((dir + name).c_str());
}

#endif

}  // namespace
