// SPDX-License-Identifier: Apache-2.0
// Driver report channels in files that appear, change, break and vanish.
#include "host/drivers/FlumeFiles.h"

#include <gtest/gtest.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>

#include <filesystem>

#include "host/drivers/LinuxFlumeService.h"
#include "host/system/UniqueDescriptor.h"
#include "testing/RecordingLog.h"
#include "tests/host/TemporaryFolder.h"

namespace tarn::linux_host {
namespace {

using platform::FlumeSamples;
using Lines = std::vector<std::string>;

std::string simpleFile(const std::string& driver, const std::string& name, int value) {
  return R"({"driver": ")" + driver + R"(", "group": "Rx", "channels": [{"name": ")" + name +
         R"(", "format": "simple", "value": )" + std::to_string(value) + "}]}";
}

class FlumeFilesTest : public ::testing::Test {
 protected:
  // "driver/name=value" of each channel.
  static Lines texts(const FlumeSamples& samples) {
    Lines found;
    for (const auto& channel : samples) {
      found.push_back(*channel.name.driver + "/" + *channel.name.name + "=" + std::to_string(channel.value));
    }
    return found;
  }
  Lines read() { return texts(files_.read()); }
  // What was logged since the last call.
  Lines complaints() {
    Lines found;
    for (const auto& entry : log_.entries()) {
      EXPECT_EQ(entry.level, platform::LogLevel::Error);
      EXPECT_EQ(entry.category, "tarnrd");
      EXPECT_EQ(entry.module, "FlumeFiles");
      found.push_back(entry.message());
    }
    log_.clear();
    return found;
  }
  void remove(const std::string& name) { std::filesystem::remove_all(folder_.path(name)); }

  TemporaryFolder folder_;
  testing::RecordingLog log_;
  FlumeFiles files_{folder_.path("flume"), log_};
};

TEST_F(FlumeFilesTest, WithoutAFolderThereAreNoChannelsAndNothingToComplainAbout) {
  EXPECT_EQ(read(), Lines());
  EXPECT_EQ(read(), Lines());
  EXPECT_EQ(complaints(), Lines());
}

TEST_F(FlumeFilesTest, ReadsThePlainJsonFilesInTheOrderOfTheirNames) {
  folder_.write("flume/b.json", simpleFile("B", "x", 2));
  folder_.write("flume/a.json", simpleFile("A", "x", 1));
  folder_.write("flume/.hidden.json", simpleFile("H", "x", 3));
  folder_.write("flume/a.json.tmp", simpleFile("T", "x", 4));
  folder_.write("flume/.json", simpleFile("J", "x", 5));
  folder_.write("flume/readme", "none");
  EXPECT_EQ(read(), (Lines{"A/x=1", "B/x=2"}));
  EXPECT_EQ(complaints(), Lines());
}

TEST_F(FlumeFilesTest, EachReadingSeesTheFilesAsTheyAre) {
  folder_.write("flume/a.json", simpleFile("A", "x", 1));
  EXPECT_EQ(read(), (Lines{"A/x=1"}));
  folder_.write("flume/a.json", simpleFile("A", "x", 7));
  folder_.write("flume/c.json", simpleFile("C", "x", 3));
  EXPECT_EQ(read(), (Lines{"A/x=7", "C/x=3"}));
  EXPECT_EQ(complaints(), Lines());
}

TEST_F(FlumeFilesTest, FileThatVanishesIsOneComplaintAndTheOthersGoOn) {
  folder_.write("flume/a.json", simpleFile("A", "x", 1));
  folder_.write("flume/b.json", simpleFile("B", "x", 2));
  EXPECT_EQ(read().size(), 2U);
  remove("flume/a.json");
  EXPECT_EQ(read(), (Lines{"B/x=2"}));
  EXPECT_EQ(complaints(), (Lines{"driver channels: the file a.json is missing"}));
  EXPECT_EQ(read(), (Lines{"B/x=2"}));
  EXPECT_EQ(complaints(), Lines());
  folder_.write("flume/a.json", simpleFile("A", "x", 5));
  EXPECT_EQ(read(), (Lines{"A/x=5", "B/x=2"}));
  remove("flume");
  EXPECT_EQ(read(), Lines());
  EXPECT_EQ(complaints(),
            (Lines{"driver channels: the file a.json is missing", "driver channels: the file b.json is missing"}));
}

TEST_F(FlumeFilesTest, HalfWrittenFileIsOneComplaintUntilItIsWhole) {
  folder_.write("flume/b.json", simpleFile("B", "x", 2));
  folder_.write("flume/a.json", simpleFile("A", "x", 1).substr(0, 20));
  for (int reading = 0; reading < 3; ++reading) {
    EXPECT_EQ(read(), (Lines{"B/x=2"}));
  }
  const Lines first = complaints();
  ASSERT_EQ(first.size(), 1U);
  EXPECT_TRUE(first[0].starts_with("driver channels: the file a.json 1:")) << first[0];
  folder_.write("flume/a.json", simpleFile("A", "x", 1));
  EXPECT_EQ(read().size(), 2U);
  EXPECT_EQ(complaints(), Lines());
  folder_.write("flume/a.json", simpleFile("A", "x", 1).substr(0, 20));
  read();
  EXPECT_EQ(complaints(), first);
  folder_.write("flume/a.json", "");
  read();
  EXPECT_EQ(complaints().size(), 1U);
}

TEST_F(FlumeFilesTest, WrongChannelIsAComplaintAndTheOthersOfItsFileCount) {
  folder_.write("flume/a.json", R"({"driver": "A", "channels": [{"name": "w", "format": "simple", "value": "1"},
      {"name": "x", "format": "simple", "value": 1}]})");
  EXPECT_EQ(read(), (Lines{"A/x=1"}));
  EXPECT_EQ(complaints(), (Lines{R"(driver channels: the file a.json channel 1 "w": "value" must be a whole number)"}));
}

TEST_F(FlumeFilesTest, ChannelOfTwoFilesCountsInTheFirst) {
  folder_.write("flume/a.json", simpleFile("A", "x", 1));
  folder_.write("flume/b.json", simpleFile("A", "x", 2));
  EXPECT_EQ(read(), (Lines{"A/x=1"}));
  EXPECT_EQ(complaints(), (Lines{"driver channels: the file b.json holds 1 channels that an earlier file has"}));
}

TEST_F(FlumeFilesTest, PipesSocketsFoldersAndDevicesAreNeverOpened) {
  folder_.write("flume/z.json", simpleFile("Z", "x", 1));
  ASSERT_EQ(::mkfifo(folder_.path("flume/a.json").c_str(), 0600), 0);
  std::filesystem::create_directory(folder_.path("flume/b.json"));
  std::filesystem::create_symlink("/dev/zero", folder_.path("flume/c.json"));
  sockaddr_un address{};
  address.sun_family = AF_UNIX;
  const std::string path = folder_.path("flume/d.json");
  ASSERT_LT(path.size(), sizeof address.sun_path);
  path.copy(address.sun_path, path.size());
  const UniqueDescriptor socket(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
  ASSERT_EQ(::bind(socket.get(), reinterpret_cast<const sockaddr*>(&address), sizeof address), 0);
  EXPECT_EQ(read(), (Lines{"Z/x=1"}));
  EXPECT_EQ(complaints(), (Lines{"driver channels: the file a.json is not a plain file",
                                 "driver channels: the file b.json is not a plain file",
                                 "driver channels: the file c.json is not a plain file",
                                 "driver channels: the file d.json is not a plain file"}));
}

TEST_F(FlumeFilesTest, LinkThatLeadsNowhereIsAsIfItWasNotThere) {
  folder_.write("flume/real", simpleFile("A", "x", 1));
  std::filesystem::create_symlink("real", folder_.path("flume/a.json"));
  std::filesystem::create_symlink("nowhere", folder_.path("flume/b.json"));
  EXPECT_EQ(read(), (Lines{"A/x=1"}));
  EXPECT_EQ(complaints(), Lines());
  remove("flume/real");
  EXPECT_EQ(read(), Lines());
  EXPECT_EQ(complaints(), (Lines{"driver channels: the file a.json is missing"}));
  EXPECT_EQ(read(), Lines());
  EXPECT_EQ(complaints(), Lines());
}

TEST_F(FlumeFilesTest, FolderThatIsNoFolderIsOneComplaint) {
  folder_.write("flume", "a file");
  read();
  read();
  EXPECT_EQ(complaints(),
            (Lines{"driver channels: the folder " + folder_.path("flume") + " can't be read: Not a directory"}));
}

TEST_F(FlumeFilesTest, SizesAndCountsAreBounded) {
  FlumeFilesBounds bounds;
  bounds.files = 3;
  bounds.fileBytes = 120;
  bounds.bytes = 200;
  FlumeFiles files(folder_.path("flume"), log_, bounds);
  folder_.write("flume/a.json", simpleFile("A", "x", 1));
  folder_.write("flume/b.json", simpleFile("B", "x", 1));
  folder_.write("flume/c.json", simpleFile("C", "x", 1));
  folder_.write("flume/d.json", simpleFile("D", "x", 1));
  EXPECT_EQ(texts(files.read()), (Lines{"A/x=1", "B/x=1"}));
  EXPECT_EQ(complaints(),
            (Lines{"driver channels: the folder " + folder_.path("flume") +
                       " holds more than 3 files, the others are left out",
                   "driver channels: the file c.json is left out: there are more than 200 bytes of files"}));
  remove("flume/b.json");
  folder_.write("flume/a.json", simpleFile("A", "x", 1) + std::string(121, ' '));
  EXPECT_EQ(texts(files.read()), (Lines{"C/x=1", "D/x=1"}));
  EXPECT_EQ(complaints(), (Lines{"driver channels: the file a.json is larger than 120 bytes",
                                 "driver channels: the file b.json is missing"}));
}

TEST_F(FlumeFilesTest, ChannelsOfAllFilesAreBounded) {
  FlumeFilesBounds bounds;
  bounds.channels = 1;
  FlumeFiles files(folder_.path("flume"), log_, bounds);
  folder_.write("flume/a.json", simpleFile("A", "x", 1));
  folder_.write("flume/b.json", simpleFile("B", "x", 1));
  EXPECT_EQ(texts(files.read()), (Lines{"A/x=1"}));
  EXPECT_EQ(complaints(), (Lines{"driver channels: the file b.json is left out: there are more than 1 channels"}));
}

TEST_F(FlumeFilesTest, NamesInComplaintsAreOneLine) {
  folder_.write("flume/a\nb.json", "");
  read();
  const Lines found = complaints();
  ASSERT_EQ(found.size(), 1U);
  EXPECT_TRUE(found[0].starts_with("driver channels: the file a\\nb.json ")) << found[0];
}

// The service on the files, from the look-up to the difference.
class FlumeServiceOnFiles : public FlumeFilesTest {
 protected:
  void write(const std::string& hits, const std::string& states, int value) {
    folder_.write("flume/a.json",
                  R"({"driver": "A", "group": "Haptics", "subgroup": "Stats", "channels": [
      {"name": "v", "format": "simple", "value": )" +
                      std::to_string(value) + R"(},
      {"name": "h", "format": "histogram", "unit": "us", "min": 1, "max": 9, "buckets": )" +
                      hits + R"(},
      {"name": "s", "format": "state", "states": )" +
                      states + "}]}");
  }
  std::shared_ptr<const FlumeSamples> sample() {
    return service_.createSamples(*subscribed_.subscription, *subscribed_.channels).value;
  }
  void subscribe(const std::optional<std::string>& group, const std::optional<std::string>& subGroup) {
    subscribed_ = service_.subscribe(*service_.copyChannels(group, subGroup).value);
  }
  FlumeSamples delta(const std::shared_ptr<const FlumeSamples>& earlier,
                     const std::shared_ptr<const FlumeSamples>& later) {
    const auto delta = service_.createDelta(earlier, later);
    EXPECT_FALSE(delta.failed());
    return *delta.value;
  }

  LinuxFlumeService service_{{&files_}};
  LinuxFlumeService::Subscribed subscribed_;
};

constexpr const char* kStates = R"([{"name": "on", "transitions": 5, "residency": 50, "duty_cycle": 0.5},
                                   {"name": "off", "transitions": 4, "residency": 40, "duty_cycle": 0.5}])";

TEST_F(FlumeServiceOnFiles, GroupsMatchByBothNamesAndAMissingOneMatchesAny) {
  folder_.write("flume/a.json", simpleFile("A", "x", 1));
  write("[]", "[]", 1);
  folder_.write("flume/b.json", simpleFile("B", "x", 1));
  EXPECT_EQ(service_.copyChannels("Rx", {}).value->size(), 1U);
  EXPECT_EQ(service_.copyChannels("Rx", "Stats").value->size(), 0U);
  EXPECT_EQ(service_.copyChannels({}, "Stats").value->size(), 3U);
  EXPECT_EQ(service_.copyChannels("Haptics", "Stats").value->size(), 3U);
  EXPECT_EQ(service_.copyChannels("Haptics", {}).value->size(), 3U);
  EXPECT_EQ(service_.copyChannels("haptics", {}).value->size(), 0U);
  EXPECT_EQ(service_.copyChannels({}, {}).value->size(), 4U);
}

TEST_F(FlumeServiceOnFiles, DifferenceIsLaterMinusEarlierAndTheLaterSamplesOwnForTheRest) {
  write("[[0, 5, 10], [5, 9, 1]]", kStates, 100);
  subscribe("Haptics", "Stats");
  const auto before = sample();
  folder_.write("flume/a.json", R"({"driver": "A", "group": "Haptics", "subgroup": "Stats", "channels": [
      {"name": "s", "format": "state", "states": [
         {"name": "new", "transitions": 1, "residency": 2, "duty_cycle": 0.1},
         {"name": "off", "transitions": 9, "residency": 41, "duty_cycle": 0.2},
         {"name": "on", "transitions": 5, "residency": 250, "duty_cycle": 0.7}]},
      {"name": "v", "format": "simple", "value": 90},
      {"name": "h", "format": "histogram", "unit": "ms", "min": 0, "max": 20,
       "buckets": [[0, 6, 12], [6, 20, 1], [20, 30, 4]]}]})");
  const FlumeSamples found = delta(before, sample());
  ASSERT_EQ(found.size(), 3U);
  EXPECT_EQ(found[0].value, -10);
  EXPECT_EQ(found[1].unit, "ms");
  EXPECT_EQ(found[1].minimum, 0);
  EXPECT_EQ(found[1].maximum, 20);
  ASSERT_EQ(found[1].buckets.size(), 3U);
  EXPECT_EQ(found[1].buckets[0].upper, 6);
  EXPECT_EQ(found[1].buckets[0].hits, 2);
  EXPECT_EQ(found[1].buckets[1].hits, 0);
  EXPECT_EQ(found[1].buckets[2].hits, 4);
  ASSERT_EQ(found[2].states.size(), 3U);
  EXPECT_EQ(found[2].states[0].residency, 2U);
  EXPECT_EQ(found[2].states[1].transitions, 5U);
  EXPECT_EQ(found[2].states[1].residency, 1U);
  EXPECT_EQ(found[2].states[2].transitions, 0U);
  EXPECT_EQ(found[2].states[2].residency, 200U);
  EXPECT_EQ(found[2].states[2].dutyCycle, 0.7);
}

TEST_F(FlumeServiceOnFiles, CountsThatFellBeganAnew) {
  write("[[0, 5, 10], [5, 9, 3]]", kStates, 100);
  subscribe("Haptics", "Stats");
  const auto before = sample();
  write("[[0, 5, 9], [5, 9, 3]]", R"([{"name": "on", "transitions": 4, "residency": 51, "duty_cycle": 0.5},
                                     {"name": "off", "transitions": 4, "residency": 39, "duty_cycle": 0.5}])",
        1);
  const FlumeSamples found = delta(before, sample());
  EXPECT_EQ(found[0].value, -99);
  EXPECT_EQ(found[1].buckets[0].hits, 9);
  EXPECT_EQ(found[1].buckets[1].hits, 0);
  EXPECT_EQ(found[2].states[0].transitions, 4U);
  EXPECT_EQ(found[2].states[0].residency, 1U);
  EXPECT_EQ(found[2].states[1].transitions, 0U);
  EXPECT_EQ(found[2].states[1].residency, 39U);
}

TEST_F(FlumeServiceOnFiles, AgainstNothingTheDifferenceIsTheLaterSample) {
  write("[]", kStates, 7);
  subscribe("Haptics", {});
  const auto now = sample();
  EXPECT_EQ(delta(nullptr, now)[0].value, 7);
  EXPECT_EQ(delta(std::make_shared<FlumeSamples>(), now)[0].value, 7);
  EXPECT_EQ(service_.createDelta(now, nullptr).value, nullptr);
}

TEST_F(FlumeServiceOnFiles, ValuesThatLieFarApartAreHeldToTheRange) {
  folder_.write("flume/a.json", simpleFile("A", "x", 1));
  subscribe("Rx", {});
  FlumeSamples low = *sample();
  FlumeSamples high = low;
  low[0].value = INT64_MIN;
  high[0].value = INT64_MAX;
  const auto lowest = std::make_shared<const FlumeSamples>(low);
  const auto highest = std::make_shared<const FlumeSamples>(high);
  EXPECT_EQ(delta(lowest, highest)[0].value, INT64_MAX);
  EXPECT_EQ(delta(highest, lowest)[0].value, INT64_MIN);
}

TEST_F(FlumeServiceOnFiles, ChannelOfAnotherFormatCountsAsItIs) {
  folder_.write("flume/a.json", simpleFile("A", "x", 5));
  subscribe("Rx", {});
  const auto before = sample();
  folder_.write("flume/a.json", R"({"driver": "A", "group": "Rx", "channels": [
      {"name": "x", "format": "histogram", "min": 0, "max": 1, "buckets": [[0, 1, 3]]}]})");
  const FlumeSamples found = delta(before, sample());
  EXPECT_EQ(found[0].format, platform::FlumeFormat::Histogram);
  EXPECT_EQ(found[0].buckets[0].hits, 3);
}

TEST_F(FlumeServiceOnFiles, OnlySubscribedChannelsAreSampledWhereverTheyAre) {
  folder_.write("flume/a.json", simpleFile("A", "x", 5));
  subscribe("Rx", {});
  folder_.write("flume/0.json", simpleFile("New", "x", 5));
  std::filesystem::rename(folder_.path("flume/a.json"), folder_.path("flume/moved.json"));
  EXPECT_EQ(texts(*sample()), (Lines{"A/x=5"}));
}

TEST_F(FlumeServiceOnFiles, FileThatIsBrokenAtOneSampleOnlyIsMissingFromIt) {
  folder_.write("flume/a.json", simpleFile("A", "x", 5));
  folder_.write("flume/b.json", simpleFile("B", "x", 1));
  subscribe("Rx", {});
  folder_.write("flume/a.json", "{");
  const auto before = sample();
  EXPECT_EQ(texts(*before), (Lines{"B/x=1"}));
  EXPECT_EQ(complaints().size(), 1U);
  folder_.write("flume/a.json", simpleFile("A", "x", 9));
  EXPECT_EQ(texts(delta(before, sample())), (Lines{"A/x=9", "B/x=0"}));
  EXPECT_EQ(complaints(), Lines());
}

TEST_F(FlumeServiceOnFiles, OfTwoSourcesTheEarlierOneCounts) {
  folder_.write("flume/a.json", simpleFile("A", "x", 5));
  folder_.write("other/a.json", simpleFile("A", "x", 6));
  folder_.write("other/b.json", simpleFile("B", "x", 7));
  FlumeFiles other(folder_.path("other"), log_);
  LinuxFlumeService service({&files_, &other});
  const auto channels = service.copyChannels({}, {}).value;
  ASSERT_EQ(channels->size(), 2U);
  const auto subscribed = service.subscribe(*channels);
  EXPECT_EQ(texts(*service.createSamples(*subscribed.subscription, *subscribed.channels).value),
            (Lines{"A/x=5", "B/x=7"}));
}

}  // namespace
}  // namespace tarn::linux_host
