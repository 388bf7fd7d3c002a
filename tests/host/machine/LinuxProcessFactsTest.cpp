// SPDX-License-Identifier: Apache-2.0
#include "host/machine/LinuxProcessFacts.h"

#include <gtest/gtest.h>
#include <sys/mman.h>
#include <unistd.h>

#include <cstdlib>
#include <filesystem>

#include "host/machine/LinuxClock.h"
#include "tests/host/Eventually.h"
#include "tests/host/TemporaryFolder.h"

namespace tarn::linux_host {
namespace {

using platform::ThermalState;
using testing::eventually;

class RecordedFacts : public ::testing::Test {
 protected:
  // A zone with trip points as "type limit" pairs.
  void zone(const std::string& name, const std::string& temperature,
            std::initializer_list<std::pair<const char*, const char*>> trips, const char* mode = "enabled") {
    const std::string stem = "class/thermal/" + name + "/";
    folder_.write(stem + "temp", temperature + "\n");
    folder_.write(stem + "mode", std::string(mode) + "\n");
    int index = 0;
    for (const auto& [type, limit] : trips) {
      folder_.write(stem + "trip_point_" + std::to_string(index) + "_type", std::string(type) + "\n");
      folder_.write(stem + "trip_point_" + std::to_string(index) + "_temp", std::string(limit) + "\n");
      ++index;
    }
  }

  TemporaryFolder folder_;
  LinuxProcessFacts facts_{folder_.path(), folder_.path()};
};

TEST_F(RecordedFacts, ProcessNameIsTheKernelsName) {
  folder_.write("7/comm", "player\n");
  EXPECT_EQ(facts_.processName(7), "player");
}

TEST_F(RecordedFacts, ProcessNameKeepsBlanksAndLineEndsInside) {
  folder_.write("7/comm", "a b\nc\n");
  EXPECT_EQ(facts_.processName(7), "a b\nc");
}

TEST_F(RecordedFacts, ProcessNameIsTextWhateverItsBytes) {
  folder_.write("7/comm", "a\xFF\xC3z\n");
  EXPECT_EQ(facts_.processName(7), "a\uFFFD\uFFFDz");
  folder_.write("8/comm", "fourteen-bytes\xC3\n");  // cut inside a character
  EXPECT_EQ(facts_.processName(8), "fourteen-bytes\uFFFD");
  std::filesystem::create_symlink("/usr/bin/fourteen-bytes\u00E9", folder_.path("8/exe"));
  EXPECT_EQ(facts_.processName(8), "fourteen-bytes\u00E9");
}

TEST_F(RecordedFacts, NameThatTheKernelCutIsCompletedByTheExecutable) {
  folder_.write("7/comm", "telephony-engin\n");
  std::filesystem::create_symlink("/usr/bin/telephony-engine-host", folder_.path("7/exe"));
  EXPECT_EQ(facts_.processName(7), "telephony-engine-host");
}

TEST_F(RecordedFacts, ExecutableThatWasReplacedOnDiskStillCompletesTheName) {
  folder_.write("7/comm", "telephony-engin\n");
  std::filesystem::create_symlink("/usr/bin/telephony-engine (deleted)", folder_.path("7/exe"));
  EXPECT_EQ(facts_.processName(7), "telephony-engine");
}

TEST_F(RecordedFacts, NameThatTheKernelCutIsCompletedByTheFirstArgument) {
  folder_.write("7/comm", "telephony-engin\n");
  std::filesystem::create_symlink("/usr/bin/python3.11", folder_.path("7/exe"));
  folder_.write("7/cmdline", std::string("/opt/telephony-engine.py\0--serve\0", 33));
  EXPECT_EQ(facts_.processName(7), "telephony-engine.py");
}

TEST_F(RecordedFacts, NameOfFifteenBytesThatNothingCompletesStays) {
  folder_.write("7/comm", "fifteen-letters\n");
  folder_.write("7/cmdline", std::string("other\0", 6));
  EXPECT_EQ(facts_.processName(7), "fifteen-letters");
}

TEST_F(RecordedFacts, ShorterNameIsNotReplacedByALongerExecutable) {
  folder_.write("7/comm", "python3\n");
  std::filesystem::create_symlink("/usr/bin/python3.11", folder_.path("7/exe"));
  EXPECT_EQ(facts_.processName(7), "python3");
}

TEST_F(RecordedFacts, ProcessThatIsGoneOrHiddenHasNoName) {
  EXPECT_FALSE(facts_.processName(7));
  EXPECT_FALSE(facts_.processName(0));
  EXPECT_FALSE(facts_.processName(-1));
}

TEST_F(RecordedFacts, FootprintIsAnonymousPlusSwapped) {
  folder_.write("self/status", "Name:\tx\nVmSwap:\t     100 kB\nRssAnon:\t    2000 kB\nRssFile:\t 9 kB\n");
  EXPECT_EQ(facts_.physicalFootprint().value, 2100U * 1024U);
}

TEST_F(RecordedFacts, FootprintThatCannotBeReadTellsWhy) {
  EXPECT_EQ(facts_.physicalFootprint().error.text(), folder_.path("self/status") + ": No such file or directory");
  folder_.write("self/status", "Name:\tx\nVmSwap:\t100 kB\n");
  EXPECT_EQ(facts_.physicalFootprint().error.text(), folder_.path("self/status") + ": no RssAnon");
  folder_.write("self/status", "Name:\tx\nRssAnon:\t100 kB\n");
  EXPECT_EQ(facts_.physicalFootprint().error.text(), folder_.path("self/status") + ": no VmSwap");
  EXPECT_EQ(facts_.physicalFootprint().value, 0U);
}

TEST_F(RecordedFacts, MachineWithoutThermalZonesIsNominal) {
  EXPECT_EQ(facts_.thermalState(), ThermalState::Nominal);
}

TEST_F(RecordedFacts, TripPointsCountFromTheirTemperatureOn) {
  const std::initializer_list<std::pair<const char*, const char*>> trips{
      {"active", "40000"}, {"passive", "70000"}, {"hot", "90000"}, {"critical", "105000"}};
  const std::pair<const char*, ThermalState> expected[] = {
      {"39999", ThermalState::Nominal},  {"40000", ThermalState::Nominal},  {"69999", ThermalState::Nominal},
      {"70000", ThermalState::Fair},     {"89999", ThermalState::Fair},     {"90000", ThermalState::Serious},
      {"104999", ThermalState::Serious}, {"105000", ThermalState::Critical}};
  for (const auto& [temperature, state] : expected) {
    zone("thermal_zone0", temperature, trips);
    EXPECT_EQ(facts_.thermalState(), state) << temperature;
  }
}

TEST_F(RecordedFacts, WorstZoneCounts) {
  zone("thermal_zone0", "30000", {{"critical", "105000"}});
  zone("thermal_zone1", "80000", {{"passive", "75000"}});
  zone("thermal_zone2", "60000", {{"hot", "60000"}});
  folder_.write("class/thermal/cooling_device0/cur_state", "9\n");
  EXPECT_EQ(facts_.thermalState(), ThermalState::Serious);
}

TEST_F(RecordedFacts, DisabledUnreadableAndUnsetZonesDoNotCount) {
  zone("thermal_zone0", "200000", {{"critical", "100000"}}, "disabled");
  zone("thermal_zone1", "none", {{"critical", "100000"}});
  zone("thermal_zone2", "50000", {{"critical", "0"}, {"hot", "-274000"}, {"passive", "none"}});
  EXPECT_EQ(facts_.thermalState(), ThermalState::Nominal);
}

TEST_F(RecordedFacts, LowPowerModeIsTheLowPowerProfileOfTheFirmware) {
  EXPECT_FALSE(facts_.lowPowerModeEnabled());
  for (const char* other : {"balanced", "quiet", "cool", "performance", "low-power-ish"}) {
    folder_.write("firmware/acpi/platform_profile", std::string(other) + "\n");
    EXPECT_FALSE(facts_.lowPowerModeEnabled()) << other;
  }
  folder_.write("firmware/acpi/platform_profile", "low-power\n");
  EXPECT_TRUE(facts_.lowPowerModeEnabled());
}

TEST_F(RecordedFacts, ProfileDevicesCountWhereTheFirmwareHasNoFileOfItsOwn) {
  folder_.write("class/platform-profile/platform-profile-0/profile", "balanced\n");
  EXPECT_FALSE(facts_.lowPowerModeEnabled());
  folder_.write("class/platform-profile/platform-profile-1/profile", "low-power\n");
  EXPECT_TRUE(facts_.lowPowerModeEnabled());
  folder_.write("firmware/acpi/platform_profile", "custom\n");
  EXPECT_FALSE(facts_.lowPowerModeEnabled());
}

TEST(LinuxProcessFacts, KnowsThisProcess) {
  const LinuxProcessFacts facts;
  EXPECT_EQ(facts.ownProcessIdentifier(), ::getpid());
  EXPECT_EQ(facts.processName(::getpid()), "tests_host");
}

TEST(LinuxProcessFacts, FootprintGrowsWithMemoryThatIsTouched) {
  const LinuxProcessFacts facts;
  const Result<std::uint64_t> before = facts.physicalFootprint();
  constexpr std::size_t kBytes = std::size_t{32} << 20U;
  void* memory = ::mmap(nullptr, kBytes, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS | MAP_POPULATE, -1, 0);
  ASSERT_NE(memory, MAP_FAILED);
  const Result<std::uint64_t> after = facts.physicalFootprint();
  ::munmap(memory, kBytes);
  ASSERT_TRUE(before.ok() && after.ok());
  EXPECT_GT(after.value, before.value + kBytes / 2);
}

TEST(LinuxProcessFacts, LoadAveragesAreTheMachines) {
  double expected[3] = {-1, -1, -1};
  platform::LoadAverages read;
  // The kernel may update its numbers between the two readings.
  EXPECT_TRUE(eventually([&] {
    ::getloadavg(expected, 3);
    read = LinuxProcessFacts().loadAverages();
    return read.oneMinute == expected[0] && read.fiveMinutes == expected[1] && read.fifteenMinutes == expected[2];
  }));
  EXPECT_GE(read.oneMinute, 0);
}

TEST(LinuxClock, WallClockIsTheSystemsAndMonotonicTimeNeverGoesBack) {
  const LinuxClock clock;
  const double wall = std::chrono::duration<double>(std::chrono::system_clock::now().time_since_epoch()).count();
  EXPECT_NEAR(clock.epochSeconds(), wall, 5);
  std::chrono::nanoseconds before = clock.monotonic();
  for (int count = 0; count < 1000; ++count) {
    const std::chrono::nanoseconds now = clock.monotonic();
    EXPECT_GE(now, before);
    before = now;
  }
}

TEST(LinuxClock, UptimeIsThatOfTheMachine) {
  std::ifstream file("/proc/uptime");
  double expected = 0;
  ASSERT_TRUE(file >> expected);
  EXPECT_NEAR(LinuxClock().systemUptimeSeconds(), expected, 5);
}

TEST(LinuxClock, ProcessorTicksCountWorkInMicroseconds) {
  const LinuxClock clock;
  const std::int64_t before = clock.processorTicks();
  const std::clock_t begin = std::clock();
  while (std::clock() - begin < CLOCKS_PER_SEC / 20) {
  }
  const std::int64_t used = clock.processorTicks() - before;
  EXPECT_GE(used, 50'000);
  EXPECT_LT(used, 5'000'000);
}

}  // namespace
}  // namespace tarn::linux_host
