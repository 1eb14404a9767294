// Several programs using the plugin at once, and programs killed while saving: each
// program works on its own copies, a save publishes only its own bytes, a killed save
// leaves the old or the new profile, and the next start removes what the killed left.
#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdio>
#include <cstring>
#include <random>
#include <set>
#include <thread>

#include "plugin_fixture.h"
#include "profile_files.h"

namespace {

using host::Object;

// One profile_worker run, its standard output read through a pipe.
class Worker {
 public:
  Worker(const std::string& program, const std::string& file, long count, int first, bool check) {
    int out[2];
    if (pipe(out) != 0) ADD_FAILURE() << "pipe";
    pid_ = fork();
    if (pid_ == 0) {
      dup2(out[1], 1);
      close(out[0]);
      close(out[1]);
      const std::string n = std::to_string(count), v = std::to_string(first);
      execl(program.c_str(), "profile_worker", TINTWELL_PLUGIN_PATH, file.c_str(), n.c_str(), v.c_str(),
            check ? "--check" : nullptr, nullptr);
      _exit(127);
    }
    close(out[1]);
    output_ = fdopen(out[0], "r");
  }
  ~Worker() {
    if (pid_ > 0) Kill();
  }
  // The working folder it claimed (its first line).
  std::string Folder() {
    char line[4096];
    if (!std::fgets(line, sizeof line, output_)) return "";
    std::string s(line);
    if (s.rfind("folder ", 0) != 0) return "";
    return s.substr(7, s.size() - 8);
  }
  // Waits for the end; returns the exit status and the values it reported saved.
  int Finish(std::set<int>* saved = nullptr) {
    char line[4096];
    while (std::fgets(line, sizeof line, output_))
      if (saved && std::strncmp(line, "saved ", 6) == 0) saved->insert(std::atoi(line + 6));
    std::fclose(output_);
    int status = 0;
    waitpid(pid_, &status, 0);
    pid_ = -1;
    return WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
  }
  void Kill() { kill(pid_, SIGKILL); }

 private:
  pid_t pid_ = -1;
  FILE* output_ = nullptr;
};

// The workers run from a private copy of the program, so the temporary folder beside it
// is theirs alone and what they leave there can be counted.
class ProcessesTest : public PluginTest {
 protected:
  void SetUp() override {
    PluginTest::SetUp();
    ASSERT_EQ(mkdir(files.Path("bin").c_str(), 0777), 0);
    ProfileFiles::Write(program, ProfileFiles::Read(TINTWELL_PROFILE_WORKER));
    ASSERT_EQ(chmod(program.c_str(), 0755), 0);
  }
  Worker Start(const std::string& file, long count, int first, bool check) {
    return Worker(program, file, count, first, check);
  }
  // Every file left in the workers' temporary folder, as "folder/name".
  std::vector<std::string> LeftInTemp() {
    std::vector<std::string> left;
    const std::string temp = files.Path("bin/temp/");
    for (const std::string& folder : ProfileFiles::Listing(temp))
      for (const std::string& name : ProfileFiles::Listing(temp + folder)) left.push_back(folder + "/" + name);
    return left;
  }

  std::string Read(const std::string& path, const char* property) {
    Object p = Open(path);
    EXPECT_EQ(Error(), 0) << path;
    EXPECT_TRUE(rt->Call(p, "ValidProfile").AsBoolean()) << path;
    return rt->Get(p, property).IsString() ? rt->Get(p, property).AsString()
                                           : std::to_string(rt->Get(p, property).AsInteger());
  }
  ProfileFiles files;
  const std::string program = files.Path("bin/profile_worker");
};

TEST_F(ProcessesTest, TwoProgramsSavingDifferentProfilesKeepTheirOwnBytes) {
  const std::string a = files.Copy("sRGB.icc", "a.icc"), b = files.Copy("Gray.icc", "b.icc");
  Worker wa = Start(a, 40, 1000, true), wb = Start(b, 40, 2000, true);
  EXPECT_EQ(wa.Finish(), 0);
  EXPECT_EQ(wb.Finish(), 0);
  EXPECT_EQ(Read(a, "ColorSpace"), "RGB ");
  EXPECT_EQ(Read(a, "Model"), "1039");
  EXPECT_EQ(Read(b, "ColorSpace"), "GRAY");
  EXPECT_EQ(Read(b, "Model"), "2039");
}

TEST_F(ProcessesTest, TwoProgramsSavingOneProfileLeaveOneWholeSave) {
  const std::string f = files.Copy("sRGB.icc", "f.icc");
  Worker w1 = Start(f, 40, 1000, false), w2 = Start(f, 40, 2000, false);
  std::set<int> saved;
  EXPECT_EQ(w1.Finish(&saved), 0);
  EXPECT_EQ(w2.Finish(&saved), 0);
  EXPECT_EQ(saved.size(), 80u);
  const int last = std::stoi(Read(f, "Model"));
  EXPECT_TRUE(last == 1039 || last == 2039) << last;
}

TEST_F(ProcessesTest, AKilledSaveLeavesTheOldOrTheNewProfileAndNextStartCleansUp) {
  const std::string f = files.Copy("sRGB.icc", "k.icc");
  const std::string original = Read(f, "Model");
  std::mt19937 random(7);
  std::set<int> saved;
  for (int round = 0; round < 12; ++round) {
    Worker w = Start(f, 1000000, 1000 * (round + 1), false);
    ASSERT_FALSE(w.Folder().empty());
    std::this_thread::sleep_for(std::chrono::milliseconds(random() % 40));
    w.Kill();
    w.Finish(&saved);
    const std::string model = Read(f, "Model");
    // The last value reported saved, or the one being saved when it was killed.
    EXPECT_TRUE(model == original || saved.count(std::stoi(model)) || saved.count(std::stoi(model) - 1) ||
                std::stoi(model) % 1000 == 0)
        << model;
  }
  EXPECT_FALSE(LeftInTemp().empty());  // the killed leave their copies
  Worker next = Start(f, 1, 1, true);  // a new start, which sweeps
  EXPECT_EQ(next.Finish(), 0);
  // Only the folder that the last program claimed, with its lock.
  const std::vector<std::string> left = LeftInTemp();
  ASSERT_EQ(left.size(), 1u) << left.front();
  EXPECT_EQ(left[0].substr(left[0].find('/')), "/lock");
  for (const std::string& name : ProfileFiles::Listing(files.Path("")))
    EXPECT_NE(name.rfind(".tw-", 0), 0u) << "left beside the profile: " << name;
}

}  // namespace
