// SPDX-License-Identifier: Apache-2.0
#include "adapters/alsa/AlsaTree.h"

#include "tests/adapters/alsa/KernelTexts.h"

namespace tarn::streams {

class AlsaTreeLook : public KernelTexts {};

TEST_F(AlsaTreeLook, WhatIsOpenIsToldAndWhatIsClosedIsNot) {
  AlsaTree tree(root);
  const auto open = tree.look();
  ASSERT_EQ(open.size(), 2U);
  EXPECT_EQ(open[0].name, "PCH:pcm0c");
  EXPECT_FALSE(open[0].isPlayback);
  EXPECT_EQ(open[1].name, "PCH:pcm0p");
  EXPECT_TRUE(open[1].isPlayback);
  EXPECT_FALSE(open[1].isUsb || open[1].isDigital);
  EXPECT_EQ(linux_host::kAlsaStates[open[1].status.state], "RUNNING");
  EXPECT_EQ(open[1].parameters, (linux_host::AlsaParameters{"S32_LE", 2, 48000, 1024, 16384}));
  EXPECT_TRUE(tree.hasCards());
}

TEST_F(AlsaTreeLook, TheOwnerIsTheThreadsProcess) {
  EXPECT_EQ(AlsaTree(root).look()[1].owner, (AlsaOwner{1840, "oxplay"}));
}

TEST_F(AlsaTreeLook, TheFileThatAProcessRunsGoesBeforeItsName) {
  std::filesystem::create_symlink("/opt/player/oxplayer-with-a-long-name (deleted)", root + "/1840/exe");
  EXPECT_EQ(AlsaTree(root).look()[1].owner, (AlsaOwner{1840, "oxplayer-with-a-long-name"}));
}

TEST_F(AlsaTreeLook, AProcessThatIsGoneHasItsNumberAlone) {
  std::filesystem::remove_all(root + "/1841");
  EXPECT_EQ(AlsaTree(root).look()[1].owner, (AlsaOwner{1841, ""}));
}

TEST_F(AlsaTreeLook, ACardThatComesIsFoundAndOneThatGoesIsLost) {
  AlsaTree tree(root);
  tree.look();
  std::filesystem::copy(root + "/asound/card0", root + "/asound/card1", std::filesystem::copy_options::recursive);
  write("asound/card1/id", "Desk, left\n");
  write("asound/card1/usbid", "1234:5678\n");
  EXPECT_EQ(tree.look().size(), 2U) << "the list of cards is the same";
  write("asound/cards", " 0 [PCH]\n 1 [Desk]\n");
  const auto open = tree.look();
  ASSERT_EQ(open.size(), 4U);
  EXPECT_EQ(open[1].name, "Desk  left:pcm0p");
  EXPECT_TRUE(open[1].isUsb);
  std::filesystem::remove_all(root + "/asound/card1");
  write("asound/cards", " 0 [PCH]\n");
  EXPECT_EQ(tree.look().size(), 2U);
}

TEST_F(AlsaTreeLook, AScreenIsDigital) {
  writeStatus("pcm3p", "state: RUNNING\nowner_pid   : 1841\n");
  const auto open = AlsaTree(root).look();
  ASSERT_EQ(open.size(), 3U);
  EXPECT_EQ(open[2].name, "PCH:pcm3p");
  EXPECT_TRUE(open[2].isDigital);
  EXPECT_FALSE(open[2].parameters);
}

TEST_F(AlsaTreeLook, TheSecondSubDeviceHasItsNumber) {
  std::filesystem::copy(root + "/asound/card0/pcm0p/sub0", root + "/asound/card0/pcm0p/sub1");
  EXPECT_EQ(AlsaTree(root).look()[2].name, "PCH:pcm0p.1");
}

TEST_F(AlsaTreeLook, WhatCannotBeReadIsLeftOut) {
  writeStatus("pcm0p", "");
  EXPECT_EQ(AlsaTree(root).look().size(), 1U);
  write("asound/card0/pcm0c/sub0/info", "card: 0\n");
  EXPECT_TRUE(AlsaTree(root).look().empty());
}

TEST_F(AlsaTreeLook, AMachineWithoutSoundHasNone) {
  std::filesystem::remove_all(root + "/asound");
  AlsaTree tree(root);
  EXPECT_TRUE(tree.look().empty());
  EXPECT_FALSE(tree.hasCards());
}

}  // namespace tarn::streams
