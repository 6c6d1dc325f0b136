// SPDX-License-Identifier: MIT
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <filesystem>
#include <string>
#include <vector>

#include "norvale_3d_sticker_core.h"
#include "platform/cpu_testing.h"
#include "platform/task_pool.h"

namespace n3ds::testing {
namespace {

using ::testing::Each;
using ::testing::ElementsAre;

// A pool of one worker on a machine of fake cores, whose switches hold the given characters.
class CpuSwitch : public ::testing::Test {
 protected:
  ~CpuSwitch() override { mcvParallelUninit(pool_); }

  void MakeCores(const std::string& states) {
    for (size_t core = 0; core < states.size(); ++core) {
      cpus_.WriteSwitch(static_cast<int>(core), std::string(1, states[core]) + "\n");
    }
  }
  void MakePool(long configured, long online) {
    cpus_.SetCounts(configured, online);
    pool_ = static_cast<TaskPool*>(mcvParallelInit(nullptr, 1));
    ASSERT_NE(pool_, nullptr);
  }
  // First character of each switch.
  std::string States(int count) const {
    std::string states;
    for (int core = 0; core < count; ++core) states += cpus_.ReadSwitch(core).substr(0, 1);
    return states;
  }
  std::vector<uint32_t> Saved(uint32_t count) const {
    return {pool_->savedCpuOnline, pool_->savedCpuOnline + count};
  }

  FakeCpus cpus_{1, 1};
  TaskPool* pool_ = nullptr;
};

// The one look at the real setting: its value, not what lies there.
TEST(CpuSystem, DefaultIsTheKernelsSwitch) {
  EXPECT_STREQ(cpu_system.directory, "/sys/devices/system/cpu");
  EXPECT_EQ(cpu_system.count, static_cast<long (*)(int)>(sysconf));
  EXPECT_GE(ConfiguredCpus(), OnlineCpus());
}

TEST(CpuSystem, UnknownCountsAreOne) {
  FakeCpus cpus(-1, 0);
  EXPECT_EQ(ConfiguredCpus(), 1u);
  EXPECT_EQ(OnlineCpus(), 1u);
}

TEST_F(CpuSwitch, FiresOfflineCoresAndRestoresThem) {
  MakeCores("1010");
  MakePool(4, 2);
  mcvTryFireCpu(pool_);
  EXPECT_EQ(States(4), "1111");
  EXPECT_THAT(Saved(4), ElementsAre(1, 0, 1, 0));
  EXPECT_EQ(pool_->cpusFired, 1u);
  EXPECT_EQ(cpus_.ReadSwitch(0), "1\n") << "a core that was online is not written";

  mcvTryRestoreCpu(pool_);
  EXPECT_EQ(States(4), "1010");
  EXPECT_EQ(cpus_.ReadSwitch(3), "0") << "one digit";
  EXPECT_EQ(pool_->cpusFired, 0u);
}

TEST_F(CpuSwitch, RestoreWithoutFireDoesNothing) {
  MakeCores("0101");
  MakePool(4, 2);
  mcvTryRestoreCpu(pool_);
  EXPECT_EQ(cpus_.ReadSwitch(0), "0\n");
  EXPECT_EQ(cpus_.ReadSwitch(1), "1\n");
}

TEST_F(CpuSwitch, RestoresOnlyOnce) {
  MakeCores("10");
  MakePool(2, 1);
  mcvTryFireCpu(pool_);
  mcvTryRestoreCpu(pool_);
  cpus_.WriteSwitch(1, "1\n");
  mcvTryRestoreCpu(pool_);
  EXPECT_EQ(cpus_.ReadSwitch(1), "1\n");
}

TEST_F(CpuSwitch, AllOnlineSavesTheStatesButFiresNothing) {
  MakeCores("101");  // the count decides, not the switches
  MakePool(3, 3);
  mcvTryFireCpu(pool_);
  EXPECT_EQ(States(3), "101");
  EXPECT_THAT(Saved(3), ElementsAre(1, 0, 1));
  EXPECT_EQ(pool_->cpusFired, 0u);
}

TEST_F(CpuSwitch, FiresInOrderAndNoMoreCoresThanWereOffline) {
  MakeCores("10000");
  MakePool(5, 3);
  mcvTryFireCpu(pool_);
  EXPECT_EQ(States(5), "11100");
}

TEST_F(CpuSwitch, StopsAtTheEndOfTheListWhenFewerCoresReadAsOffline) {
  MakeCores("101");
  MakePool(3, 1);
  mcvTryFireCpu(pool_);
  EXPECT_EQ(States(3), "111");
  EXPECT_EQ(pool_->cpusFired, 1u);
}

TEST_F(CpuSwitch, StateIsTheNumericValueOfTheCharacter) {
  MakeCores("19x 0");
  MakePool(5, 4);
  mcvTryFireCpu(pool_);
  EXPECT_THAT(Saved(5), ElementsAre(1, 1, 0, 0, 0));
}

TEST_F(CpuSwitch, MissingSwitchEndsTheOperation) {
  MakeCores("10");
  MakePool(3, 1);  // core 2 has no switch
  mcvTryFireCpu(pool_);
  EXPECT_EQ(States(2), "10");
  EXPECT_THAT(Saved(16), Each(0u));
  EXPECT_EQ(pool_->cpusFired, 0u);
}

TEST_F(CpuSwitch, EmptySwitchEndsTheOperation) {
  MakeCores("10");
  cpus_.WriteSwitch(1, "");
  MakePool(2, 1);
  mcvTryFireCpu(pool_);
  EXPECT_THAT(Saved(16), Each(0u));
  EXPECT_EQ(pool_->cpusFired, 0u);
}

TEST_F(CpuSwitch, RefusedWriteEndsTheOperation) {
  // /dev/full reads as a zero character and refuses what is flushed to it, as the kernel refuses a
  // core it cannot start.
  if (access("/dev/full", W_OK) != 0) GTEST_SKIP() << "no /dev/full";
  MakeCores("1000");
  std::filesystem::remove(cpus_.Switch(2));
  std::filesystem::create_symlink("/dev/full", cpus_.Switch(2));
  MakePool(4, 1);
  mcvTryFireCpu(pool_);
  EXPECT_EQ(cpus_.ReadSwitch(1), "1");
  EXPECT_EQ(cpus_.ReadSwitch(3), "0\n");
  EXPECT_EQ(pool_->cpusFired, 1u) << "core 1 awaits restoring";

  mcvTryRestoreCpu(pool_);
  EXPECT_EQ(cpus_.ReadSwitch(1), "0");
  EXPECT_EQ(cpus_.ReadSwitch(3), "0\n") << "restoring stops at core 2";
  EXPECT_EQ(pool_->cpusFired, 0u);
}

TEST_F(CpuSwitch, RestoreStopsAtASwitchThatIsGone) {
  MakeCores("1000");
  MakePool(4, 1);
  mcvTryFireCpu(pool_);
  std::filesystem::remove_all(cpus_.Switch(2).parent_path());
  mcvTryRestoreCpu(pool_);
  EXPECT_EQ(cpus_.ReadSwitch(1), "0");
  EXPECT_EQ(cpus_.ReadSwitch(3), "1");
  EXPECT_EQ(pool_->cpusFired, 0u);
}

TEST_F(CpuSwitch, CoresBeyondSixteenAreFiredButNotRestored) {
  MakeCores("11111111111111101001");
  MakePool(20, 17);
  mcvTryFireCpu(pool_);
  EXPECT_EQ(States(20), "11111111111111111111");
  EXPECT_THAT(Saved(16), ElementsAre(1, 1, 1, 1, 1, 1, 1, 1, 1, 1, 1, 1, 1, 1, 1, 0));
  mcvTryRestoreCpu(pool_);
  EXPECT_EQ(States(20), "11111111111111101111");
}

TEST_F(CpuSwitch, MemoryForTheStatesExhausted) {
  MakeCores("10");
  MakePool(2, 1);
  alignas(8) unsigned char area[40];
  pool_->memory = MMemMgrCreate(area, sizeof(area));
  void* all = MMemAlloc(pool_->memory, 8);
  mcvTryFireCpu(pool_);
  EXPECT_EQ(States(2), "10");
  EXPECT_EQ(pool_->cpusFired, 0u);
  MMemFree(pool_->memory, all);
  pool_->memory = nullptr;
}

TEST_F(CpuSwitch, PathTooLongIsAMissingSwitch) {
  MakeCores("10");
  MakePool(2, 1);
  const std::string longer = std::string(cpu_system.directory) + std::string(600, '/');
  const CpuSystem saved = cpu_system;
  cpu_system.directory = longer.c_str();
  mcvTryFireCpu(pool_);
  cpu_system = saved;
  EXPECT_EQ(States(2), "10");
  EXPECT_EQ(pool_->cpusFired, 0u);
}

TEST_F(CpuSwitch, NullPoolIsIgnored) {
  MakeCores("10");
  MakePool(2, 1);
  mcvTryFireCpu(nullptr);
  mcvTryRestoreCpu(nullptr);
  EXPECT_EQ(States(2), "10");
}

}  // namespace
}  // namespace n3ds::testing
